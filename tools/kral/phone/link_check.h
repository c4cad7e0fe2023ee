// How well a line to a handset does: loopbacks for a while, how long they took, and what did not come back.
#ifndef KRAL_TOOLS_LINK_CHECK_H
#define KRAL_TOOLS_LINK_CHECK_H

#include <cstdint>

#include "tools/kral/json.h"
#include "tools/kral/session.h"

namespace kral::tool {

struct LinkFigures {
  std::uint64_t count = 0;
  std::uint64_t lost = 0;     // without an answer in time
  std::uint64_t garbled = 0;  // frames with a wrong check sum, and answers that repeat something else
  std::uint32_t half_us = 0;  // half of the round trips are as fast
  std::uint32_t most_us = 0;  // 99 of 100 are

  Json ToJson() const;
};

LinkFigures CheckLink(Session& session, double seconds);

}  // namespace kral::tool

#endif
