// One EFS2 request and its reply: the limits before sending, the tries, and what makes a reply this request's own.
#ifndef KRAL_STORAGE_EFS_REQUEST_H
#define KRAL_STORAGE_EFS_REQUEST_H

#include <functional>
#include <initializer_list>
#include <optional>
#include <string>

#include "frame/base/little_endian.h"
#include "storage/efs_format.h"

namespace kral::efs {

// The characters and the terminating zero; null is an empty path.
Path PathField(const char* path);

// The terminated text at an offset of a reply; nothing when it has no end within what was received.
std::optional<std::string> TextAt(std::span<const u8> reply, size_t offset);

// All of these act on the request in the phone's default packet buffer, where the reply is found afterwards.

// False (logged) when a request with a path is longer than the handset takes.
bool IsWithinLimit(Diag_FTM& phone);
// Sends once. A reply that repeats another header is an earlier request's, come late, and counts as none.
bool Exchange(Diag_FTM& phone, u32 time_out_ms);
// Sends until a reply is accepted. Each try opens a port that an earlier one's time-out has closed.
bool ExchangeUntil(Diag_FTM& phone, u32 time_out_ms, const std::function<bool(std::span<const u8> reply)>& accepts);

// Reads double words from the end of the reply backwards; false when it does not hold that many behind its header.
bool ReadFromEnd(Diag_FTM& phone, std::initializer_list<u32*> fields);

// The code by which the handset refused the last try (19, 20, 21, 24); 0 when it did not.
u8 LastRefusal(Diag_FTM& phone);
inline constexpr u8 kBadCommand = 19;

inline u32 DefaultTimeOut(const Diag_FTM& phone) {
  return phone.TimeOut(kTimeOutDefaultCommand);
}
inline u32 PacketTimeOut(Diag_FTM& phone) {
  return phone.efs().packet_time_out_ms;
}

// A request with a path, sent once with the default time-out.
template <class... Fields>
bool Ask(Diag_FTM& phone, const EfsRequest<Fields...>& row, std::type_identity_t<Field<Fields>>... fields) {
  Compose(phone, row, fields...);
  return IsWithinLimit(phone) && Exchange(phone, DefaultTimeOut(phone));
}

}  // namespace kral::efs

#endif
