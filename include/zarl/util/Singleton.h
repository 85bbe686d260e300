#pragma once

namespace zarl::util {

// Access to the one object of type T in the process. Instance() creates it on first
// use, under a lock that every call takes, and never destroys it, so it stays usable
// while the process exits. The specialisations live in libzarlutil (one per process,
// whatever number of libraries use it).
template <class T>
class Singleton {
  public:
    Singleton() = delete;
    static T& Instance();
};

}  // namespace zarl::util
