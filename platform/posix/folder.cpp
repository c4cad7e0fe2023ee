// Folders on Linux.
#include "platform/folder.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "platform/posix/last_error.h"
#include "platform/posix/system_files.h"

namespace kral {
LocalFile LookAt(const std::string& path) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return {};
  if (S_ISREG(status.st_mode)) return {LocalKind::kFile, static_cast<uint64_t>(status.st_size)};
  return {S_ISDIR(status.st_mode) ? LocalKind::kFolder : LocalKind::kOther};
}

std::error_code ListFolder(const std::string& path, std::vector<FolderEntry>& entries) {
  std::vector<std::string> names;
  if (const auto error = ReadNames(path, names)) return error;
  std::vector<FolderEntry> found;
  for (const std::string& name : names) {
    const std::string full = JoinPath(path, name);
    LocalFile file = LookAt(full);
    struct stat own {};
    const bool is_link = ::lstat(full.c_str(), &own) == 0 && S_ISLNK(own.st_mode);
    if (is_link && file.kind != LocalKind::kFile) file = {LocalKind::kOther};
    found.push_back({name, file});
  }
  std::ranges::sort(found, [](const auto& left, const auto& right) { return left.name < right.name; });
  entries = std::move(found);
  return {};
}

std::error_code MakeFolder(const std::string& path) {
  if (::mkdir(path.c_str(), 0777) == 0) return {};
  const auto error = LastError();
  return LookAt(path).kind == LocalKind::kFolder ? std::error_code() : error;
}

size_t NameBegin(const std::string& path) {
  return path.rfind('/') + 1;  // 0 behind npos
}

std::error_code RemoveFile(const std::string& path) {
  return ::unlink(path.c_str()) == 0 ? std::error_code() : LastError();
}

}  // namespace kral
