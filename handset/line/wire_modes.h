// Wire modes that belong to no download protocol: a handset that is silent, and one that is still a modem.
#ifndef KRAL_HANDSET_LINE_WIRE_MODES_H
#define KRAL_HANDSET_LINE_WIRE_MODES_H

#include <map>
#include <mutex>
#include <optional>

#include "handset/line/wire.h"

namespace kral::handset {

// Hears nothing, for ever or until the clock shows a tick, when it returns to the diagnostic mode.
class SilentMode final : public WireMode {
 public:
  SilentMode() = default;
  explicit SilentMode(uint32_t until_tick) : until_tick_(until_tick) {}

  size_t OnBytes(ByteView bytes, Wire& wire) override;

 private:
  std::optional<uint32_t> until_tick_;
};

// An AT-command port. "AT$XJDMG" switches it into diagnostic mode; what begins with AT is answered OK, or as told, and
// everything else with ERROR.
class AtModem final : public WireMode {
 public:
  // The whole text sent for `command`, line ends included. An empty one is silence.
  void Answer(std::string command, std::string reply);

  size_t OnBytes(ByteView bytes, Wire& wire) override;

 private:
  static constexpr size_t kLongestLine = 1024;

  bool OnLine(const std::string& line, Wire& wire);  // true when it leaves

  std::mutex mutex_;
  std::map<std::string, std::string> answers_;
  std::string line_;
};

}  // namespace kral::handset

#endif
