#pragma once

#include <exception>
#include <memory>
#include <string>

#include <zarl/util/Export.h>

namespace zarl::util {

// The exception type of the ZARL libraries. It records the call stack where it is
// constructed; the stack is turned into text only when a report asks for it.
// Copying never throws: copies share the description and the recorded stack.
class ZARL_UTIL_API Exception : public std::exception {
  public:
    // Records the description and the calling thread's stack. Throws std::bad_alloc
    // only if memory runs out.
    explicit Exception(std::string description);

    Exception(const Exception&) noexcept = default;
    Exception& operator=(const Exception&) noexcept = default;
    ~Exception() override;

    // The description as given to the constructor.
    const char* what() const noexcept override;

    // The recorded stack, one frame a line ("#N function at file:line").
    std::string GetTracebackReport() const;

    // The description, then "\nTraceback:\n", then GetTracebackReport(), nothing else.
    std::string Report() const;

  private:
    struct Data;
    std::shared_ptr<const Data> data;
};

}  // namespace zarl::util
