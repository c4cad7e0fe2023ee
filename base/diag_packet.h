// The request and response buffer in which every command family builds its request and reads its reply.
#ifndef KRAL_BASE_DIAG_PACKET_H
#define KRAL_BASE_DIAG_PACKET_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

namespace kral {

class CDiagPacket {
 public:
  static constexpr uint16_t kCapacity = 6144;

  CDiagPacket() { Reset(); }

  // Request 0xAA, response 0xBB, request length 0, response length kCapacity, cursor not started.
  void Reset();

  // Little-endian appends. One that does not fit is dropped silently and the request still goes out: required.
  void Append8(uint8_t value);
  void Append16(uint16_t value);
  void Append32(uint32_t value);
  void AppendBlock(std::span<const uint8_t> block);

  // Reads from the end of the response backwards; false (output untouched) when fewer bytes remain.
  bool Read8(uint8_t& value);
  bool Read16(uint16_t& value);
  bool Read32(uint32_t& value);
  bool ReadBlock(std::span<uint8_t> block);

  std::span<const uint8_t> request() const { return {request_.data(), request_length_}; }
  std::span<uint8_t> request_area() { return request_; }
  uint16_t request_length() const { return request_length_; }

  // What was received: at most response_length() bytes are valid.
  std::span<const uint8_t> response() const { return {response_.data(), response_length_}; }
  std::span<uint8_t> response_area() { return response_; }
  uint16_t response_length() const { return response_length_; }
  void set_response_length(uint16_t length);  // cut at kCapacity

  // Little-endian fields of the response; false (output untouched) when the received length does not hold them.
  bool ResponseAt8(size_t offset, uint8_t& value) const;
  bool ResponseAt16(size_t offset, uint16_t& value) const;
  bool ResponseAt32(size_t offset, uint32_t& value) const;

 private:
  std::array<uint8_t, kCapacity> request_;
  std::array<uint8_t, kCapacity> response_;
  uint16_t request_length_;
  uint16_t response_length_;
  uint16_t cursor_;
};

}  // namespace kral

#endif
