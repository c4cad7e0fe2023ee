// Replies whose content has to be looked at before they count as the expected ones.
#ifndef KRAL_COMMANDS_CHECKED_REPLY_H
#define KRAL_COMMANDS_CHECKED_REPLY_H

#include "transport/engine/reply.h"

namespace kral {

// `take` gives whether the reply holds what was asked for, and has noted what is wrong when it does not: the reply then
// is another one, whatever its first byte.
template <class Take>
Reply Checked(const Reply& reply, const Take& take) {
  return !reply || take() ? reply : Reply(ReplyKind::kOther, reply.code(), reply.bytes());
}

}  // namespace kral

#endif
