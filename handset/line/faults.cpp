// Decides what goes wrong with which reply, and makes the spoilt bytes. When they leave is the output line's affair.
#include "handset/line/faults.h"

#include <algorithm>

#include "handset/line/frame_codec.h"

namespace kral::handset {

using Kind = Fault::Kind;

When When::Chance(double probability) {
  When when = Always();
  when.probability_ = probability;
  return when;
}

When When::Of(std::string_view prefix_hex) const {
  When when = *this;
  when.prefix_ = FromHex(prefix_hex);
  return when;
}

When When::LongerThan(size_t bytes) const {
  When when = *this;
  when.longer_than_ = bytes;
  return when;
}

bool When::Counts(ByteView packet) const {
  if (longer_than_ != 0 && packet.size() <= longer_than_) return false;
  return packet.size() >= prefix_.size() && std::equal(prefix_.begin(), prefix_.end(), packet.begin());
}

Fault Split(uint32_t piece, uint32_t gap_ms) {
  return {Kind::kSplit, piece, gap_ms};
}
Fault Merge() {
  return {Kind::kMerge};
}
Fault Delay(uint32_t milliseconds) {
  return {Kind::kDelay, milliseconds};
}
Fault AfterNextRequest() {
  return {Kind::kAfterNextRequest};
}
Fault Lose() {
  return {Kind::kLose};
}
Fault Duplicate() {
  return {Kind::kDuplicate};
}
Fault Repeat() {
  return {Kind::kRepeat};
}
Fault Corrupt() {
  return {Kind::kCorrupt};
}
Fault WrongCode(uint8_t code) {
  return {Kind::kWrongCode, code};
}
Fault LeadingNoise(uint32_t count) {
  return {Kind::kLeadingNoise, count};
}
Fault Refuse(Refusal refusal) {
  return Refuse(static_cast<uint8_t>(refusal));
}
Fault Refuse(uint8_t code) {
  return {Kind::kRefuse, code};
}
Fault Lag(uint32_t milliseconds) {
  return {Kind::kLag, milliseconds};
}
Fault Ignore() {
  return {Kind::kIgnore};
}
Fault HangUp() {
  return {Kind::kHangUp};
}

const Fault* Strike::Find(Kind kind) const {
  const auto found = std::ranges::find_if(faults, [kind](const Fault& f) { return f.kind == kind; });
  return found == faults.end() ? nullptr : &*found;
}

void FaultPlan::Add(Fault fault, When when) {
  const std::lock_guard lock(mutex_);
  rules_.push_back({fault, std::move(when)});
}

void FaultPlan::SetBitErrorRate(double per_bit) {
  const std::lock_guard lock(mutex_);
  bit_error_rate_ = per_bit;
}

void FaultPlan::SetSeed(uint64_t seed) {
  const std::lock_guard lock(mutex_);
  random_.seed(seed);
}

void FaultPlan::Clear() {
  const std::lock_guard lock(mutex_);
  rules_.clear();
  bit_error_rate_ = 0;
}

uint64_t FaultPlan::struck() const {
  const std::lock_guard lock(mutex_);
  return struck_;
}

Strike FaultPlan::Select(ByteView packet) {
  Strike strike;
  const std::lock_guard lock(mutex_);
  for (Rule& rule : rules_) {
    const When& when = rule.when;
    if (!when.Counts(packet)) continue;
    const uint64_t number = ++rule.seen;
    const bool hit =
        when.step_ == 0 ? number == when.first_ : number >= when.first_ && (number - when.first_) % when.step_ == 0;
    if (!hit || (when.probability_ < 1 && Draw() >= when.probability_)) continue;
    strike.faults.push_back(rule.fault);
    ++struck_;
  }
  return strike;
}

std::vector<Outgoing> FaultPlan::Deliver(const Strike& strike, ByteView packet, bool framed, uint32_t delay_ms) {
  if (strike.Has(Kind::kLose)) return {};
  Bytes payload(packet.begin(), packet.end());
  if (const Fault* wrong = strike.Find(Kind::kWrongCode); wrong != nullptr && !payload.empty()) {
    payload[0] = static_cast<uint8_t>(wrong->value);
  }

  const bool corrupt = strike.Has(Kind::kCorrupt);
  Outgoing outgoing;
  if (framed) {
    outgoing.bytes = corrupt ? EncodeCorruptFrame(payload) : EncodeFrame(payload);
  } else {
    outgoing.bytes = std::move(payload);
    if (corrupt && !outgoing.bytes.empty()) outgoing.bytes.back() ^= 0xFF;
  }
  if (const Fault* noise = strike.Find(Kind::kLeadingNoise)) {
    const std::lock_guard lock(mutex_);
    Bytes noisy = Noise(noise->value);
    outgoing.bytes.insert(outgoing.bytes.begin(), noisy.begin(), noisy.end());
  }
  AddBitErrors(outgoing.bytes);

  outgoing.delay_ms = delay_ms;
  if (const Fault* late = strike.Find(Kind::kDelay)) outgoing.delay_ms += late->value;
  for (const Fault& fault : strike.faults) {
    if (fault.kind == Kind::kLag) outgoing.lag_ms += fault.value;
  }
  if (const Fault* split = strike.Find(Kind::kSplit)) {
    outgoing.piece = split->value;
    outgoing.gap_ms = split->gap_ms;
  }
  if (strike.Has(Kind::kAfterNextRequest)) {
    outgoing.hold = Outgoing::Hold::kUntilNextRequest;
  } else if (strike.Has(Kind::kMerge)) {
    outgoing.hold = Outgoing::Hold::kUntilNextReply;
  }
  std::vector<Outgoing> copies(strike.Has(Kind::kDuplicate) ? 2 : 1, outgoing);
  if (strike.Has(Kind::kRepeat)) {
    outgoing.hold = Outgoing::Hold::kUntilNextRequest;
    copies.push_back(std::move(outgoing));
  }
  return copies;
}

void FaultPlan::AddBitErrors(Bytes& wire) {
  const std::lock_guard lock(mutex_);
  if (bit_error_rate_ <= 0) return;
  for (uint8_t& byte : wire) {
    for (int bit = 0; bit < 8; ++bit) {
      if (Draw() < bit_error_rate_) byte = static_cast<uint8_t>(byte ^ 1 << bit);
    }
  }
}

double FaultPlan::Draw() {
  // The top 53 bits; the standard distributions differ from library to library.
  return static_cast<double>(random_() >> 11) * 0x1p-53;
}

Bytes FaultPlan::Noise(uint32_t count) {
  // Begins like no packet that is taken unchecked, and holds no flag or escape but the closing flag, so that the reply
  // behind it is whole.
  Bytes noise;
  for (uint32_t i = 0; i < count; ++i) noise.push_back(static_cast<uint8_t>(0x80 | (random_() & 0x0F)));
  noise.push_back(kFlag);
  return noise;
}

}  // namespace kral::handset
