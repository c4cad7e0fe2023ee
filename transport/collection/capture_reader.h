// Reads a capture file record by record. What a crash or a full disk has cut is told from a file that ends well.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_READER_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_READER_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace kral {

// Fills the buffer as far as there are bytes, and gives their number; fewer than asked for is the end, and nothing is a
// file that cannot be read on.
using CaptureSource = std::function<std::optional<size_t>(std::span<uint8_t> buffer)>;

// An empty function when the file cannot be opened, and while a capture writes it.
CaptureSource OpenCaptureSource(const std::string& path);

struct CaptureRecord {
  uint64_t microseconds = 0;  // since 1970 UTC
  std::vector<uint8_t> packet;
};

// Every record from one time to another, both included.
struct CaptureStretch {
  uint64_t from = 0;
  uint64_t to = UINT64_MAX;
};

// By how many microseconds a record is at most behind one in front of it, as the head of a file tells; nothing where it
// does not.
std::optional<uint64_t> StepsBackOf(std::span<const uint8_t> head);

class CaptureReader {
 public:
  enum class Outcome : uint8_t {
    kRecord,
    kEnd,      // behind the last whole record
    kCut,      // in the midst of a record, at bytes that are none or cannot be read: everything before is whole
    kForeign,  // not a capture file, or one of a later version
  };

  explicit CaptureReader(CaptureSource source, CaptureStretch stretch = {})
      : source_(std::move(source)), stretch_(stretch) {}

  // Once it has given anything but kRecord it goes on giving that.
  Outcome Next(CaptureRecord& record);

 private:
  Outcome ReadHead();
  Outcome ReadRecord(CaptureRecord& record);

  CaptureSource source_;
  CaptureStretch stretch_;
  uint64_t last_time_ = UINT64_MAX;  // behind a later one nothing of the stretch comes
  bool begun_ = false;
  Outcome last_ = Outcome::kRecord;
};

}  // namespace kral

#endif
