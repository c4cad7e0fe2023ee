// What happened to a request: decided by the engine, carried upwards unchanged.
#ifndef KRAL_TRANSPORT_ENGINE_REPLY_H
#define KRAL_TRANSPORT_ENGINE_REPLY_H

#include <cstdint>
#include <functional>
#include <span>

#include "base/wire_codes.h"

namespace kral {

enum class ReplyKind : uint8_t {
  kExpected,     // the reply to this request
  kOther,        // a reply with another first byte; 19, 20, 21 and 24 are refusals
  kNone,         // none in time: the handset may have carried the request out
  kGarbled,      // none in time, but frames with a wrong check sequence
  kGone,         // the device vanished before a reply came
  kAborted,      // the caller's abort ended the wait
  kWriteFailed,  // the port did not take the request
  kPortClosed,   // not sent: the port cannot be opened
  kGoneUnsent,   // not sent: the device had vanished before
  kNullPort,     // not sent: there is no handset behind the null port
  kNotSent,      // held back by the library itself
};

// Lies in the memory that was given for it, without FCS bytes.
class Reply {
 public:
  Reply(ReplyKind kind = ReplyKind::kNone) : kind_(kind) {}
  Reply(ReplyKind kind, uint8_t code, std::span<const uint8_t> bytes) : kind_(kind), code_(code), bytes_(bytes) {}

  explicit operator bool() const { return kind_ == ReplyKind::kExpected; }
  ReplyKind kind() const { return kind_; }
  // Whether a reply came at all, the expected one or another.
  bool came() const { return kind_ == ReplyKind::kExpected || kind_ == ReplyKind::kOther; }
  // Whether the handset cannot have seen the request. A write that failed may have delivered it.
  bool not_sent() const { return kind_ >= ReplyKind::kPortClosed; }
  // First byte of what came, also where the memory had no room for it.
  uint8_t code() const { return code_; }
  // 19, 20, 21 or 24 when the handset refused the request; else 0.
  uint8_t refusal() const { return kind_ == ReplyKind::kOther && IsRefusal(code_) ? code_ : uint8_t{0}; }
  // Of what came; empty when nothing did.
  std::span<const uint8_t> bytes() const { return bytes_; }

 private:
  ReplyKind kind_;
  uint8_t code_ = 0;
  std::span<const uint8_t> bytes_;
};

// Whether a reply with the expected first byte answers this request, and not an earlier one that was given up. Empty:
// nothing but the first byte tells.
using ReplyTest = std::function<bool(std::span<const uint8_t> reply)>;

}  // namespace kral

#endif
