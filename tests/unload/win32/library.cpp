#include "tests/unload/library.h"

#include <windows.h>

namespace kral::unload {

const bool kLeaves = true;

void* Load(const char* file) {
  return ::LoadLibraryA(file);
}

void Free(void* library) {
  ::FreeLibrary(static_cast<HMODULE>(library));
}

bool IsLoaded(const char* file) {
  return ::GetModuleHandleA(file) != nullptr;
}

void* Find(void* library, const char* function) {
  return reinterpret_cast<void*>(::GetProcAddress(static_cast<HMODULE>(library), function));
}

// Every DllMain is called under the loader's lock.
void RunWhileUnloading(void (*action)()) {
  using Lock = LONG(NTAPI*)(ULONG flags, ULONG * result, ULONG_PTR * cookie);
  using Unlock = LONG(NTAPI*)(ULONG flags, ULONG_PTR cookie);
  void* const system = ::GetModuleHandleA("ntdll.dll");
  const auto lock = reinterpret_cast<Lock>(Find(system, "LdrLockLoaderLock"));
  const auto unlock = reinterpret_cast<Unlock>(Find(system, "LdrUnlockLoaderLock"));
  ULONG_PTR cookie = 0;
  lock(0, nullptr, &cookie);
  action();
  unlock(0, cookie);
}

}  // namespace kral::unload
