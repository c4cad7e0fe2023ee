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

// Each opens an ordinary file for a stream of its own; null for everything else. None waits, as a pipe would have it.
// A file that is open to be written is open nowhere else: neither of these two shares it with the other, nor is one
// written by two. (On Linux other programs, and file systems that know no locks, may do so all the same.)
std::FILE* OpenToRead(const std::string& path);
std::FILE* OpenToWrite(const std::string& path);  // emptied, or made
// Made; std::errc::file_exists where anything has that name. Of two that do this at once, one makes it.
std::error_code OpenToWriteNew(const std::string& path, std::FILE*& stream);
// Closes what these two have opened; false when not everything reached the file.
bool CloseStream(std::FILE* stream);
// Whether one of these two has the file open, by whatever name.
bool IsInUse(const std::string& path);

// For lines, which end as the system ends them. Terminals, the null device and their like, and pipes that somebody
// reads are welcome too; writing to these waits for whoever reads.
std::FILE* OpenToWriteText(const std::string& path);

// Reads an ordinary file of at most `limit` bytes; a longer one is std::errc::file_too_large, and nothing of it is
// given.
std::error_code ReadWholeFile(const std::string& path, size_t limit, std::vector<uint8_t>& bytes);

// A file read piece by piece, as long as it may be.
class FileReader {
 public:
  // What others may do with the file meanwhile. Only Windows can keep them from it.
  enum class Others { kMayRead, kMayWrite };

  FileReader();
  ~FileReader();
  FileReader(const FileReader&) = delete;
  FileReader& operator=(const FileReader&) = delete;

  std::error_code Open(const std::string& path, Others others = Others::kMayRead);  // ordinary files only
  void Close();
  std::error_code Seek(uint64_t offset);
  // The next bytes; fewer than there is room for only at the end of the file.
  std::error_code Read(std::span<uint8_t> buffer, size_t& count);
  uint64_t size() const;  // when it was opened

 private:
  struct State;
  std::unique_ptr<State> state_;
};

// A file being written under a temporary name beside its target. Until Commit the target stays as it was; without a
// Commit the destructor removes what was written. After a failed Write every later step fails. Only ordinary files are
// replaced, and links lead to what is. Whoever was allowed what with the target is so with the file in its place.
class AtomicFile {
 public:
  AtomicFile();
  ~AtomicFile();
  AtomicFile(const AtomicFile&) = delete;
  AtomicFile& operator=(const AtomicFile&) = delete;

  std::error_code Open(const std::string& path);
  std::error_code Write(std::span<const uint8_t> bytes);
  // What was written there before; nothing is written behind it any more.
  std::error_code Rewrite(uint64_t offset, std::span<const uint8_t> bytes);
  std::error_code Commit();  // on the disk and under the target's name, replacing what was there

 private:
  struct State;
  std::unique_ptr<State> state_;
};

std::error_code ReplaceWholeFile(const std::string& path, std::span<const uint8_t> bytes);

}  // namespace kral

#endif
