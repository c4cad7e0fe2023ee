// Factory test mode of the handset: one dispatcher per radio technology, with transceivers whose readings follow what
// was set.
//
// Payloads, little-endian, behind the command id, for what a calibration loop needs (docs/handset.md):
//
//   7 set mode       RF mode (u16)                 8 set channel     channel (u16)
//   2, 3 transmitter on, off                       176 set TX power  hundredths of a dBm (s16)
//   53 RX AGC        -> gain word (s16), 1/10 dB   230 RSSI          -> dBm (s8)
//   179 RX level     -> hundredths of a dBm (s16)  119 HDET          -> detector word (u16)
//
// Every other command is acknowledged and remembered. Commands outside factory test mode are refused.
#ifndef KRAL_HANDSET_SERVICES_FTM_SERVICE_H
#define KRAL_HANDSET_SERVICES_FTM_SERVICE_H

#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <vector>

#include "handset/line/bytes.h"
#include "handset/line/request_table.h"
#include "handset/services/operating_mode.h"

namespace kral::handset {

// One transceiver behind a dispatcher.
struct Radio {
  uint16_t rf_mode = 0;
  uint16_t channel = 0;
  bool transmitting = false;
  int16_t tx_power = -5000;     // what was asked for, hundredths of a dBm
  int16_t input_level = -9000;  // what the antenna port sees, hundredths of a dBm

  int16_t AgcWord() const;  // falls as the input rises, with a slope over the channels
  int8_t Rssi() const;
  uint16_t DetectorWord() const;  // rises with the power sent; noise while the transmitter is off
};

struct FtmCommand {
  uint16_t mode_id;  // 0 under the legacy command code, which does not carry one
  uint16_t command;
  Bytes payload;
};

class FtmService final : public Service {
 public:
  // Serves while the handset is in factory test mode.
  explicit FtmService(const OperatingMode& mode) : mode_(mode) {}

  void Register(RequestTable& table) override;
  void OnReset() override;

  // Gives the commands of a mode id to something else than a transceiver: it returns what stands in the reply behind
  // the command id, or nothing to refuse it. To be called before the handset is connected.
  using Dispatcher = std::function<std::optional<Bytes>(uint16_t command, ByteView payload)>;
  void SetDispatcher(uint16_t mode_id, Dispatcher dispatcher) { dispatchers_[mode_id] = std::move(dispatcher); }

  void SetInputLevel(uint16_t mode_id, int16_t hundredths_of_dbm);
  std::vector<FtmCommand> commands() const;  // all that were carried out, oldest first; the last 4,096 of them

 private:
  void OnRequest(ByteView request, Wire& wire);
  void OnLegacyRequest(ByteView request, Wire& wire);
  // What stands in the reply behind the command id; nothing for what is refused.
  std::optional<Bytes> Carry(uint16_t mode_id, uint16_t command, ByteView payload);

  bool InFtm() const { return mode_.state() == ModeState::kFactoryTest; }

  const OperatingMode& mode_;
  mutable std::mutex mutex_;
  std::map<uint16_t, Dispatcher> dispatchers_;
  std::map<uint16_t, Radio> radios_;
  std::vector<FtmCommand> commands_;
};

}  // namespace kral::handset

#endif
