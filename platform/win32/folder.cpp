// Folders on Windows.
#include "platform/folder.h"

#include <windows.h>

#include <algorithm>
#include <memory>

#include "platform/win32/last_error.h"
#include "platform/win32/wide_text.h"

namespace kral {
namespace {

struct CloseSearch {
  void operator()(void* search) const { ::FindClose(search); }
};

LocalFile FileOf(DWORD attributes, DWORD size_high, DWORD size_low) {
  if ((attributes & FILE_ATTRIBUTE_DIRECTORY) != 0) return {LocalKind::kFolder};
  if ((attributes & FILE_ATTRIBUTE_DEVICE) != 0) return {LocalKind::kOther};
  return {LocalKind::kFile, uint64_t{size_high} << 32 | size_low};
}

}  // namespace

LocalFile LookAt(const std::string& path) {
  WIN32_FILE_ATTRIBUTE_DATA data{};
  if (!::GetFileAttributesExW(WidePath(path).c_str(), GetFileExInfoStandard, &data)) return {};
  return FileOf(data.dwFileAttributes, data.nFileSizeHigh, data.nFileSizeLow);
}

std::error_code ListFolder(const std::string& path, std::vector<FolderEntry>& entries) {
  WIN32_FIND_DATAW data{};
  const HANDLE search = ::FindFirstFileW(WidePath(JoinPath(path, "*")).c_str(), &data);
  if (search == INVALID_HANDLE_VALUE) return LastError();
  const std::unique_ptr<void, CloseSearch> owned(search);
  std::vector<FolderEntry> found;
  do {
    const std::string name = Utf8Text(data.cFileName);
    if (name == "." || name == "..") continue;
    LocalFile file = FileOf(data.dwFileAttributes, data.nFileSizeHigh, data.nFileSizeLow);
    const bool is_link = (data.dwFileAttributes & FILE_ATTRIBUTE_REPARSE_POINT) != 0;
    if (is_link && file.kind != LocalKind::kFile) file = {LocalKind::kOther};
    found.push_back({name, file});
  } while (::FindNextFileW(search, &data));
  if (::GetLastError() != ERROR_NO_MORE_FILES) return LastError();
  std::ranges::sort(found, [](const auto& left, const auto& right) { return left.name < right.name; });
  entries = std::move(found);
  return {};
}

std::error_code MakeFolder(const std::string& path) {
  if (::CreateDirectoryW(WidePath(path).c_str(), nullptr)) return {};
  const auto error = LastError();
  return LookAt(path).kind == LocalKind::kFolder ? std::error_code() : error;
}

size_t NameBegin(const std::string& path) {
  return path.find_last_of("/\\") + 1;  // 0 behind npos
}

std::error_code RemoveFile(const std::string& path) {
  return ::DeleteFileW(WidePath(path).c_str()) ? std::error_code() : LastError();
}

}  // namespace kral
