// The packet buffer: bounded appends to the request, and reads from the end of the response. What the bytes mean is
// left to the command families.
#include "base/diag_packet.h"

#include <algorithm>

#include "base/little_endian.h"

namespace kral {
namespace {

constexpr uint8_t kRequestFill = 0xAA;
constexpr uint8_t kResponseFill = 0xBB;

template <class T>
bool LoadAt(std::span<const uint8_t> response, size_t offset, T& value) {
  const auto loaded = LoadLe<T>(response, offset);
  if (!loaded) return false;
  value = *loaded;
  return true;
}

}  // namespace

void CDiagPacket::Reset() {
  request_.fill(kRequestFill);
  response_.fill(kResponseFill);
  request_length_ = 0;
  response_length_ = kCapacity;
  cursor_ = 0;
}

// An append that would fill the last byte is dropped too: kept, so that a request is cut at the same field on every
// station.
void CDiagPacket::Append8(uint8_t value) {
  if (request_length_ >= kCapacity - 1) return;
  request_[request_length_++] = value;
}

void CDiagPacket::Append16(uint16_t value) {
  if (request_length_ >= kCapacity - 2) return;
  StoreLe(std::span(request_), request_length_, value);
  request_length_ = static_cast<uint16_t>(request_length_ + sizeof(value));
}

void CDiagPacket::Append32(uint32_t value) {
  if (request_length_ >= kCapacity - 4) return;
  StoreLe(std::span(request_), request_length_, value);
  request_length_ = static_cast<uint16_t>(request_length_ + sizeof(value));
}

void CDiagPacket::AppendBlock(std::span<const uint8_t> block) {
  // Compared so that a block larger than the whole buffer cannot wrap around.
  if (block.size() >= kCapacity || request_length_ >= kCapacity - block.size()) return;
  std::ranges::copy(block, request_.begin() + request_length_);
  request_length_ = static_cast<uint16_t>(request_length_ + block.size());
}

bool CDiagPacket::Read8(uint8_t& value) {
  return ReadBlock({&value, 1});
}

bool CDiagPacket::Read16(uint16_t& value) {
  std::array<uint8_t, sizeof(value)> bytes;
  return ReadBlock(bytes) && LoadAt<uint16_t>(bytes, 0, value);
}

bool CDiagPacket::Read32(uint32_t& value) {
  std::array<uint8_t, sizeof(value)> bytes;
  return ReadBlock(bytes) && LoadAt<uint32_t>(bytes, 0, value);
}

bool CDiagPacket::ReadBlock(std::span<uint8_t> block) {
  // 0 means "not started" also after the front has been reached: the next read begins at the end again.
  if (cursor_ == 0) cursor_ = response_length_;
  if (cursor_ < block.size()) return false;
  cursor_ = static_cast<uint16_t>(cursor_ - block.size());
  std::copy_n(response_.begin() + cursor_, block.size(), block.begin());
  return true;
}

void CDiagPacket::set_response_length(uint16_t length) {
  response_length_ = std::min(length, kCapacity);
}

bool CDiagPacket::ResponseAt8(size_t offset, uint8_t& value) const {
  return LoadAt(response(), offset, value);
}
bool CDiagPacket::ResponseAt16(size_t offset, uint16_t& value) const {
  return LoadAt(response(), offset, value);
}
bool CDiagPacket::ResponseAt32(size_t offset, uint32_t& value) const {
  return LoadAt(response(), offset, value);
}

}  // namespace kral
