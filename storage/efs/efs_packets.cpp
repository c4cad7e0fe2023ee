// Finds the largest packets that a handset takes, by the packets of transfers themselves.
#include "storage/efs/efs_packets.h"

#include <algorithm>
#include <array>

#include "base/diag_packet.h"
#include "frame/diag_ftm.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_format.h"

namespace kral::efs {
namespace {

constexpr size_t kSteps = 2;
constexpr uint16_t kMiddle = 2048;  // bytes of data
constexpr std::array<uint16_t, kSteps> kReadSizes = {kLongestReply, kMiddle + kReadOverhead};
constexpr std::array<uint16_t, kSteps> kWriteSizes = {CDiagPacket::kCapacity - 1, kMiddle + kWriteOverhead};

// A handset may take no notice of a packet that is too long for it; this is what each such size costs, once.
constexpr uint32_t kTrialMs = 500;
// In packets of the caller's size.
constexpr uint32_t kWorthATry = 8;

const std::array<uint16_t, kSteps>& SizesOf(Direction direction) {
  return direction == Direction::kFromHandset ? kReadSizes : kWriteSizes;
}

// Of somebody who has connected again, perhaps to another handset, nothing is known.
FoundPacketSize& FoundOf(Diag_FTM& phone, Direction direction) {
  Settings& settings = phone.state<Settings>();
  if (settings.found_on != phone.connects()) {
    settings.found_on = phone.connects();
    settings.found_read = {};
    settings.found_write = {};
  }
  return direction == Direction::kFromHandset ? settings.found_read : settings.found_write;
}

uint16_t CallersSize(Diag_FTM& phone, Direction direction) {
  const Settings& settings = phone.state<Settings>();
  return direction == Direction::kFromHandset ? settings.read_packet_size : settings.write_packet_size;
}

// The first size from `step` on that is larger than the caller's; kSteps: there is none.
uint8_t StepFrom(Direction direction, uint8_t step, uint16_t callers) {
  const auto& sizes = SizesOf(direction);
  while (step < kSteps && sizes[step] <= callers) ++step;
  return step;
}

}  // namespace

PacketSizes::PacketSizes(Diag_FTM& phone, Direction direction, uint32_t total)
    : found_(FoundOf(phone, direction)),
      direction_(direction),
      callers_(CallersSize(phone, direction)),
      step_(StepFrom(direction, found_.step, callers_)) {
  const bool worth_it = found_.passed || total / kWorthATry >= callers_;
  if (!phone.state<Settings>().automatic_packet_size || !worth_it) step_ = kSteps;
}

uint16_t PacketSizes::size() const {
  return is_callers() ? callers_ : SizesOf(direction_)[step_];
}

bool PacketSizes::is_callers() const {
  return step_ == kSteps;
}

bool PacketSizes::has_passed() const {
  return found_.passed && found_.step == step_;
}

int PacketSizes::tries() const {
  return is_callers() ? kTries : has_passed() ? 2 : 1;
}

uint32_t PacketSizes::TimeOut(uint32_t usual_ms) const {
  return is_callers() || has_passed() ? usual_ms : std::min(usual_ms, kTrialMs);
}

// A shorter one shows nothing of the others.
void PacketSizes::Passed(size_t bytes) {
  if (!is_callers() && bytes >= size()) found_ = {.step = step_, .passed = true};
}

// Remembered at once: a handset that restarts at a long packet shall not meet one with each transfer.
bool PacketSizes::FallBack() {
  if (is_callers()) return false;
  step_ = StepFrom(direction_, static_cast<uint8_t>(step_ + 1), callers_);
  found_ = {.step = step_};
  fell_ = true;
  return true;
}

}  // namespace kral::efs
