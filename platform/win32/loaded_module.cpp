// References to the DLL, or to the program that the library is linked into, and the ends of its threads.
#include "platform/loaded_module.h"

#include <pthread.h>
#include <windows.h>

#include <utility>

namespace kral {
namespace {

const char anchor = 0;  // an address in this module

}  // namespace

ModuleReference ModuleReference::Take() {
  ModuleReference reference;
  HMODULE module = nullptr;
  if (::GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS, reinterpret_cast<LPCWSTR>(&anchor), &module)) {
    reference.module_ = module;
  }
  return reference;
}

ModuleReference::ModuleReference(ModuleReference&& other) noexcept : module_(std::exchange(other.module_, nullptr)) {}

ModuleReference& ModuleReference::operator=(ModuleReference&& other) noexcept {
  std::swap(module_, other.module_);
  return *this;
}

// Called by somebody who keeps the library loaded for longer than this.
ModuleReference::~ModuleReference() {
  if (module_ != nullptr) ::FreeLibrary(static_cast<HMODULE>(module_));
}

bool HasEndedWithin(std::thread& thread, std::chrono::milliseconds time_out) {
  const HANDLE handle = ::pthread_gethandle(thread.native_handle());
  return ::WaitForSingleObject(handle, static_cast<DWORD>(time_out.count())) == WAIT_OBJECT_0;
}

}  // namespace kral
