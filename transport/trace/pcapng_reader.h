// Reads the packets of a pcapng file, whoever wrote it. Blocks and options that say nothing here are passed over.
#ifndef KRAL_TRANSPORT_TRACE_PCAPNG_READER_H
#define KRAL_TRANSPORT_TRACE_PCAPNG_READER_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "transport/collection/capture_reader.h"

namespace kral {

struct PcapngRecord {
  uint16_t link_type = 0;
  uint64_t microseconds = 0;  // since 1970 UTC
  uint32_t flags = 0;         // pcapng::flags; 0 where the file does not tell
  std::vector<uint8_t> data;
};

class PcapngReader {
 public:
  // As CaptureReader's; kForeign is a file of the other byte order, too.
  using Outcome = CaptureReader::Outcome;

  explicit PcapngReader(CaptureSource source) : source_(std::move(source)) {}

  // Once it has given anything but kRecord it goes on giving that.
  Outcome Next(PcapngRecord& record);

 private:
  struct Interface {
    uint16_t link_type = 0;
    uint8_t resolution = 6;  // as the option has it
  };

  Outcome ReadBlock();
  bool TakeSection();
  bool TakeInterface();
  bool TakePacket(PcapngRecord& record) const;

  CaptureSource source_;
  bool begun_ = false;
  Outcome last_ = Outcome::kRecord;
  uint32_t type_ = 0;  // of the block
  std::vector<uint8_t> body_;
  std::vector<Interface> interfaces_;  // of the section
};

}  // namespace kral

#endif
