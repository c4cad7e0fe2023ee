// Builds the phone object and keeps its settings and time-outs. Opening and the liveness check are in
// diag_ftm_connection.cpp, requests in diag_ftm_requests.cpp.
#include "frame/diag_ftm.h"

#include <sstream>
#include <string>
#include <utility>

#include "base/failure.h"
#include "frame/diag_ftm_parts.h"
#include "frame/orbt_server.h"
#include "platform/file_util.h"

namespace kral {
namespace {

// Every default goes through ConfigureTimeOut, in this order.
constexpr std::array<uint32_t, 18> kDefaultOrder = {0, 1, 2, 3, 4, 5, 6, 9, 10, 16, 17, 18, 19, 11, 12, 13, 14, 15};
constexpr std::array<uint32_t, 2> kDirectModeOrder = {kTimeOutPortWrite, kTimeOutThreadRead};

constexpr std::array kLogCategories = {"ZEFT log parsing", "cdma2000 RDA log parsing", "NV Manager debug",
                                       "NV Tool debug", "VENTRIMS SW Download"};

// Optional settings of a station, in the current directory.
constexpr const char* kStationFile = "WLANEVKConfig.txt";
constexpr size_t kStationLineLength = 80;
constexpr size_t kLargestStationFile = 1 << 20;

bool IsTransportTimeOut(uint32_t id) {
  return id == kTimeOutPortWrite || id == kTimeOutThreadRead;
}

}  // namespace

Diag_FTM::Diag_FTM(uint16_t port, Clock& clock, DeviceOpener opener)
    : clock_(clock), port_(port), parts_(std::make_shared<Parts>(clock)) {
  parts_->transport.emplace(parts_->log, clock, std::move(opener));
  parts_->transport->port().SetTap(&parts_->trace);
  // The dispatcher's thread shares the parts: only a stop ends it, and so it must be, should the rest of this fail.
  dispatching_.reset(&parts_->dispatcher);
  // Without a thread for it no port is opened (OpenDirect), and the next opening tries again.
  parts_->dispatcher.RegisterListener(&parts_->sorter, nullptr, parts_);
  parts_->transport->Attach(&parts_->dispatcher, &parts_->responses, &parts_->sorter);
  ApplyDefaults();
}

Diag_FTM::Diag_FTM(std::shared_ptr<OrbtServer> server, uint16_t port, Clock& clock)
    : clock_(clock), server_(std::move(server)), port_(port), parts_(std::make_shared<Parts>(clock)) {
  // The server calls the sorter on its own threads: no receive thread, and nothing to dispatch.
  ApplyDefaults();
}

Diag_FTM::~Diag_FTM() {
  Retire();
  EndCollection();  // another thread may have started a capture since
}

void Diag_FTM::StopDispatching::operator()(CKralEvents* dispatcher) const {
  dispatcher->Stop();
}

void Diag_FTM::ApplyDefaults() {
  for (const char* name : kLogCategories) log().RegisterCategory(name, false);
  for (const uint32_t id : kDefaultOrder) ConfigureTimeOut(id, static_cast<int32_t>(kDefaultTimeOuts[id]));
  if (!server_mode()) {
    for (const uint32_t id : kDirectModeOrder) ConfigureTimeOut(id, static_cast<int32_t>(kDefaultTimeOuts[id]));
  }
  ReadStationFile();
}

void Diag_FTM::ReadStationFile() {
  std::vector<uint8_t> bytes;
  if (ReadWholeFile(kStationFile, kLargestStationFile, bytes)) return;
  std::istringstream file(std::string(bytes.begin(), bytes.end()));
  for (std::string line; std::getline(file, line);) {
    line.resize(std::min(line.size(), kStationLineLength));
    std::istringstream fields(line);
    std::string word;
    int32_t value = 0;
    if (fields >> word >> value && word == "ConnectDelay") {
      ConfigureTimeOut(kTimeOutLiveness, value);
      ConfigureTimeOut(kTimeOutServerConnect, value);
    }
  }
}

bool Diag_FTM::ConfigureTimeOut(uint32_t id, int32_t milliseconds) {
  log().WriteLine(kLogFn, "KRAL_ConfigureTimeOut( eTimeOutId = %d, iNewValue_ms = %d)", static_cast<int>(id),
                  milliseconds);
  if (id >= kTimeOutCount) {
    log().WriteLine(kLogRet, "KRAL_ConfigureTimeOut() -- Error, invalid ID.");
    return false;
  }
  const auto value = static_cast<uint32_t>(milliseconds);
  time_outs_[id] = value;
  if (!IsTransportTimeOut(id)) return true;
  if (server_mode()) {
    // Refused, and yet stored: GetTimeOut gives the new value.
    log().WriteLine(kLogFn, "KRAL_ConfigureTimeOut() - error, this timeout cannot be set in ORBT mode");
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "time-out %u cannot be set through a phone server", id));
  }
  if (id == kTimeOutPortWrite) {
    transport().port().SetWriteTimeout(value);
  } else {
    transport().SetThreadReadTimeOut(value);
  }
  return true;
}

int32_t Diag_FTM::GetTimeOut(uint32_t id) {
  log().WriteLine(kLogFn, "KRAL_GetTimeOut( eTimeOutId = %d )", static_cast<int>(id));
  if (id >= kTimeOutCount) {
    log().WriteLine(kLogRet, "KRAL_GetTimeOut() -- Error, invalid ID.");
    return 0;
  }
  const auto value = static_cast<int32_t>(time_outs_[id].load());
  log().WriteLine(kLogRet, "KRAL_GetTimeOut( eTimeOutId = %d, iNewValue_ms = %d)", static_cast<int>(id), value);
  return value;
}

uint32_t Diag_FTM::TimeOut(uint32_t id) const {
  return id < kTimeOutCount ? time_outs_[id].load() : 0;
}

void Diag_FTM::SetTargetType(uint8_t type) {
  if (type <= kTargetApplication) target_type_ = type;
}

bool Diag_FTM::SetReceiveMode(ReceiveMode mode) {
  if (server_mode()) return false;
  transport().SetReceiveMode(mode);
  return true;
}

DataLogFileHandler& Diag_FTM::log() {
  return parts_->log;
}
std::shared_ptr<void> Diag_FTM::KeepParts() {
  return parts_;
}
CKralThreadInterface& Diag_FTM::transport() {
  return *parts_->transport;
}
bool Diag_FTM::device_gone() const {
  return parts_->transport && parts_->transport->port().gone();
}
CKralEventListener& Diag_FTM::sorter() {
  return parts_->sorter;
}
CKralEvents& Diag_FTM::dispatcher() {
  return parts_->dispatcher;
}
PacketQueue& Diag_FTM::responses() {
  return parts_->responses;
}
PacketQueue& Diag_FTM::asynchronous() {
  return parts_->asynchronous;
}
BoundedQueue<EventRecord>& Diag_FTM::events() {
  return parts_->events;
}

}  // namespace kral
