// Loads libzarlcore at run time, queues notifications and unloads the library while
// they may still wait: the unload must deliver or drop them cleanly, never crash.
// Usage: dlopen_child LIBRARY COUNT

#include <dlfcn.h>

#include <cstdio>
#include <cstdlib>
#include <string>

namespace {

using NotifyFunction = void (*)(const std::string&, const std::string&, const std::string&,
                                const std::string&, const std::string&);

// zarl::core::Notify(std::string const&, ... five times)
constexpr const char* kNotifySymbol =
    "_ZN4zarl4core6NotifyERKNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEES8_S8_S8_S8_";

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) {
        return 2;
    }
    void* library = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        std::fprintf(stderr, "dlopen: %s\n", dlerror());
        return 3;
    }
    auto notify = reinterpret_cast<NotifyFunction>(dlsym(library, kNotifySymbol));
    if (notify == nullptr) {
        std::fprintf(stderr, "dlsym: %s\n", dlerror());
        return 4;
    }
    const int count = std::atoi(argv[2]);
    for (int i = 0; i < count; ++i) {
        notify("Dlopen", "N", "/m", "p", std::to_string(i));
    }
    if (dlclose(library) != 0) {
        std::fprintf(stderr, "dlclose: %s\n", dlerror());
        return 5;
    }
    // The library's code is gone now; a worker left running would crash here.
    void* again = dlopen(argv[1], RTLD_NOW | RTLD_NOLOAD);
    return again == nullptr ? 0 : 6;
}
