// Splits received bytes into packets and checks them. What a packet means is the sorter's.
#include "transport/hdlc_deframer.h"

#include <algorithm>

#include "frame/base/hex_dump.h"
#include "frame/base/text_log.h"
#include "transport/fcs16.h"
#include "transport/hdlc_frame.h"

namespace kral {
namespace {

// First bytes of packets that the handset sends unasked, and what becomes of them: required as they are.
constexpr std::array<uint8_t, 4> kUncheckedCodes = {16, 31, 96, 121};  // log, 31, event, extended message
constexpr uint8_t kIgnoredCode = 146;

bool IsUnchecked(uint8_t code) {
  return std::find(kUncheckedCodes.begin(), kUncheckedCodes.end(), code) != kUncheckedCodes.end();
}

void Increment(std::atomic<uint64_t>& counter) {
  counter.fetch_add(1, std::memory_order_relaxed);
}

void LogPacket(DataLogFileHandler* log, uint32_t flag, const char* format, std::span<const uint8_t> packet) {
  if (log == nullptr || !log->Wants(flag)) return;
  log->WriteLine(flag, format, static_cast<int>(packet.size()), HexDump(packet).c_str());
}

}  // namespace

void HdlcDeframer::Feed(std::span<const uint8_t> chunk) {
  for (const uint8_t byte : chunk) {
    if (byte == kFrameEscape) {
      escape_pending_ = true;
    } else if (byte == kFrameFlag) {
      // An escape pending here stays pending: it un-escapes the first byte of the next packet. Required.
      FinishPacket({packet_.data(), length_});
      length_ = 0;
    } else if (length_ == kMaximumLength) {
      escape_pending_ = false;
      DropOverrun();
    } else {
      packet_[length_++] = escape_pending_ ? byte ^ kEscapeBit : byte;
      escape_pending_ = false;
    }
  }
  EraseZeroTail();
}

void HdlcDeframer::DropPartial() {
  length_ = 0;
  escape_pending_ = false;
}

void HdlcDeframer::FinishPacket(std::span<const uint8_t> packet) {
  if (packet.empty() || packet[0] == kIgnoredCode) return;
  if (IsUnchecked(packet[0])) {
    sink_.OnPacket(packet);
  } else {
    DeliverChecked(packet);
  }
}

void HdlcDeframer::DeliverChecked(std::span<const uint8_t> packet) {
  if (packet.size() >= kMaximumLength) {
    Increment(oversized_);
    if (log_ != nullptr) {
      log_->WriteLine(kLogIo, "Maximum Packet Size reached, %d bytes, suspected invalid packet is skipped",
                      static_cast<int>(kMaximumLength));
    }
  } else if (ComputeFcs16(packet.data(), static_cast<uint16_t>(packet.size() * 8)) == FcsGoodValue) {
    sink_.OnPacket(packet);
    LogPacket(log_, kLogIo, "SYNC REC (%d bytes): %s", packet);
  } else {
    Increment(bad_fcs_);
    LogPacket(log_, kLogErr, "ERROR SYNC REC (%d bytes): %s", packet);
  }
}

void HdlcDeframer::DropOverrun() {
  Increment(oversized_);
  if (log_ != nullptr) {
    log_->WriteLine(kLogErr, "ERROR THREAD READ---NON-HDLC data (%d bytes), data is discarded",
                    static_cast<int>(kMaximumLength));
  }
  length_ = 0;
}

// A handset that starts up, or a line that idles low, sends zeros: an unfinished packet of nothing else is noise.
void HdlcDeframer::EraseZeroTail() {
  const auto is_zero = [](uint8_t byte) { return byte == 0; };
  if (length_ == 0 || !std::all_of(packet_.begin(), packet_.begin() + length_, is_zero)) return;
  if (log_ != nullptr) log_->WriteLine(kLogIo, "Packet is being erased because it is all zeros");
  length_ = 0;
}

}  // namespace kral
