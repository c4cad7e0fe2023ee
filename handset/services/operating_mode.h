// The handset's operating mode, and the ways out of diagnostic mode.
#ifndef KRAL_HANDSET_SERVICES_OPERATING_MODE_H
#define KRAL_HANDSET_SERVICES_OPERATING_MODE_H

#include <memory>
#include <mutex>

#include "handset/line/request_table.h"
#include "handset/services/nv_store.h"
#include "platform/clock.h"

namespace kral::handset {

// What mode control (41) takes.
enum class ModeOrder : uint16_t {
  kOfflineAnalog = 0,
  kOfflineDigital = 1,
  kReset = 2,
  kFactoryTest = 3,
  kOnline = 4,
  kLowPower = 5,
};

// What the mode query (75, 15, 0) answers.
enum class ModeState : uint32_t {
  kFactoryTest = 1,
  kOfflineAnalog = 2,
  kOfflineDigital = 3,
  kOffline = 4,
  kOnline = 5,
  kLowPower = 6,
};

// Mode control (41), mode query (75, 15, 0), entry of the download loader (58), packet-mode switch (68).
class OperatingMode final : public Service {
 public:
  // Boots into factory test mode when NV item 453 says so, else online.
  OperatingMode(NvStore& nv, Clock& clock);

  void Register(RequestTable& table) override;
  void OnReset() override;

  ModeState state() const;
  void SetState(ModeState state);
  void SetSwitchingDelay(uint32_t milliseconds);  // from the reply until the new mode is reported
  void SetResetTime(uint32_t milliseconds);       // silence after a reset
  // What has the line after the download request; silence when there is none.
  void SetLoader(std::shared_ptr<WireMode> loader);
  // What has the line after the packet-mode switch; null refuses the switch.
  void SetPacketMode(std::shared_ptr<WireMode> mode);

 private:
  void Control(ByteView request, Wire& wire);

  NvStore& nv_;
  Clock& clock_;
  mutable std::mutex mutex_;
  ModeState state_;
  ModeState next_state_;
  uint32_t next_state_due_ = 0;
  uint32_t switching_delay_ms_ = 0;
  uint32_t reset_time_ms_ = 0;
  std::shared_ptr<WireMode> loader_;
  std::shared_ptr<WireMode> packet_mode_;
};

}  // namespace kral::handset

#endif
