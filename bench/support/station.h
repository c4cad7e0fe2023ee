// A handset and a connection to it: over a pseudo terminal, or through functions of a caller.
#ifndef KRAL_BENCH_SUPPORT_STATION_H
#define KRAL_BENCH_SUPPORT_STATION_H

#include <algorithm>
#include <array>
#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "handset/caller_transport.h"
#include "handset/pty_cable.h"
#include "handset/virtual_handset.h"
#include "kral/connection.h"
#include "kral/transport.h"
#include "platform/environment.h"

namespace kral::bench {

enum class Cable { kPty, kPolled, kNotifying, kWaiting };

// Of one call, which says whether it succeeded; negative when it did not.
template <class Call>
double Microseconds(const Call& call) {
  const auto start = std::chrono::steady_clock::now();
  if (!call()) return -1;
  return std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - start).count();
}

class Station {
 public:
  Station(int port, Cable cable, uint8_t receive_mode) : port_(port), is_notifying_(cable == Cable::kNotifying) {
    phone_.KeepTrace(false);
    KRAL_SetDefaultReceiveMode(receive_mode);
    if (cable == Cable::kPty) {
      std::string error;
      cable_ = handset::PtyCable::Attach(phone_, "", error);
      if (!cable_) return;
      SetEnvironmentValue(Variable().c_str(), cable_->device_path());
      handle_ = KRAL_ConnectServer(static_cast<uint32_t>(port));
      return;
    }
    handle_ =
        KRAL_ConnectServer_UserDefinedTransport(static_cast<uint32_t>(port), 0, reinterpret_cast<uintptr_t>(this),
                                                &Send, cable == Cable::kWaiting ? &WaitAndReceive : &Receive, &Flush);
    if (is_notifying_) phone_.SetOutputListener([handle = handle_] { KRAL_NotifyReceived(handle); });
    if (cable == Cable::kWaiting) KRAL_SetReceiveWait(handle_, kWaitMs);
  }
  ~Station() {
    phone_.SetOutputListener({});
    KRAL_DisconnectServer(handle_);
    SetEnvironmentValue(Variable().c_str(), std::nullopt);
  }
  Station(const Station&) = delete;
  Station& operator=(const Station&) = delete;

  KRAL_HANDLE handle() const { return handle_; }
  handset::VirtualHandset& phone() { return phone_; }

  // One request and its reply, in microseconds; negative without one.
  double RoundTrip() const {
    const uint8_t request = 0;
    std::array<uint8_t, 256> response;
    uint16_t size = response.size();
    return Microseconds([&] { return KRAL_SendSync(handle_, 1, &request, &size, response.data(), 1000) != 0; });
  }

 private:
  static constexpr uint32_t kWaitMs = 100;

  std::string Variable() const { return "KRAL_COM" + std::to_string(port_); }

  static Station& Of(uintptr_t context) { return *reinterpret_cast<Station*>(context); }
  static uint32_t KRAL_CALL Send(uintptr_t context, uintptr_t, uint32_t count, const uint8_t* data, uint32_t* written) {
    *written = count;
    return Of(context).phone_.FromHost({data, count}) ? 0 : 1;
  }
  static uint32_t KRAL_CALL Receive(uintptr_t context, uintptr_t, uint32_t* count, uint8_t* buffer) {
    *count = static_cast<uint32_t>(Of(context).phone_.ToHost({buffer, *count}));
    return 0;
  }
  static uint32_t KRAL_CALL WaitAndReceive(uintptr_t context, uintptr_t, uint32_t* count, uint8_t* buffer) {
    auto& phone = Of(context).phone_;
    phone.WaitForOutput(kWaitMs);
    *count = static_cast<uint32_t>(phone.ToHost({buffer, *count}));
    return 0;
  }
  static uint32_t KRAL_CALL Flush(uintptr_t, uintptr_t) { return 0; }

  const int port_;
  const bool is_notifying_;
  handset::VirtualHandset phone_;
  std::unique_ptr<handset::PtyCable> cable_;
  KRAL_HANDLE handle_ = 0;
};

inline double Percentile(std::vector<double> values, double part) {
  if (values.empty()) return 0;
  std::ranges::sort(values);
  return values[static_cast<size_t>(part * static_cast<double>(values.size() - 1))];
}

}  // namespace kral::bench

#endif
