// Sends single EFS2 requests. What they ask for and what their replies say is the business of the operations.
#include "storage/efs_request.h"

#include <algorithm>

namespace kral::efs {
namespace {

// What the packet buffer is filled with: no handset answers with this code.
constexpr u8 kNoReply = 0xBB;

}  // namespace

Path PathField(const char* path) {
  if (path == nullptr) path = "";
  // A path beyond every limit is cut to one that still is, so that its request is refused rather than sent without it.
  size_t size = 0;
  while (size < kLongestGetRequest && path[size] != '\0') ++size;
  return {reinterpret_cast<const u8*>(path), size < kLongestGetRequest ? size + 1 : size};
}

std::optional<std::string> TextAt(std::span<const u8> reply, size_t offset) {
  if (offset >= reply.size()) return std::nullopt;
  const auto rest = reply.subspan(offset);
  const auto end = std::find(rest.begin(), rest.end(), u8{0});
  if (end == rest.end()) return std::nullopt;
  return std::string(rest.begin(), end);
}

bool IsWithinLimit(Diag_FTM& phone) {
  const size_t size = phone.packet().request_length();
  if (size <= kLongestRequest) return true;
  phone.log().WriteLine(kLogErr, "EFS2 request of %d bytes not sent: its path is too long", static_cast<int>(size));
  return false;
}

bool Exchange(Diag_FTM& phone, u32 time_out_ms) {
  CDiagPacket& packet = phone.packet();
  packet.response_area()[0] = kNoReply;
  packet.set_response_length(CDiagPacket::kCapacity);
  if (!phone.Send(packet, time_out_ms)) return false;
  const auto request = packet.request();
  const auto reply = packet.response();
  if (reply.size() >= kHeaderSize && std::equal(request.begin(), request.begin() + kHeaderSize, reply.begin())) {
    return true;
  }
  phone.log().WriteLine(kLogErr, "EFS2 reply belongs to another request");
  return false;
}

bool ExchangeUntil(Diag_FTM& phone, u32 time_out_ms, const std::function<bool(std::span<const u8>)>& accepts) {
  for (int attempt = 0; attempt < kTries; ++attempt) {
    if (Exchange(phone, time_out_ms) && accepts(phone.packet().response())) return true;
  }
  return false;
}

bool ReadFromEnd(Diag_FTM& phone, std::initializer_list<u32*> fields) {
  CDiagPacket& packet = phone.packet();
  if (packet.response_length() < kHeaderSize + fields.size() * sizeof(u32)) return false;
  return std::all_of(fields.begin(), fields.end(), [&](u32* field) { return packet.Read32(*field); });
}

u8 LastRefusal(Diag_FTM& phone) {
  constexpr u8 kRefusals[] = {kBadCommand, 20, 21, 24};
  u8 code = 0;
  phone.packet().ResponseAt8(0, code);
  return std::find(std::begin(kRefusals), std::end(kRefusals), code) == std::end(kRefusals) ? u8{0} : code;
}

}  // namespace kral::efs
