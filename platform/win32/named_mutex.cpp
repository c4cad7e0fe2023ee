// The system-visible marker of a port in use, on Windows.
#include "platform/named_mutex.h"

#include <windows.h>

namespace kral {
namespace {

class Win32Mutex final : public NamedMutex {
 public:
  explicit Win32Mutex(HANDLE handle) : handle_(handle) {}
  ~Win32Mutex() override {
    // Fails on a thread other than the one that connected; closing the handle is what matters.
    ::ReleaseMutex(handle_);
    ::CloseHandle(handle_);
  }
  // Kernel handles have 32 significant bits on every Windows.
  uint32_t value() const override { return static_cast<uint32_t>(reinterpret_cast<uintptr_t>(handle_)); }

 private:
  HANDLE handle_;
};

}  // namespace

std::unique_ptr<NamedMutex> CreateNamedMutex(const std::string& name) {
  SECURITY_ATTRIBUTES attributes{};
  static_assert(sizeof(void*) != 4 || sizeof attributes == 12);
  attributes.nLength = sizeof attributes;
  attributes.bInheritHandle = FALSE;
  const HANDLE handle = ::CreateMutexA(&attributes, TRUE, name.c_str());
  if (handle == nullptr) return nullptr;
  return std::make_unique<Win32Mutex>(handle);
}

}  // namespace kral
