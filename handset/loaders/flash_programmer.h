// A flash programmer as the host sees it: hello, set-up, images into flash. It runs once a loader has started it.
#ifndef KRAL_HANDSET_LOADERS_FLASH_PROGRAMMER_H
#define KRAL_HANDSET_LOADERS_FLASH_PROGRAMMER_H

#include <mutex>
#include <optional>

#include "handset/line/framed_mode.h"
#include "handset/loaders/flash_memory.h"

namespace kral::handset {

// What it announces and how it takes its time. Loss, disorder and repetition are the business of the faults.
struct ProgrammerSettings {
  uint32_t block_size = 1024;
  uint16_t window = 4;
  uint32_t flash_base = 0;
  Bytes flash_id = {0x01, 0x20, 0x9F};
  uint32_t acknowledge_delay_ms = 0;  // from a write to its acknowledgement
  uint8_t open_status = 0;
  uint8_t partition_erase_status = 0;  // what a good table is answered with, once it has replaced another
};

// One image as it was opened and closed.
struct WrittenImage {
  uint8_t type = 0;
  Bytes header;
  uint64_t bytes = 0;  // received; more than the image has when blocks came again
  bool closed = false;
};

class FlashProgrammer final : public FramedMode {
 public:
  explicit FlashProgrammer(FlashMemory& flash) : flash_(flash) {}

  void OnEnter(Wire& wire) override;

  ProgrammerSettings settings() const;
  void Set(ProgrammerSettings settings);

  std::vector<WrittenImage> images() const;
  std::optional<uint8_t> security_mode() const;
  Bytes partition_table() const;  // empty before the first
  size_t most_ahead() const;      // writes not yet acknowledged when another came, at most

 private:
  bool OnPacket(ByteView packet, Wire& wire) override;
  void Hello(ByteView packet, Wire& wire);
  void Write(ByteView packet, Wire& wire);
  void Partition(ByteView packet, Wire& wire);
  void Open(ByteView packet, Wire& wire);
  void Close(Wire& wire);

  FlashMemory& flash_;
  mutable std::mutex mutex_;
  ProgrammerSettings settings_;
  bool greeted_ = false;
  bool open_ = false;
  std::vector<WrittenImage> images_;
  std::optional<uint8_t> security_mode_;
  Bytes partition_table_;
  std::vector<uint32_t> due_;  // ticks of the acknowledgements on their way
  size_t most_ahead_ = 0;
};

}  // namespace kral::handset

#endif
