// The handset's loader: takes a program into memory and starts it. What the download request (58) leads to.
#ifndef KRAL_HANDSET_LOADERS_KOVA_LOADER_H
#define KRAL_HANDSET_LOADERS_KOVA_LOADER_H

#include <memory>
#include <mutex>
#include <optional>

#include "handset/line/framed_mode.h"
#include "handset/services/memory.h"

namespace kral::handset {

class KovaLoader final : public FramedMode {
 public:
  // Whatever program is started, it turns out to be `program`.
  KovaLoader(Memory& memory, std::shared_ptr<WireMode> program) : memory_(memory), program_(std::move(program)) {}

  void SetResetTime(uint32_t milliseconds);    // silence after a reset
  std::optional<uint32_t> started_at() const;  // the address of the last start
  void OnEnter(Wire& wire) override;

 private:
  bool OnPacket(ByteView packet, Wire& wire) override;
  bool Load(ByteView packet);
  bool MayStart(uint32_t address) const;

  Memory& memory_;
  const std::shared_ptr<WireMode> program_;
  mutable std::mutex mutex_;
  uint32_t reset_time_ms_ = 0;
  std::optional<uint32_t> started_at_;
  std::optional<uint32_t> first_address_;
  uint64_t bytes_loaded_ = 0;
};

}  // namespace kral::handset

#endif
