// A whole file seen as memory.
#ifndef KRAL_PLATFORM_FILE_MAPPING_H
#define KRAL_PLATFORM_FILE_MAPPING_H

#include <cstddef>
#include <cstdint>
#include <string>

namespace kral {

class CMapFileToMemory {
 public:
  CMapFileToMemory() = default;
  ~CMapFileToMemory() { Close(); }
  CMapFileToMemory(const CMapFileToMemory&) = delete;
  CMapFileToMemory& operator=(const CMapFileToMemory&) = delete;

  // Maps an existing file, closing an earlier one first. Null on failure, with everything closed again: also for an
  // empty file, which no system maps. On Windows others may read but not write the file meanwhile; Linux has no such
  // promise, and touching the view behind the new end of a file that was cut short ends the process.
  uint8_t* Open(const std::string& path, bool writable);
  void Close();

  // Bytes of the file as they are now, within Size(). False when the file has them no longer: this may be asked of
  // files that others cut short.
  bool Copy(uint64_t offset, void* buffer, size_t count) const;

  uint8_t* view() const { return view_; }
  uint64_t Size() const { return size_; }  // 0 when no file is open

  // What the system said about the last step of the last Open: 0, or GetLastError or errno.
  uint32_t last_error() const { return last_error_; }
  // Whether the last Open failed because there is no address space for the whole file.
  bool too_large() const { return too_large_; }

 private:
  static constexpr intptr_t kInvalid = -1;

  intptr_t file_ = kInvalid;
  [[maybe_unused]] void* mapping_ = nullptr;  // Windows only
  uint8_t* view_ = nullptr;
  uint64_t size_ = 0;
  uint32_t last_error_ = 0;
  bool too_large_ = false;
};

}  // namespace kral

#endif
