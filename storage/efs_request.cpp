// Sends single EFS2 requests. What they ask for and what their replies say is the business of the operations.
#include "storage/efs_request.h"

#include <algorithm>
#include <chrono>

#include "storage/efs_strays.h"

namespace kral::efs {
namespace {

// What the packet buffer is filled with: no handset answers with this code.
constexpr u8 kNoReply = 0xBB;
constexpr size_t kFcsBytes = 2;  // at the end of every record of the response queue

bool IsRefusal(u8 code) {
  constexpr u8 kRefusals[] = {kBadCommand, 20, 21, 24};
  return std::find(std::begin(kRefusals), std::end(kRefusals), code) != std::end(kRefusals);
}

bool IsOwnReply(const CDiagPacket& packet, const ReplyTest& is_own) {
  const auto request = packet.request();
  const auto reply = packet.response();
  return reply.size() >= kHeaderSize && std::equal(request.begin(), request.begin() + kHeaderSize, reply.begin()) &&
         (!is_own || is_own(reply));
}

// Puts the reply that follows into the buffer.
bool AwaitNextReply(Diag_FTM& phone, CDiagPacket& packet, u32 start, u32 time_out_ms) {
  packet.response_area()[0] = kNoReply;
  const u32 elapsed = phone.clock().TickMs() - start;
  // Through a phone server no reply comes unasked.
  if (elapsed >= time_out_ms || phone.server_mode()) return false;
  const auto record = phone.responses().PopWithin(std::chrono::milliseconds(time_out_ms - elapsed));
  if (!record || record->size() <= kFcsBytes) return false;
  const size_t size = std::min<size_t>(record->size() - kFcsBytes, CDiagPacket::kCapacity);
  std::copy_n(record->begin(), size, packet.response_area().begin());
  packet.set_response_length(static_cast<u16>(size));
  return true;
}

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

Answer ExchangePacket(Diag_FTM& phone, CDiagPacket& packet, u32 time_out_ms, const ReplyTest& is_own) {
  NoteLateReplies(phone);
  const u32 start = phone.clock().TickMs();
  packet.response_area()[0] = kNoReply;
  packet.set_response_length(CDiagPacket::kCapacity);
  phone.Send(packet, time_out_ms);
  if (packet.response_area()[0] == kNoReply) {
    return phone.clock().TickMs() - start < time_out_ms ? Answer::kNotSent : Answer::kNone;
  }
  while (!IsOwnReply(packet, is_own)) {
    if (IsRefusal(packet.response_area()[0])) return Answer::kRefused;
    phone.log().WriteLine(kLogErr, "EFS2 reply belongs to another request");
    NoteLateReply(phone, packet.response());
    if (!AwaitNextReply(phone, packet, start, time_out_ms)) return Answer::kNone;
  }
  return Answer::kOwn;
}

Answer ExchangeOnce(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own) {
  const Answer answer = ExchangePacket(phone, phone.packet(), time_out_ms, is_own);
  CloseStrays(phone);
  return answer;
}

bool ExchangeUntil(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own, const ReplyTest& accepts) {
  for (int attempt = 0; attempt < kTries; ++attempt) {
    // With a handset that is silent, an abort would otherwise wait for every try.
    if (attempt > 0 && phone.efs().abort) return false;
    if (ExchangeOnce(phone, time_out_ms, is_own) == Answer::kOwn && accepts(phone.packet().response())) return true;
  }
  return false;
}

bool AskComposed(Diag_FTM& phone, Tries tries) {
  const u32 time_out_ms = DefaultTimeOut(phone);
  if (tries == Tries::kOne) return Exchange(phone, time_out_ms);
  return ExchangeUntil(phone, time_out_ms, {}, [](std::span<const u8>) { return true; });
}

bool IsAborted(Diag_FTM& phone, const char* operation) {
  if (!phone.efs().abort) return false;
  phone.log().WriteLine(kLogErr, "EFS %s aborted", operation);
  return true;
}

bool ReadFromEnd(Diag_FTM& phone, std::initializer_list<u32*> fields) {
  CDiagPacket& packet = phone.packet();
  if (packet.response_length() < kHeaderSize + fields.size() * sizeof(u32)) return false;
  return std::all_of(fields.begin(), fields.end(), [&](u32* field) { return packet.Read32(*field); });
}

u8 LastRefusal(Diag_FTM& phone) {
  u8 code = 0;
  phone.packet().ResponseAt8(0, code);
  return IsRefusal(code) ? code : u8{0};
}

}  // namespace kral::efs
