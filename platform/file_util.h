// Whole files: read with a limit, replaced in one step.
#ifndef KRAL_PLATFORM_FILE_UTIL_H
#define KRAL_PLATFORM_FILE_UTIL_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <span>
#include <string>
#include <system_error>
#include <vector>

namespace kral {

// Opens an ordinary file for a reader of its own; null for everything else. Never waits, as a pipe would have it.
std::FILE* OpenToRead(const std::string& path);

// Reads an ordinary file of at most `limit` bytes; a longer one is std::errc::file_too_large, and nothing of it is
// given.
std::error_code ReadWholeFile(const std::string& path, size_t limit, std::vector<uint8_t>& bytes);

// A file read from its front to its end, as long as it may be. Others may read it meanwhile; on Windows nobody may
// write it.
class FileReader {
 public:
  FileReader();
  ~FileReader();
  FileReader(const FileReader&) = delete;
  FileReader& operator=(const FileReader&) = delete;

  std::error_code Open(const std::string& path);  // ordinary files only
  void Close();
  // The next bytes; fewer than there is room for only at the end of the file.
  std::error_code Read(std::span<uint8_t> buffer, size_t& count);
  uint64_t size() const;  // when it was opened

 private:
  struct State;
  std::unique_ptr<State> state_;
};

// A file being written under a temporary name beside its target. Until Commit the target stays as it was; without a
// Commit the destructor removes what was written. After a failed Write every later step fails.
class AtomicFile {
 public:
  AtomicFile();
  ~AtomicFile();
  AtomicFile(const AtomicFile&) = delete;
  AtomicFile& operator=(const AtomicFile&) = delete;

  std::error_code Open(const std::string& path);
  std::error_code Write(std::span<const uint8_t> bytes);
  std::error_code Commit();  // on the disk and under the target's name, replacing what was there

 private:
  struct State;
  std::unique_ptr<State> state_;
};

std::error_code ReplaceWholeFile(const std::string& path, std::span<const uint8_t> bytes);

}  // namespace kral

#endif
