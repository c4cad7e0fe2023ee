// Blocks and their options, byte by byte.
#include "transport/trace/pcapng_blocks.h"

#include <array>
#include <concepts>
#include <string>

#include "base/little_endian.h"
#include "transport/trace/pcapng_format.h"

namespace kral::pcapng {
namespace {

// One block at the end of the file in memory; its lengths are known once all of it is there.
class Block {
 public:
  Block(std::vector<uint8_t>& file, uint32_t type) : file_(file), begin_(file.size()) {
    Put(type);
    Put(uint32_t{0});
  }

  template <std::unsigned_integral T>
  void Put(T value) {
    std::array<uint8_t, sizeof(T)> bytes{};
    StoreLe(std::span<uint8_t>(bytes), 0, value);
    file_.insert(file_.end(), bytes.begin(), bytes.end());
  }
  void PutTime(uint64_t microseconds) {
    Put(static_cast<uint32_t>(microseconds >> 32));
    Put(static_cast<uint32_t>(microseconds));
  }
  void PutPadded(std::span<const uint8_t> bytes) {
    file_.insert(file_.end(), bytes.begin(), bytes.end());
    file_.resize(begin_ + PaddedTo4(file_.size() - begin_));
  }
  void PutText(uint16_t code, std::string_view text) {
    if (text.empty()) return;
    text = text.substr(0, UINT16_MAX);
    PutOption(code, {reinterpret_cast<const uint8_t*>(text.data()), text.size()});
  }
  template <std::unsigned_integral T>
  void PutNumber(uint16_t code, T value) {
    std::array<uint8_t, sizeof(T)> bytes{};
    StoreLe(std::span<uint8_t>(bytes), 0, value);
    PutOption(code, bytes);
  }
  // With the end of the options, for a block that has some.
  void End() {
    Put(uint32_t{option::kEnd});
    const auto length = static_cast<uint32_t>(file_.size() - begin_ + sizeof(uint32_t));
    Put(length);
    StoreLe(std::span(file_).subspan(begin_), block::kLength, length);
  }

 private:
  void PutOption(uint16_t code, std::span<const uint8_t> value) {
    Put(code);
    Put(static_cast<uint16_t>(value.size()));
    PutPadded(value);
  }

  std::vector<uint8_t>& file_;
  const size_t begin_;
};

}  // namespace

void AppendSection(std::vector<uint8_t>& file, std::string_view application) {
  Block block(file, block::kSection);
  block.Put(section::kByteOrder);
  block.Put(section::kThisMajor);
  block.Put(uint16_t{0});
  block.Put(section::kUnknownLength);
  block.PutText(option::kApplication, application);
  block.End();
}

void AppendInterface(std::vector<uint8_t>& file, uint16_t link_type, const InterfaceText& text) {
  Block block(file, block::kInterface);
  block.Put(uint32_t{link_type});
  block.Put(uint32_t{0});
  block.PutText(option::kName, text.name);
  block.PutText(option::kDescription, text.description);
  block.PutNumber(option::kTimeResolution, option::kMicroseconds);
  block.End();
}

void AppendPacket(std::vector<uint8_t>& file, const PacketBlock& packet) {
  Block block(file, block::kPacket);
  block.Put(packet.interface);
  block.PutTime(packet.microseconds);
  const auto size = static_cast<uint32_t>(packet.data.size());
  block.Put(size);
  block.Put(size);
  block.PutPadded(packet.data);
  block.PutText(option::kComment, packet.comment);
  block.PutNumber(option::kPacketFlags, packet.flags);
  block.End();
}

void AppendStatistics(std::vector<uint8_t>& file, uint32_t interface, uint64_t microseconds, uint64_t received,
                      uint64_t dropped) {
  Block block(file, block::kStatistics);
  block.Put(interface);
  block.PutTime(microseconds);
  block.PutNumber(option::kReceivedCount, received);
  block.PutNumber(option::kDroppedCount, dropped);
  block.End();
}

}  // namespace kral::pcapng
