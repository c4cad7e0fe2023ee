// Mode switches, with the time a handset takes for them.
#include "handset/services/operating_mode.h"

#include <array>

#include "handset/line/wire_modes.h"

namespace kral::handset {
namespace {

constexpr uint8_t kModeControl = 41;
constexpr uint8_t kDownload = 58;
constexpr uint8_t kPacketModeSwitch = 68;
constexpr uint8_t kModeQuerySubsystem = 15;
constexpr uint16_t kModeQuery = 0;

// By the value of ModeOrder; a reset is not among the states.
constexpr std::array<ModeState, 6> kOrderedStates = {ModeState::kOfflineAnalog, ModeState::kOfflineDigital,
                                                     ModeState::kOnline,        ModeState::kFactoryTest,
                                                     ModeState::kOnline,        ModeState::kLowPower};

ModeState BootState(const NvStore& nv) {
  const auto flag = nv.Value(kFtmBootItem);
  return flag && !flag->empty() && flag->front() != 0 ? ModeState::kFactoryTest : ModeState::kOnline;
}

}  // namespace

OperatingMode::OperatingMode(NvStore& nv, Clock& clock)
    : nv_(nv),
      clock_(clock),
      state_(BootState(nv)),
      next_state_(state_),
      loader_(std::make_shared<SilentMode>()),
      packet_mode_(std::make_shared<AtModem>()) {}

void OperatingMode::Register(RequestTable& table) {
  table.On(kModeControl, Length::Exactly(3), [this](ByteView request, Wire& wire) { Control(request, wire); });
  table.OnSubsystem(kModeQuerySubsystem, kModeQuery, Length::Between(4, 6), [this](ByteView request, Wire& wire) {
    wire.Send(ByteWriter().Raw(request.first(4)).U32(0).U32(static_cast<uint32_t>(state())).Take());
  });
  table.On(kDownload, Length::Exactly(1), [this](ByteView request, Wire& wire) {
    wire.Send(request);
    const std::lock_guard lock(mutex_);
    wire.Enter(loader_);
  });
  table.On(kPacketModeSwitch, Length::Exactly(1), [this](ByteView, Wire& wire) {
    const std::lock_guard lock(mutex_);
    wire.Send(ByteWriter().U8(kPacketModeSwitch).U8(packet_mode_ ? 1 : 0).Take());
    if (packet_mode_) wire.Enter(packet_mode_);
  });
}

void OperatingMode::OnReset() {
  SetState(BootState(nv_));
}

ModeState OperatingMode::state() const {
  const std::lock_guard lock(mutex_);
  return static_cast<int32_t>(clock_.TickMs() - next_state_due_) >= 0 ? next_state_ : state_;
}

void OperatingMode::SetState(ModeState state) {
  const std::lock_guard lock(mutex_);
  state_ = state;
  next_state_ = state;
  next_state_due_ = clock_.TickMs();
}

void OperatingMode::SetSwitchingDelay(uint32_t milliseconds) {
  const std::lock_guard lock(mutex_);
  switching_delay_ms_ = milliseconds;
}

void OperatingMode::SetResetTime(uint32_t milliseconds) {
  const std::lock_guard lock(mutex_);
  reset_time_ms_ = milliseconds;
}

void OperatingMode::SetLoader(std::shared_ptr<WireMode> loader) {
  const std::lock_guard lock(mutex_);
  loader_ = loader ? std::move(loader) : std::make_shared<SilentMode>();
}

void OperatingMode::SetPacketMode(std::shared_ptr<WireMode> mode) {
  const std::lock_guard lock(mutex_);
  packet_mode_ = std::move(mode);
}

void OperatingMode::Control(ByteView request, Wire& wire) {
  const uint16_t order = GetU16(request, 1);
  if (order >= kOrderedStates.size()) return Refuse(Refusal::kBadParameter, request, wire);
  wire.Send(request);
  if (order == static_cast<uint16_t>(ModeOrder::kReset)) {
    uint32_t reset_time_ms = 0;
    {
      const std::lock_guard lock(mutex_);
      reset_time_ms = reset_time_ms_;
    }
    return wire.Restart(reset_time_ms);  // comes back to OnReset
  }
  const ModeState now = state();
  const std::lock_guard lock(mutex_);
  state_ = now;
  next_state_ = kOrderedStates[order];
  next_state_due_ = clock_.TickMs() + switching_delay_ms_;
}

}  // namespace kral::handset
