// Opens and closes the connection of a phone object, and asks whether a handset answers on it.
#include <algorithm>
#include <array>

#include "frame/diag_ftm.h"
#include "frame/diag_ftm_parts.h"
#include "frame/orbt_server.h"
#include "frame/request_failure.h"
#include "platform/com_port_opener.h"
#include "platform/forced_unwind.h"

namespace kral {
namespace {

constexpr uint8_t kVersionRequest = 0;
constexpr uint8_t kLoopbackBytes = 10;

// The diagnostic service of an application processor: subsystem dispatch, subsystem, 16-bit command, two zeros.
constexpr std::array<uint8_t, 4> kDiagServicePing = {kSubsystemDispatch, 50, 3, 0};

// Whether the transport counts as alive without an answer.
constexpr uint32_t kStateAliveWithoutAnswer = 4;

}  // namespace

bool Diag_FTM::OpenPort(const OpenArguments& arguments) {
  ++connects_;
  user_ = arguments.user;
  GiveBackPort();
  state<ComPortOpener>().Forget();
  return Open(arguments) || Fail(PortFailure(*this));
}

// Without the handshake: its answers would be taken for those to the request that the port is opened for.
bool Diag_FTM::Reopen() {
  OpenArguments arguments;
  arguments.user = user_;
  return Open(arguments);
}

bool Diag_FTM::Open(const OpenArguments& arguments) {
  if (retired_ || port_borrowed_) return false;
  if (server_mode()) {
    OpenThroughServer();
  } else {
    OpenDirect(arguments);
  }
  return connected_;
}

void Diag_FTM::OpenThroughServer() {
  if (connected_) return;
  try {
    connected_ = server_->ConnectToPort(port_, TimeOut(kTimeOutServerConnect));
    if (connected_ && !listener_registered_) {
      server_->RegisterListener(sorter());
      listener_registered_ = true;
    }
  } catch (...) {
    PassForcedUnwind();
    log().WriteLine(kLogErr, "ORBT server exception caught while connecting in Diag_FTM::OpenPort().");
  }
}

void Diag_FTM::OpenDirect(const OpenArguments& arguments) {
  log().WriteLine(kLogFn, "VARN Internal: OpenPort()");
  if (port_ == kNullPort) null_port_ = true;
  if (arguments.user.send != nullptr) SetData2DiagSearch(false);
  // Nothing that comes in would ever reach a request.
  if (!dispatcher().EnsureThread(parts_)) {
    log().WriteLine(kLogErr, "Error. No thread for the dispatcher of port %d.", port());
    connected_ = false;
    Fail(Failure(KRAL_ERROR_INTERNAL, "there is no thread for the packets of port %d", port()));
    return;
  }
  transport().SetOpenFlags(arguments.handshake, arguments.second_flag);
  connected_ = transport().Open(port_, arguments.user, parts_);
}

bool Diag_FTM::IsPortOpen() {
  if (server_mode()) return !retired_;
  if (!transport().connected()) Reopen();
  connected_ = transport().connected();
  return connected_;
}

CSerialPort* Diag_FTM::BorrowPort() {
  if (server_mode() || retired_ || port_ == kNullPort) return nullptr;
  CSerialPort& port = transport().port();
  if (port_borrowed_ && port.IsOpen() != 0) return &port;
  connected_ = false;
  if (!transport().StopThread()) return nullptr;
  transport().SetOpenFlags(false, true);
  port.SetContent(PortContent::kBytes);
  const bool opened = user_.send != nullptr ? port.SetUserDefinedTransport(user_.context, user_.handle, user_.send,
                                                                           user_.receive, user_.flush) == 1
                                            : port.Open(port_) == 1;
  port_borrowed_ = opened;
  if (!opened) transport().TellContent();
  return opened ? &port : nullptr;
}

void Diag_FTM::GiveBackPort() {
  if (!port_borrowed_) return;
  port_borrowed_ = false;
  transport().port().Close();
  transport().TellContent();
}

bool Diag_FTM::ClosePort() {
  GiveBackPort();
  if (server_mode()) {
    UnregisterFromServer();
  } else {
    transport().StopThread();
    transport().Close();
  }
  if (connected_) log().WriteLine(kLogFn, "VARN Internal: ClosePort()");
  log().Stop();
  connected_ = false;
  return true;
}

void Diag_FTM::UnregisterFromServer() {
  if (!listener_registered_) return;
  listener_registered_ = false;  // whatever the server says
  try {
    server_->UnregisterListener(sorter());
  } catch (const OrbtServerException&) {
    log().WriteLine(kLogErr, "ORBT server exception caught while removing an event listener in Diag_FTM::ClosePort().");
  } catch (...) {
    PassForcedUnwind();
    log().WriteLine(kLogErr, "Unknown exception caught while removing an event listener in Diag_FTM::ClosePort().");
  }
}

void Diag_FTM::Retire() {
  const std::lock_guard lock(request_lock_);
  if (retired_) return;
  retired_ = true;
  ClosePort();
  EndCollection();
}

bool Diag_FTM::IsPhoneConnected() {
  if (!connected_) Reopen();
  if (null_port_) return true;
  if (!IsPortOpen()) {
    clock_.SleepMs(1);
    return Fail(PortFailure(*this));
  }
  switch (target_type()) {
    case kTargetApplication:
      return IsDiagServiceAlive();
    case kTargetModem:
      return IsLoopbackAnswered() && IsVersionAnswered();
    default:
      return false;
  }
}

bool Diag_FTM::IsDiagServiceAlive() {
  CDiagPacket& ping = packet();
  ping.Reset();
  ping.AppendBlock(kDiagServicePing);
  ping.Append32(0);
  ping.Append32(0);
  log().WriteLine(kLogIo, "Diag_FTM::IsDiagServiceAlive() -- pinging phone with version command, 0x%X 0x%X 0x3 0x0",
                  kDiagServicePing[0], kDiagServicePing[1]);
  if (!Send(ping, TimeOut(kTimeOutLiveness))) return false;
  const auto reply = ping.response();
  if (reply.size() > kDiagServicePing.size() &&
      std::equal(kDiagServicePing.begin(), kDiagServicePing.end(), reply.begin())) {
    return true;
  }
  return Fail(BadReply(*this, "is not a diagnostic service's"));
}

bool Diag_FTM::IsLoopbackAnswered() {
  CDiagPacket& loopback = packet();
  loopback.Reset();
  loopback.Append8(kLoopback);
  for (uint8_t value = 0; value < kLoopbackBytes; ++value) loopback.Append8(value);
  log().WriteLine(kLogRet, "KRAL_IsPhoneConnected() -- pinging phone with loopback command, 0x%X", kLoopback);
  if (!Send(loopback, TimeOut(kTimeOutLiveness))) {
    return !server_mode() && transport().QueryState(kStateAliveWithoutAnswer) == 1 && transport().connected();
  }
  if (loopback.response_length() != loopback.request_length())
    return Fail(BadReply(*this, "does not repeat the loopback"));
  // Each comparison overwrites the one before: only the last, of the reply's third byte, decides. Kept, because
  // handsets that garble the rest of the loopback are in use.
  bool matches = false;
  for (uint8_t expected = kLoopbackBytes - 1; expected > 0; --expected) {
    uint8_t value = 0;
    matches = loopback.Read8(value) && value == expected;
  }
  return matches || Fail(BadReply(*this, "does not repeat the loopback"));
}

bool Diag_FTM::IsVersionAnswered() {
  CDiagPacket& version = packet();
  version.Reset();
  version.Append8(kVersionRequest);
  log().WriteLine(kLogRet, "KRAL_IsPhoneConnected() -- pinging phone with version command, 0x%X", kVersionRequest);
  if (!Send(version, TimeOut(kTimeOutLiveness))) return false;
  return version.response_length() > 1 || Fail(BadReply(*this, "has no content"));
}

}  // namespace kral
