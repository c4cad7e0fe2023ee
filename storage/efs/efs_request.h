// One EFS2 request and its reply: the limits before sending, the tries, and what makes a reply this request's own.
#ifndef KRAL_STORAGE_EFS_EFS_REQUEST_H
#define KRAL_STORAGE_EFS_EFS_REQUEST_H

#include <initializer_list>
#include <optional>
#include <string>

#include "base/little_endian.h"
#include "commands/checked_reply.h"
#include "frame/request_failure.h"
#include "storage/efs/efs_format.h"
#include "storage/efs/efs_settings.h"

namespace kral::efs {

// The characters and the terminating zero; null is an empty path.
Path PathField(const char* path);

// The terminated text at an offset of a reply; nothing when it has no end within what was received.
std::optional<std::string> TextAt(std::span<const u8> reply, size_t offset);

inline constexpr size_t kSidePacket = 1;  // for requests that leave the default packet buffer alone

// Sends a buffer's request once. A reply that repeats another header, or is not `is_own`, answers an earlier request
// that was given up: the right one is waited for behind it, for the rest of the time-out, so that one late answer does
// not put every later one off by one.
Reply ExchangePacket(Diag_FTM& phone, CDiagPacket& packet, u32 time_out_ms, const ReplyTest& is_own = {});

// These act on the request in the phone's default packet buffer unless they are given one, and the reply is found there
// afterwards.

// False (logged) when a request with a path is longer than the handset takes.
bool IsWithinLimit(Diag_FTM& phone);
// Sends once; handles that late replies tell of are closed besides.
Reply ExchangeOnce(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own = {});
// Sends until a reply of its own is accepted, at most so many times, and neither after an abort nor to a device that
// went away: what is back by then may be another handset. Each try opens a port that an earlier one's time-out has
// closed. Whoever does not accept a reply has noted why.
Reply ExchangeUntil(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own, const ReplyTest& accepts,
                    int tries = kTries);

// A transfer, listing or sync, as long as it runs: an abort ends each of its requests but those that clean up. Earlier
// aborts are forgotten, but for one of the job that it is a part of.
class Transfer {
 public:
  explicit Transfer(Diag_FTM& phone);
  ~Transfer();
  Transfer(const Transfer&) = delete;
  Transfer& operator=(const Transfer&) = delete;

 private:
  Settings& settings_;
};
// What cleans up after one. After an abort the handset is told, but hardly waited for.
Reply ExchangeToCleanUp(Diag_FTM& phone, CDiagPacket& packet, u32 time_out_ms);
int CleanUpTries(Diag_FTM& phone);

// Whether the transfer or listing is to end; logged and noted when it is.
bool IsAborted(Diag_FTM& phone, const char* operation);

// Reads double words from the end of the reply backwards; false (noted) when it does not hold that many behind its
// header.
bool ReadFromEnd(Diag_FTM& phone, std::initializer_list<u32*> fields);

// Reads a double word at an offset of the reply; false (noted) when the reply ends before.
bool ReadAt(Diag_FTM& phone, size_t offset, u32& field);

// Whether the handset's error number is that of success. If not, it is noted as what became of the file or folder.
bool IsDone(u32 error, const char* path);

// A reply whose fields contradict each other or the request. Logged by whoever found it; always false.
bool Contradicts(Diag_FTM& phone);

inline u32 DefaultTimeOut(const Diag_FTM& phone) {
  return phone.TimeOut(kTimeOutDefaultCommand);
}
inline u32 PacketTimeOut(Diag_FTM& phone) {
  return phone.state<Settings>().packet_time_out_ms;
}

// Closes what late replies have named. The request and the reply in the phone's default packet buffer stay.
void CloseStrays(Diag_FTM& phone);
// Tried until the handset confirms it; a failure is logged. One that may be closed by now: the handset need not know
// it. The default packet buffer stays, too.
bool CloseHandle(Diag_FTM& phone, const EfsRequest<u32>& close, u32 value, u32 time_out_ms, bool may_be_closed = false);

// Requests that stand alone are sent once. Those of a transfer that change nothing are repeated until answered.
enum class Tries { kOne, kTransfer };

Reply AskComposed(Diag_FTM& phone, Tries tries);

// A request with a path and the default time-out.
template <class... Fields>
Reply Ask(Diag_FTM& phone, Tries tries, const EfsRequest<Fields...>& row,
          std::type_identity_t<Field<Fields>>... fields) {
  Compose(phone, row, fields...);
  return IsWithinLimit(phone) ? AskComposed(phone, tries) : ReplyKind::kNotSent;
}
template <class... Fields>
Reply Ask(Diag_FTM& phone, const EfsRequest<Fields...>& row, std::type_identity_t<Field<Fields>>... fields) {
  return Ask(phone, Tries::kOne, row, fields...);
}

}  // namespace kral::efs

#endif
