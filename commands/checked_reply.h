// Replies whose content has to be looked at before they count as the expected ones.
#ifndef KRAL_COMMANDS_CHECKED_REPLY_H
#define KRAL_COMMANDS_CHECKED_REPLY_H

#include <algorithm>
#include <span>

#include "transport/engine/reply.h"

namespace kral {

// Whether a refusal is another request's. It repeats what it refuses, as far as it repeats anything; one that came
// twice stands in front of the reply to the next request.
inline bool RefusesAnother(const Reply& reply, std::span<const uint8_t> request) {
  if (reply.refusal() == 0 || reply.bytes().empty()) return false;
  const auto repeated = reply.bytes().subspan(1);
  const size_t size = std::min(repeated.size(), request.size());
  return !std::ranges::equal(repeated.first(size), request.first(size));
}

// `take` gives whether the reply holds what was asked for, and has noted what is wrong when it does not: the reply then
// is another one, whatever its first byte.
template <class Take>
Reply Checked(const Reply& reply, const Take& take) {
  return !reply || take() ? reply : Reply(ReplyKind::kOther, reply.code(), reply.bytes());
}

}  // namespace kral

#endif
