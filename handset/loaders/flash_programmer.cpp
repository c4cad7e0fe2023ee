// Answers the packets of the streaming download protocol. Packets it does not know, and those of a wrong length, get no
// answer.
#include "handset/loaders/flash_programmer.h"

#include <algorithm>
#include <string_view>

namespace kral::handset {
namespace {

constexpr std::string_view kHostMagic = "VRMO fast download protocol host";
constexpr std::string_view kTargetMagic = "VRMO fast download protocol targ";
constexpr size_t kHelloSize = 36;
constexpr size_t kWriteHeaderSize = 5;
constexpr size_t kTableSize = 512;
constexpr size_t kLongestHeader = 512;
constexpr uint8_t kVersion = 2;

// A table begins with this number of partitions, and has a name for each.
constexpr size_t kPartitionSize = 16;
enum TableStatus : uint8_t { kAccepted = 0, kUseOverride = 1, kBadFormat = 2 };

bool IsTable(ByteView table) {
  const size_t count = table[0];
  if (count == 0 || 1 + count * kPartitionSize > table.size()) return false;
  for (size_t i = 0; i < count; ++i) {
    if (table[1 + i * kPartitionSize] == 0) return false;
  }
  return true;
}

Bytes Begin(std::string_view magic, uint8_t code) {
  Bytes packet(1 + magic.size(), code);
  std::ranges::copy(magic, packet.begin() + 1);
  return packet;
}

}  // namespace

void FlashProgrammer::OnEnter(Wire& wire) {
  FramedMode::OnEnter(wire);
  const std::lock_guard lock(mutex_);
  greeted_ = open_ = false;
  due_.clear();
}

bool FlashProgrammer::OnPacket(ByteView packet, Wire& wire) {
  const std::lock_guard lock(mutex_);
  switch (packet[0]) {
    case 0x01:
      Hello(packet, wire);
      break;
    case 0x07:
      Write(packet, wire);
      break;
    case 0x09:
      wire.Send(Bytes{0x0A});
      break;
    case 0x0A:
      if (packet.size() != 1) break;
      wire.Send(Bytes{0x02});
      wire.Restart(0);
      return false;
    case 0x15:
      if (packet.size() == 1) Close(wire);
      break;
    case 0x17:
      if (packet.size() != 2) break;
      security_mode_ = packet[1];
      wire.Send(Bytes{0x18});
      break;
    case 0x19:
      Partition(packet, wire);
      break;
    case 0x1B:
      Open(packet, wire);
      break;
    default:
      break;
  }
  return true;
}

void FlashProgrammer::Hello(ByteView packet, Wire& wire) {
  const Bytes expected = Begin(kHostMagic, 0x01);
  if (packet.size() != kHelloSize || !std::equal(expected.begin(), expected.end(), packet.begin())) return;
  greeted_ = true;
  const auto id_length = static_cast<uint8_t>(std::min<size_t>(settings_.flash_id.size(), UINT8_MAX));
  wire.Send(ByteWriter()
                .Raw(Begin(kTargetMagic, 0x02))
                .U8(kVersion)
                .U8(kVersion)
                .U32(settings_.block_size)
                .U32(settings_.flash_base)
                .U8(id_length)
                .Raw(ByteView(settings_.flash_id).first(id_length))
                .U16(settings_.window)
                .U16(1)  // number of sectors, of which the host wants to know nothing
                .U32(FlashMemory::kSectorSize)
                .Take());
}

void FlashProgrammer::Write(ByteView packet, Wire& wire) {
  if (!greeted_ || packet.size() < kWriteHeaderSize) return;
  const ByteView data = packet.subspan(kWriteHeaderSize);
  if (data.size() > settings_.block_size) return;
  const uint32_t now = wire.clock().TickMs();
  std::erase_if(due_, [now](uint32_t due) { return static_cast<int32_t>(now - due) >= 0; });
  most_ahead_ = std::max(most_ahead_, due_.size());
  due_.push_back(now + settings_.acknowledge_delay_ms);

  // Without an opening packet the first write begins the image.
  if (images_.empty() || images_.back().closed) {
    images_.emplace_back();
    flash_.BeginImage();
  }
  images_.back().bytes += data.size();
  flash_.Program(GetU32(packet, 1), data);
  wire.Send(ByteWriter().U8(0x08).Raw(packet.subspan(1, 4)).Take(), settings_.acknowledge_delay_ms);
}

void FlashProgrammer::Partition(ByteView packet, Wire& wire) {
  if (packet.size() != 2 + kTableSize) return;
  const ByteView table = packet.subspan(2);
  uint8_t status = kAccepted;
  if (!IsTable(table)) {
    status = kBadFormat;
  } else if (!std::equal(table.begin(), table.end(), partition_table_.begin(), partition_table_.end())) {
    const bool replaces = !partition_table_.empty();
    status = replaces && packet[1] == 0 ? uint8_t{kUseOverride} : replaces ? settings_.partition_erase_status : 0;
    if (status == kAccepted) partition_table_.assign(table.begin(), table.end());
  }
  wire.Send(Bytes{0x1A, status});
}

void FlashProgrammer::Open(ByteView packet, Wire& wire) {
  if (!greeted_ || packet.size() < 2 || packet.size() > 2 + kLongestHeader) return;
  if (settings_.open_status == 0) {
    WrittenImage image;
    image.type = packet[1];
    image.header.assign(packet.begin() + 2, packet.end());
    images_.push_back(std::move(image));
    flash_.BeginImage();
    open_ = true;
  }
  wire.Send(Bytes{0x1C, settings_.open_status});
}

void FlashProgrammer::Close(Wire& wire) {
  if (!open_) return;
  open_ = false;
  images_.back().closed = true;
  wire.Send(Bytes{0x16});
}

ProgrammerSettings FlashProgrammer::settings() const {
  const std::lock_guard lock(mutex_);
  return settings_;
}

void FlashProgrammer::Set(ProgrammerSettings settings) {
  const std::lock_guard lock(mutex_);
  settings_ = std::move(settings);
}

std::vector<WrittenImage> FlashProgrammer::images() const {
  const std::lock_guard lock(mutex_);
  return images_;
}

std::optional<uint8_t> FlashProgrammer::security_mode() const {
  const std::lock_guard lock(mutex_);
  return security_mode_;
}

Bytes FlashProgrammer::partition_table() const {
  const std::lock_guard lock(mutex_);
  return partition_table_;
}

size_t FlashProgrammer::most_ahead() const {
  const std::lock_guard lock(mutex_);
  return most_ahead_;
}

}  // namespace kral::handset
