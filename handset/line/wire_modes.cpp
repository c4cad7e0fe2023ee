// The silent mode and the AT modem.
#include "handset/line/wire_modes.h"

#include "handset/line/frame_codec.h"

namespace kral::handset {
namespace {

void WriteText(std::string_view text, Wire& wire) {
  const Bytes bytes(text.begin(), text.end());
  if (!bytes.empty()) wire.Write(bytes);
}

}  // namespace

size_t SilentMode::OnBytes(ByteView bytes, Wire& wire) {
  if (until_tick_ && static_cast<int32_t>(wire.clock().TickMs() - *until_tick_) >= 0) {
    wire.Enter(nullptr);
    return 0;
  }
  return bytes.size();
}

void AtModem::Answer(std::string command, std::string reply) {
  const std::lock_guard lock(mutex_);
  answers_[std::move(command)] = std::move(reply);
}

size_t AtModem::OnBytes(ByteView bytes, Wire& wire) {
  for (size_t i = 0; i < bytes.size(); ++i) {
    const uint8_t byte = bytes[i];
    if (byte == '\r') {
      std::string line;
      line.swap(line_);
      if (OnLine(line, wire)) return i + 1;
    } else if (byte != kFlag && byte != '\n' && line_.size() < kLongestLine) {
      // Hosts send single flags to see whether the port is in diagnostic mode already.
      line_ += static_cast<char>(byte);
    }
  }
  return bytes.size();
}

bool AtModem::OnLine(const std::string& line, Wire& wire) {
  if (line.empty()) return false;
  const std::lock_guard lock(mutex_);
  if (const auto answer = answers_.find(line); answer != answers_.end()) {
    WriteText(answer->second, wire);
    return false;
  }
  const bool known = line.starts_with("AT");
  WriteText(known ? "\r\nOK\r\n" : "\r\nERROR\r\n", wire);
  if (line != "AT$XJDMG") return false;
  wire.Enter(nullptr);
  return true;
}

}  // namespace kral::handset
