// Reads and writes single NV items with the diagnostic requests; knows nothing of what an item means.
#include "commands/nv/nv_item.h"

#include <algorithm>
#include <array>
#include <optional>

#include "base/little_endian.h"
#include "commands/checked_reply.h"
#include "commands/nv/nv_format.h"
#include "frame/request_failure.h"

namespace kral::nv {
namespace {

const char* StatusText(uint16_t status) {
  switch (status) {
    case KRAL_NV_STATUS_NEVER_WRITTEN:
      return "never written";
    case KRAL_NV_STATUS_UNKNOWN_ITEM:
      return "no such item";
    case KRAL_NV_STATUS_READ_ONLY:
      return "read-only";
    default:
      return "not carried out";
  }
}

using DataBlock = std::array<u8, kDataSize>;

DataBlock Filled(std::span<const uint8_t> data) {
  DataBlock block{};
  std::copy_n(data.begin(), std::min(data.size(), block.size()), block.begin());
  return block;
}

std::optional<uint16_t> StatusAtEnd(std::span<const uint8_t> reply) {
  if (reply.size() < sizeof(uint16_t)) return std::nullopt;
  return LoadLe<uint16_t>(reply, reply.size() - sizeof(uint16_t));
}

// The status and, when it is 0, the data of the reply that the packet buffer holds.
bool TakeRead(Diag_FTM& phone, size_t offset, std::span<uint8_t> data, uint16_t& status) {
  const auto reply = phone.packet().response();
  const auto reported = StatusAtEnd(reply);
  if (!reported) return Fail(BadReply(phone, "has no status"));
  if (*reported == kDone) {
    if (reply.size() < offset || reply.size() - offset < data.size())
      return Fail(BadReply(phone, "holds too few data"));
    std::copy_n(reply.begin() + static_cast<std::ptrdiff_t>(offset), data.size(), data.begin());
  }
  status = *reported;
  return true;
}

bool AnswersInFull(Diag_FTM& phone) {
  return phone.packet().response().size() >= phone.packet().request_length() ||
         Fail(BadReply(phone, "is shorter than the request"));
}

bool TakeStatus(Diag_FTM& phone, uint16_t& status) {
  const auto reported = StatusAtEnd(phone.packet().response());
  if (!reported) return Fail(BadReply(phone, "has no status"));
  status = *reported;
  return true;
}

}  // namespace

Reply Read(Diag_FTM& phone, uint16_t item, std::span<uint8_t> data, uint16_t& status) {
  const Reply reply = Send(phone, kReadItem, item, Bytes(data), status);
  return Checked(reply, [&] { return AnswersInFull(phone) && TakeRead(phone, kItemData, data, status); });
}

Reply ReadExtended(Diag_FTM& phone, uint16_t item, uint16_t context, std::span<uint8_t> data, uint16_t& status) {
  const Reply reply = Send(phone, kReadExtended, item, context, Bytes(data), status);
  return Checked(reply, [&] { return AnswersInFull(phone) && TakeRead(phone, kExtendedData, data, status); });
}

Reply ReadElement(Diag_FTM& phone, uint16_t item, uint8_t index, std::span<uint8_t> data, uint16_t& status) {
  const Reply reply = Send(phone, kReadElement, item, index);
  return Checked(reply, [&] { return TakeRead(phone, kElementData, data, status); });
}

Reply Write(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t& status) {
  const DataBlock block = Filled(data);
  const Reply reply = Send(phone, kWriteItem, item, Block<kDataSize>(block));
  return Checked(reply, [&] { return TakeStatus(phone, status); });
}

Reply WriteExtended(Diag_FTM& phone, uint16_t item, uint16_t context, std::span<const uint8_t> data, uint16_t& status) {
  const DataBlock block = Filled(data);
  const Reply reply = Send(phone, kWriteExtended, item, context, Block<kDataSize>(block), status);
  return Checked(reply, [&] { return TakeStatus(phone, status); });
}

Reply WriteElement(Diag_FTM& phone, uint16_t item, uint8_t index, std::span<const uint8_t> data, uint16_t& status) {
  DataBlock block{index};
  std::copy_n(data.begin(), std::min(data.size(), block.size() - 1), block.begin() + 1);
  return Write(phone, item, block, status);
}

Failure Refusal(uint16_t item, uint16_t status) {
  return Failure(KRAL_ERROR_REFUSED, "NV item %d: the handset gives status %d, %s", item, status, StatusText(status))
      .Status(KRAL_ERROR_STATUS_NV, status);
}

}  // namespace kral::nv
