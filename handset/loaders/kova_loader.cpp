// Answers the packets of the KOVA download protocol, whose fields are big-endian.
#include "handset/loaders/kova_loader.h"

namespace kral::handset {
namespace {

constexpr uint8_t kAcknowledged = 0x02;
constexpr uint8_t kRefused = 0x03;
constexpr uint8_t kSoftwareVersion = 0x21;
constexpr size_t kKovaHeaderSize = 7;
constexpr size_t kMostData = 4089;

uint32_t GetBe(ByteView bytes, size_t offset, size_t size) {
  uint32_t value = 0;
  for (size_t i = 0; i < size; ++i) value = value << 8 | GetU8(bytes, offset + i);
  return value;
}

}  // namespace

void KovaLoader::OnEnter(Wire& wire) {
  FramedMode::OnEnter(wire);
  const std::lock_guard lock(mutex_);
  first_address_.reset();
  bytes_loaded_ = 0;
}

bool KovaLoader::OnPacket(ByteView packet, Wire& wire) {
  const std::lock_guard lock(mutex_);
  const auto answer = [&wire](bool done) { wire.Send(Bytes{done ? kAcknowledged : kRefused}); };
  switch (packet[0]) {
    case 0x05: {
      const uint32_t address = GetBe(packet, 1, 4);
      const bool starts = packet.size() == 5 && MayStart(address);
      answer(starts);
      if (!starts) return true;
      started_at_ = address;
      wire.Enter(program_);
      return false;
    }
    case 0x06:
      answer(packet.size() == 1);
      return true;
    case 0x0A:
      answer(packet.size() == 1);
      if (packet.size() != 1) return true;
      wire.Restart(reset_time_ms_);
      return false;
    case 0x0C:
      if (packet.size() == 1) wire.Send(Bytes{0x0D, kSoftwareVersion});
      return true;
    case 0x0F:
      answer(Load(packet));
      return true;
    default:
      answer(false);
      return true;
  }
}

bool KovaLoader::Load(ByteView packet) {
  if (packet.size() < kKovaHeaderSize) return false;
  const ByteView data = packet.subspan(kKovaHeaderSize);
  if (data.empty() || data.size() > kMostData || data.size() != GetBe(packet, 5, 2)) return false;
  const uint32_t address = GetBe(packet, 1, 4);
  if (!first_address_) first_address_ = address;
  memory_.Store(address, data);
  bytes_loaded_ += data.size();
  return true;
}

// Only what was loaded: a start somewhere else would hang a real handset.
bool KovaLoader::MayStart(uint32_t address) const {
  return first_address_ && address - *first_address_ < bytes_loaded_;
}

void KovaLoader::SetResetTime(uint32_t milliseconds) {
  const std::lock_guard lock(mutex_);
  reset_time_ms_ = milliseconds;
}

std::optional<uint32_t> KovaLoader::started_at() const {
  const std::lock_guard lock(mutex_);
  return started_at_;
}

}  // namespace kral::handset
