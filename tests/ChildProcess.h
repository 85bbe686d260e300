#pragma once

#include <string>
#include <vector>

#include <sys/types.h>

namespace zarl::test {

// What a finished child left behind.
struct ChildResult {
    int status = -1;  // exit status; -1 when it was killed by a signal
    std::string out;
    std::string err;
};

// One run of a program, standard input from a string, standard output and error in
// files of a directory of its own (also its working directory). ZARL_HOME is unset for
// it unless `env` ("NAME=value" entries) sets it. Killed if still running when the
// object goes away.
class ChildProcess {
  public:
    explicit ChildProcess(std::vector<std::string> argv, const std::string& input = "",
                          const std::vector<std::string>& env = {});
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // Waits until the child has written `text` to standard error; false if it ended,
    // or a generous limit passed, first.
    bool WaitForStderr(const std::string& text);

    // Waits for the end, killing the child after a generous limit (a test failure).
    ChildResult Wait();

  private:
    bool Poll(const std::string& text);

    std::string dir;
    pid_t pid = -1;
    int rawStatus = 0;
    bool ended = false;
};

std::string ReadFile(const std::string& path);
void WriteFile(const std::string& path, const std::string& bytes);

}  // namespace zarl::test
