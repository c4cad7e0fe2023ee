// Folders of the PC: what is in them, making them, and removing files. Names are bytes as the system's file functions
// take them.
#ifndef KRAL_PLATFORM_FOLDER_H
#define KRAL_PLATFORM_FOLDER_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <system_error>
#include <vector>

namespace kral {

enum class LocalKind { kMissing, kFile, kFolder, kOther };

struct LocalFile {
  LocalKind kind = LocalKind::kMissing;
  uint64_t size = 0;  // of files
};

// What a path leads to, links followed.
LocalFile LookAt(const std::string& path);

struct FolderEntry {
  std::string name;
  LocalFile file;  // links to files are followed; links to folders are kOther, because they may lead in circles
};

// By name, without "." and "..".
std::error_code ListFolder(const std::string& path, std::vector<FolderEntry>& entries);

// A folder that is there already is no error.
std::error_code MakeFolder(const std::string& path);

std::error_code RemoveFile(const std::string& path);

// Where in a path the name of the file begins, behind its folder.
size_t NameBegin(const std::string& path);

// '/' goes between them, which both platforms understand.
std::string JoinPath(const std::string& folder, const std::string& name);

}  // namespace kral

#endif
