// The library as a module of a host that may unload it at any time.
#ifndef KRAL_PLATFORM_LOADED_MODULE_H
#define KRAL_PLATFORM_LOADED_MODULE_H

#include <chrono>
#include <thread>

namespace kral {

// Keeps the library's code loaded. A thread of the library needs one until it has been joined, so it must not be the
// thread itself that gives it up: the last steps of a thread, behind its function, are code of the library too.
class ModuleReference {
 public:
  ModuleReference() = default;  // of nothing
  static ModuleReference Take();
  ModuleReference(ModuleReference&& other) noexcept;
  ModuleReference& operator=(ModuleReference&& other) noexcept;
  ~ModuleReference();

 private:
  [[maybe_unused]] void* module_ = nullptr;
};

// Waits until `thread` has left all code of the library, so that joining it does not wait. On Windows the end of a
// thread needs the loader's lock, which its host may be holding meanwhile.
bool HasEndedWithin(std::thread& thread, std::chrono::milliseconds time_out);

}  // namespace kral

#endif
