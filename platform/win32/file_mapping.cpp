// Files as memory, on Windows.
#include "platform/file_mapping.h"

#include <windows.h>

#include <cstring>
#include <limits>

#include "platform/win32/wide_text.h"

namespace kral {
namespace {

HANDLE AsHandle(intptr_t file) {
  return reinterpret_cast<HANDLE>(file);
}

}  // namespace

uint8_t* CMapFileToMemory::Open(const std::string& path, bool writable) {
  Close();
  too_large_ = false;
  const DWORD access = writable ? GENERIC_READ | GENERIC_WRITE : GENERIC_READ;
  const HANDLE file = ::CreateFileW(WidePath(path).c_str(), access, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                                    FILE_ATTRIBUTE_NORMAL, nullptr);
  last_error_ = file == INVALID_HANDLE_VALUE ? ::GetLastError() : 0;
  if (file == INVALID_HANDLE_VALUE) return nullptr;
  file_ = reinterpret_cast<intptr_t>(file);

  LARGE_INTEGER size{};
  last_error_ = ::GetFileSizeEx(file, &size) == 0 ? ::GetLastError() : 0;
  too_large_ = last_error_ == 0 && static_cast<uint64_t>(size.QuadPart) > std::numeric_limits<size_t>::max();
  if (too_large_) last_error_ = ERROR_FILE_TOO_LARGE;
  if (last_error_ == 0) {
    mapping_ =
        ::CreateFileMappingW(file, nullptr, (writable ? PAGE_READWRITE : PAGE_READONLY) | SEC_COMMIT, 0, 0, nullptr);
    last_error_ = mapping_ == nullptr ? ::GetLastError() : 0;
  }
  if (last_error_ == 0) {
    view_ = static_cast<uint8_t*>(::MapViewOfFile(mapping_, writable ? FILE_MAP_WRITE : FILE_MAP_READ, 0, 0, 0));
    last_error_ = view_ == nullptr ? ::GetLastError() : 0;
    too_large_ = last_error_ == ERROR_NOT_ENOUGH_MEMORY;
  }
  if (last_error_ != 0) {
    Close();
    return nullptr;
  }
  size_ = static_cast<uint64_t>(size.QuadPart);
  return view_;
}

// Nobody can cut the file short while it is open here.
bool CMapFileToMemory::Copy(uint64_t offset, void* buffer, size_t count) const {
  if (count != 0) std::memcpy(buffer, view_ + offset, count);
  return true;
}

void CMapFileToMemory::Close() {
  if (view_ != nullptr) ::UnmapViewOfFile(view_);
  if (mapping_ != nullptr) ::CloseHandle(mapping_);
  if (file_ != kInvalid) ::CloseHandle(AsHandle(file_));
  view_ = nullptr;
  size_ = 0;
  mapping_ = nullptr;
  file_ = kInvalid;
}

}  // namespace kral
