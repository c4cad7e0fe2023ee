// The page on a run over several handsets: a line for each, and where the time went.
#ifndef KRAL_TOOLS_RUN_REPORT_H
#define KRAL_TOOLS_RUN_REPORT_H

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "tools/kral/board.h"

namespace kral::tool {

struct RunHead {
  std::string title;                             // "kral flash all"
  std::string ended;                             // when
  std::map<std::uint16_t, std::uint16_t> slots;  // of those ports that have one
};

std::string RunPage(const RunHead& head, const std::vector<const Verdict*>& verdicts);

// "2026-03-01 14:02:10 UTC"
std::string TimeNow();

}  // namespace kral::tool

#endif
