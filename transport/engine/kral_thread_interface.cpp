// The life of a connection: port and receive thread, opened, paused, resumed and stopped; and the way of the thread's
// packets to the dispatcher. Requests are in kral_thread_requests.cpp, the thread's own work in receive_loop.cpp.
#include "transport/engine/kral_thread_interface.h"

#include <new>
#include <utility>

#include "base/text_log.h"
#include "base/wire_codes.h"
#include "platform/forced_unwind.h"
#include "transport/engine/kral_events.h"

namespace kral {
namespace {

constexpr uint32_t kAcknowledgeMs = 1000;

// What was read from a device before it went is on its way to the queues for microseconds, unless a callback holds it.
constexpr uint32_t kLastPacketsMs = 20;

bool IsSame(const UserTransport& a, const UserTransport& b) {
  return a.handle == b.handle && a.context == b.context && a.send == b.send && a.receive == b.receive &&
         a.flush == b.flush;
}

bool IsAnswer(std::span<const uint8_t> packet) {
  return packet.empty() || !IsAsynchronousCode(packet.front());
}

}  // namespace

CKralThreadInterface::CKralThreadInterface(DataLogFileHandler& log, Clock& clock, DeviceOpener opener)
    : log_(log), clock_(clock), port_(clock, std::move(opener)), framer_(clock) {
  framer_.SetPort(&port_);
  framer_.SetLogger(&log);
  feed_.loop = &loop_;
  loop_.SetGoneHandler([this] {
    log_.WriteLine(kLogErr, "Error. The device has gone: its port is closed");
    EndWaits();
  });
}

CKralThreadInterface::~CKralThreadInterface() {
  StopThread();
}

void CKralThreadInterface::Attach(CKralEvents* dispatcher, PacketQueue* responses, PortWatcher* watcher) {
  feed_.dispatcher = dispatcher;
  responses_ = responses;
  watcher_ = watcher;
}

void CKralThreadInterface::DispatcherFeed::OnPacket(std::span<const uint8_t> packet) {
  // The dispatcher begins on the first ones while a long chunk is still being split.
  constexpr size_t kManyPackets = 64;
  const bool is_answer = IsAnswer(packet);
  try {
    gathered_.emplace_back(packet.begin(), packet.end());
  } catch (const std::bad_alloc&) {
    Lose(packet);
  }
  if (is_answer) {
    loop->turn().NoteReply();
  } else {
    loop->turn().NoteOther();
  }
  if (is_answer || gathered_.size() >= kManyPackets) OnBatchEnd();
}

void CKralThreadInterface::DispatcherFeed::OnBatchEnd() {
  if (gathered_.empty()) return;
  // Counted first: whoever has been given a packet finds it counted.
  packets.fetch_add(gathered_.size(), std::memory_order_relaxed);
  if (dispatcher != nullptr && !dispatcher->DispatchHere(gathered_)) {
    loop->turn().NoteOther();
    try {
      dispatcher->PushAll(gathered_, loop->on_thread());
    } catch (const std::bad_alloc&) {
      packets.fetch_sub(gathered_.size(), std::memory_order_relaxed);
      for (const Packet& packet : gathered_) Lose(packet);
    }
  }
  gathered_.clear();
}

void CKralThreadInterface::DispatcherFeed::Lose(std::span<const uint8_t> packet) {
  packets.fetch_add(1, std::memory_order_relaxed);
  (IsAnswer(packet) ? lost_answers : lost_others).fetch_add(1, std::memory_order_relaxed);
}

bool CKralThreadInterface::Open(uint32_t port_number, const UserTransport& user, std::shared_ptr<void> owner) {
  log_.WriteLine(kLogFn, "Port open request, first close port");
  Close();
  log_.WriteLine(kLogFn, "Port open request, proceed with open");
  const char* failure = "Port open failed";
  try {
    connected_ = OpenPort(port_number, user) && RunThread(std::move(owner));
  } catch (...) {
    PassForcedUnwind();
    failure = "Port open failed with exception";
    connected_ = false;
  }
  if (connected_) return true;
  log_.WriteLine(kLogErr, "%s", failure);
  port_.Close();
  return false;
}

bool CKralThreadInterface::OpenPort(uint32_t port_number, const UserTransport& user) {
  null_port_ = port_number == kNullPort;
  user_defined_ = !null_port_ && user.send != nullptr;
  if (user_defined_) return BindUserTransport(user);
  // The closing has paused the thread already, unless it was reading a caller's transport.
  if (!QuietThread()) return false;
  BeginTraffic();
  if (!null_port_) return port_.Open(static_cast<int32_t>(port_number)) == 1;
  port_.Close();
  return true;
}

// A second connect with the same functions leaves the thread alone: it may sit in the caller's receive function.
bool CKralThreadInterface::BindUserTransport(const UserTransport& user) {
  if (port_.IsOpen() != 0 && port_.user_defined() && IsSame(bound_, user)) {
    DropPartial();
    return true;
  }
  if (!QuietThread()) return false;
  BeginTraffic();
  if (!IsSame(bound_, user)) loop_.ForgetCaller();
  bound_ = user;
  return port_.SetUserDefinedTransport(user.context, user.handle, user.send, user.receive, user.flush) == 1;
}

bool CKralThreadInterface::QuietThread() {
  return !worker_.running() || paused_ || PauseThread();
}

bool CKralThreadInterface::RunThread(std::shared_ptr<void> owner) {
  if (worker_.running()) {
    if (control_.stop_requested()) return false;  // the former thread, which has not seen its stop yet
    ResumeThread();
    return true;
  }
  control_.Reset();
  paused_ = false;
  return worker_.Start([this] { loop_.Run(); }, std::move(owner));
}

bool CKralThreadInterface::Close() {
  log_.WriteLine(kLogFn, "Port close request.  Connected = %d, User Defined Transport = %d", connected_ ? 1 : 0,
                 user_defined_ ? 1 : 0);
  if (!connected_ || user_defined_) {
    log_.WriteLine(kLogFn,
                   "Port close was not issued because connected flag not set or user defined transport is being "
                   "used");
    return true;
  }
  connected_ = false;
  PauseThread();
  if (!null_port_) port_.Close();
  if (port_.gone()) EndWaits();  // a write may have noticed it first
  return true;
}

// Whoever waits for a device that is gone waits in vain, but for what came before.
void CKralThreadInterface::EndWaits() {
  if (responses_ == nullptr || waits_ended_.exchange(true)) return;
  if (feed_.dispatcher != nullptr) feed_.dispatcher->WaitUntilDispatched(kLastPacketsMs);
  responses_->Close();
  watcher_->OnPortGone();
}

void CKralThreadInterface::BeginTraffic() {
  DropPartial();  // its rest will not come through another opening
  waits_ended_ = false;
  if (responses_ == nullptr) return;
  responses_->Reopen();
  watcher_->OnPortOpened();
}

bool CKralThreadInterface::PauseThread() {
  if (paused_) {
    log_.WriteLine(kLogFn, "CKralThreadInterface::PauseThread - thread is already paused");
    return true;
  }
  if (!worker_.running()) return true;  // nothing reads
  control_.RequestPause();
  port_.Wake();
  if (!control_.AwaitPause(kAcknowledgeMs)) {
    log_.WriteLine(kLogErr, "CKralThreadInterface::PauseThread - Thread Pause event ack failed due to timeout=%d ms",
                   static_cast<int>(kAcknowledgeMs));
    return false;
  }
  log_.WriteLine(kLogFn, "CKralThreadInterface::PauseThread - Thread Pause event ack succeeded");
  paused_ = true;
  return true;
}

void CKralThreadInterface::ResumeThread() {
  paused_ = false;
  control_.ClearPause();
}

bool CKralThreadInterface::StopThread() {
  const bool was_running = worker_.running();
  if (was_running || connected_) Close();
  connected_ = false;
  if (was_running) {
    control_.RequestStop();
    port_.Wake();
    log_.WriteLine(kLogFn, "CKralThreadInterface::StopThread - waiting for thread stop event");
    if (!control_.AwaitStop(kAcknowledgeMs)) {
      log_.WriteLine(kLogErr, "CKralThreadInterface::StopThread - thread stop event was not received");
      return false;
    }
    log_.WriteLine(kLogFn, "CKralThreadInterface::StopThread - thread stop event was received");
  }
  worker_.Join();
  paused_ = false;
  port_.Close();  // lets go of a caller's functions, which Close leaves bound
  return true;
}

void CKralThreadInterface::SetOpenFlags(bool send_loopback, bool keep_buffers) {
  port_.SetSendLoopbackAtOpen(send_loopback);
  port_.SetKeepBuffersAtOpen(keep_buffers);
}

void CKralThreadInterface::SetThreadReadTimeOut(uint32_t milliseconds) {
  loop_.SetReadTimeOut(milliseconds);
}

void CKralThreadInterface::SetSleepDivisor(uint32_t divisor) {
  loop_.SetSleepDivisor(divisor);
}

void CKralThreadInterface::SetCallersWait(uint32_t milliseconds) {
  loop_.SetCallersWait(milliseconds);
  WakeReceiver();
}

bool CKralThreadInterface::NotifyReceived() {
  if (!user_defined_) return false;
  loop_.NotifyReceived();
  return true;
}

void CKralThreadInterface::SetReceiveMode(ReceiveMode mode) {
  loop_.SetMode(mode);
  WakeReceiver();
}

void CKralThreadInterface::WakeWaiter() {
  if (responses_ != nullptr) responses_->EndWaits();
  port_.Wake();
}

// Wherever the thread waits, it looks at its settings again.
void CKralThreadInterface::WakeReceiver() {
  control_.Notify();
  port_.Wake();
}

void CKralThreadInterface::DropPartial() {
  splitter_.DropPartialPacket();
  port_.GiveUpPartial();
}

void CKralThreadInterface::TellContent() {
  port_.SetContent(packet_mode() == PacketMode::kFramed ? PortContent::kFrames : PortContent::kBytes);
}

TrafficCounters CKralThreadInterface::counters() const {
  TrafficCounters counters;
  counters.bytes_received = loop_.bytes_received();
  counters.packets_received = feed_.packets.load(std::memory_order_relaxed);
  counters.dropped_responses = feed_.lost_answers.load(std::memory_order_relaxed);
  counters.dropped_asynchronous = feed_.lost_others.load(std::memory_order_relaxed);
  counters.collected = counters.dropped_asynchronous;
  counters.bad_fcs = splitter_.deframer().bad_fcs();
  counters.oversized = splitter_.deframer().oversized();
  return counters;
}

}  // namespace kral
