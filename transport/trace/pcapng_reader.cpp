// Takes pcapng blocks apart. Every length is checked before it is believed.
#include "transport/trace/pcapng_reader.h"

#include <algorithm>
#include <array>
#include <utility>

#include "base/little_endian.h"
#include "transport/trace/pcapng_format.h"

namespace kral {
namespace {

namespace block = pcapng::block;
namespace interface = pcapng::interface;
namespace option = pcapng::option;
namespace section = pcapng::section;
using pcapng::PaddedTo4;

// Longer ones hold nothing that is read here.
constexpr uint32_t kLongestBlock = 16U << 20;
constexpr size_t kMostInterfaces = 1024;

// The value of the first option with that code; empty where there is none.
std::span<const uint8_t> FindOption(std::span<const uint8_t> options, uint16_t code) {
  while (options.size() >= option::kHead) {
    const uint16_t found = *LoadLe<uint16_t>(options, 0);
    const size_t size = *LoadLe<uint16_t>(options, 2);
    options = options.subspan(option::kHead);
    if (found == option::kEnd || size > options.size()) break;
    if (found == code) return options.first(size);
    options = options.subspan(std::min(PaddedTo4(size), options.size()));
  }
  return {};
}

// Units are powers of ten, or with the top bit of two, in a second.
uint64_t ToMicroseconds(uint64_t time, uint8_t resolution) {
  constexpr uint64_t kPerSecond = 1000000;
  constexpr unsigned kMicro = 6;
  constexpr unsigned kKeptBits = 40;  // of a fraction: its product with the above has 60
  unsigned power = resolution & 0x7FU;
  if ((resolution & 0x80U) == 0) {
    for (; power > kMicro && time != 0; --power) time /= 10;
    for (; power < kMicro; ++power) time *= 10;
    return time;
  }
  if (power >= 64) return 0;
  const uint64_t seconds = time >> power;
  uint64_t fraction = time - (seconds << power);
  for (; power > kKeptBits; --power) fraction >>= 1;
  return seconds * kPerSecond + (fraction * kPerSecond >> power);
}

}  // namespace

PcapngReader::Outcome PcapngReader::Next(PcapngRecord& record) {
  while (last_ == Outcome::kRecord) {
    last_ = ReadBlock();
    if (last_ != Outcome::kRecord) break;
    const bool first = !std::exchange(begun_, true);
    bool whole = true;
    if (first || type_ == block::kSection) {
      if (type_ != block::kSection || !TakeSection()) last_ = first ? Outcome::kForeign : Outcome::kCut;
      continue;
    }
    if (type_ == block::kInterface) whole = TakeInterface();
    if (type_ == block::kPacket) {
      whole = TakePacket(record);
      if (whole) return last_;
    }
    if (!whole) last_ = Outcome::kCut;
  }
  return last_;
}

PcapngReader::Outcome PcapngReader::ReadBlock() {
  const Outcome broken = begun_ ? Outcome::kCut : Outcome::kForeign;
  std::array<uint8_t, block::kBody> head{};
  const auto got = source_ ? source_(head) : std::nullopt;
  if (begun_ && got == 0) return Outcome::kEnd;
  if (got != head.size()) return broken;
  type_ = *LoadLe<uint32_t>(head, block::kType);
  const uint32_t length = *LoadLe<uint32_t>(head, block::kLength);
  if (length < block::kFrame || length > kLongestBlock || length % 4 != 0) return broken;
  body_.resize(length - block::kBody);
  if (source_(body_) != body_.size()) return broken;
  if (LoadLe<uint32_t>(body_, body_.size() - sizeof(length)) != length) return broken;
  body_.resize(length - block::kFrame);
  return Outcome::kRecord;
}

bool PcapngReader::TakeSection() {
  interfaces_.clear();
  return body_.size() >= section::kOptions && LoadLe<uint32_t>(body_, section::kMagic) == section::kByteOrder &&
         LoadLe<uint16_t>(body_, section::kMajor) == section::kThisMajor;
}

bool PcapngReader::TakeInterface() {
  if (body_.size() < interface::kOptions || interfaces_.size() >= kMostInterfaces) return false;
  Interface taken{*LoadLe<uint16_t>(body_, interface::kLinkType), option::kMicroseconds};
  const auto resolution = FindOption(std::span(body_).subspan(interface::kOptions), option::kTimeResolution);
  if (!resolution.empty()) taken.resolution = resolution.front();
  interfaces_.push_back(taken);
  return true;
}

bool PcapngReader::TakePacket(PcapngRecord& record) const {
  const auto number = LoadLe<uint32_t>(body_, pcapng::packet::kInterface);
  const auto size = LoadLe<uint32_t>(body_, pcapng::packet::kCaptured);
  if (!size || *number >= interfaces_.size() || body_.size() < pcapng::packet::kData ||
      *size > body_.size() - pcapng::packet::kData) {
    return false;
  }
  const uint64_t time = uint64_t{*LoadLe<uint32_t>(body_, pcapng::packet::kTimeHigh)} << 32 |
                        *LoadLe<uint32_t>(body_, pcapng::packet::kTimeLow);
  const auto rest = std::span(body_).subspan(pcapng::packet::kData);
  record.link_type = interfaces_[*number].link_type;
  record.microseconds = ToMicroseconds(time, interfaces_[*number].resolution);
  record.data.assign(rest.begin(), rest.begin() + static_cast<std::ptrdiff_t>(*size));
  const auto options = rest.subspan(std::min(PaddedTo4(*size), rest.size()));
  record.flags = LoadLe<uint32_t>(FindOption(options, option::kPacketFlags)).value_or(0);
  return true;
}

}  // namespace kral
