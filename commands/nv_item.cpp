// Reads and writes single NV items with the plain diagnostic requests; knows nothing of what an item means.
#include "commands/nv_item.h"

#include <algorithm>
#include <array>

#include "commands/request.h"
#include "frame/base/little_endian.h"

namespace kral::nv {
namespace {

// Item id, data, status. In the reply the data stand at the same offset; the status is its last two bytes.
constexpr DiagRequest<u16, Bytes, u16> kRead{38};
constexpr size_t kDataOffset = 3;

// Item id and exactly 128 data bytes; deliberately no status behind them, unlike the read.
constexpr DiagRequest<u16, Block<kDataSize>> kWrite{39};

}  // namespace

bool Read(Diag_FTM& phone, uint16_t item, std::span<uint8_t> data, uint16_t& status) {
  if (!Send(phone, kRead, item, Bytes(data), status)) return false;
  const auto reply = phone.packet().response();
  if (reply.size() < phone.packet().request_length()) return false;
  const auto reported = LoadLe<uint16_t>(reply, reply.size() - sizeof status);
  if (!reported) return false;
  // A request cut at the packet buffer's end says nothing about the room that the reply needs.
  if (*reported == kDone && reply.size() < kDataOffset + data.size()) return false;
  status = *reported;
  if (status == kDone) std::copy_n(reply.begin() + kDataOffset, data.size(), data.begin());
  return true;
}

bool Write(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t& status) {
  std::array<u8, kDataSize> block{};
  std::copy_n(data.begin(), std::min(data.size(), block.size()), block.begin());
  if (!Send(phone, kWrite, item, Block<kDataSize>(block))) return false;
  const auto reply = phone.packet().response();
  if (reply.size() < sizeof status) return false;
  const auto reported = LoadLe<uint16_t>(reply, reply.size() - sizeof status);
  if (!reported) return false;
  status = *reported;
  return true;
}

}  // namespace kral::nv
