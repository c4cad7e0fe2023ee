// The command and response engine of one connection: framer, port, receive thread, and the send-and-wait operation.
#ifndef KRAL_TRANSPORT_ENGINE_KRAL_THREAD_INTERFACE_H
#define KRAL_TRANSPORT_ENGINE_KRAL_THREAD_INTERFACE_H

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "base/worker_thread.h"
#include "platform/clock.h"
#include "transport/engine/bounded_queue.h"
#include "transport/engine/port_watcher.h"
#include "transport/engine/receive_loop.h"
#include "transport/engine/reply.h"
#include "transport/engine/thread_control.h"
#include "transport/engine/traffic_counters.h"
#include "transport/line/chunk_splitter.h"
#include "transport/line/hdlc_framer.h"
#include "transport/line/serial_port.h"

namespace kral {

class CKralEvents;
class DataLogFileHandler;

inline constexpr uint32_t kNullPort = 65534;

// Opening, closing and the requests come from one thread at a time (the phone object's request lock); connected(),
// counters() and the receive settings from any.
class CKralThreadInterface {
 public:
  explicit CKralThreadInterface(DataLogFileHandler& log, Clock& clock = SystemClock(),
                                DeviceOpener opener = OpenComPort);
  ~CKralThreadInterface();
  CKralThreadInterface(const CKralThreadInterface&) = delete;
  CKralThreadInterface& operator=(const CKralThreadInterface&) = delete;

  // Before the first Open: where packets go, and the queue into which replies come of them. All are kept by the owner
  // that is given to Open.
  void Attach(CKralEvents* dispatcher, PacketQueue* responses, PortWatcher* watcher);

  // --- Connection (kral_thread_interface.cpp) -----------------------------------------------------------------------
  // Opens the port (or binds the caller's functions) and starts or resumes the receive thread. `owner` is what the
  // thread keeps alive: the object that holds this transport, its dispatcher, queues and log. Fails as well while a
  // thread that did not stop in time is still busy, in a caller's function or a callback.
  bool Open(uint32_t port_number, const UserTransport& user, std::shared_ptr<void> owner);
  // A caller's transport stays connected: only StopThread ends that.
  bool Close();
  // Waits at most 1,000 ms for the thread to end, after at most as much for the pause that goes with the closing.
  // False when it did not; it then ends by itself as soon as it can, and keeps its owner alive until then.
  bool StopThread();
  bool PauseThread();
  void ResumeThread();
  // A port whose device is gone counts as closed: the next request opens it again.
  bool connected() const { return connected_ && !port_.gone(); }
  bool null_port() const { return null_port_; }

  void SetOpenFlags(bool send_loopback, bool keep_buffers);
  void SetThreadReadTimeOut(uint32_t milliseconds);
  void SetReceiveMode(ReceiveMode mode);
  // Of a caller's transport: how long its receive function waits, and that it has bytes.
  void SetCallersWait(uint32_t milliseconds);
  bool NotifyReceived();                   // false on a port
  void SetSleepDivisor(uint32_t divisor);  // for: trading processor time for latency. Kept; nothing sets it

  // --- Requests (kral_thread_requests.cpp) --------------------------------------------------------------------------
  // `room` takes what is received, FCS bytes included where they fit; the reply's bytes are those in front of them. A
  // reply with another first byte ends the request and is given out all the same. One with the expected first byte that
  // fails `is_own` answers an earlier request: it is passed over, and the right one awaited for the rest of the
  // time-out. A time-out closes the port.
  Reply SendSync(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code, uint32_t time_out_ms,
                 uint32_t delay_ms, const ReplyTest& is_own = {});
  // Awaits another reply to the request that was sent last; a time-out leaves the port open.
  Reply AwaitNext(std::span<uint8_t> room, uint8_t expected_code, uint32_t time_out_ms, const ReplyTest& is_own = {});
  // What ends the wait for a reply once it is set and WakeWaiter was called; null: nothing. A
  // handset that is only slow may answer for a moment still. The port stays open. Returns the former one.
  const std::atomic<bool>* SetAbort(const std::atomic<bool>* abort) { return std::exchange(abort_, abort); }
  void WakeWaiter();  // for the abort that has just been set; from any thread
  bool aborted() const { return abort_ != nullptr && abort_->load(); }
  // Is given every reply that no request takes: one that comes between two requests, answers an earlier one, or has
  // another first byte; empty: nobody.
  void SetUnclaimed(std::function<void(std::span<const uint8_t>)> unclaimed) { unclaimed_ = std::move(unclaimed); }
  // Takes whatever comes first, FCS bytes included. A time-out leaves the port open.
  Reply SendRaw(std::span<const uint8_t> request, std::span<uint8_t> room, uint32_t time_out_ms);
  // Awaits no reply: expected means written.
  Reply SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag);

  // Empties the response queue of what was read before this call; every synchronous request begins with it.
  void ForgetReplies();

  // Where the handset must agree, what became of the request; one that was answered with anything but yes is kOther.
  Reply SetPacketMode(uint32_t mode);
  static constexpr std::array<uint8_t, 1> kUnframedModeRequest{68};
  static constexpr uint32_t kUnframedModeMs = 80;
  // Whether that change is the handset's as well as ours.
  bool NeedsPhoneFor(uint32_t mode) const;
  PacketMode packet_mode() const { return splitter_.mode(); }
  void TellContent();  // to the port's tap: what comes by the packet mode
  bool FlushRxBuffer();
  // The liveness check asks with code 4 whether the connection counts as alive without an answer: it does not, 0.
  uint32_t QueryState(uint32_t code) const;
  // For: a look, in a debugger or a test, at the last request that was not answered. Kept.
  std::span<const uint8_t> timed_out_request() const { return timed_out_request_; }

  // As far as they are known here: of the port and of its packets.
  TrafficCounters counters() const;

  CProtAHDLC& framer() { return framer_; }
  CSerialPort& port() { return port_; }

 private:
  // Takes the splitter's packets on the thread that reads. The asynchronous ones of a chunk are handed on together: for
  // each of a flood the dispatcher would be met at its lock and woken.
  class DispatcherFeed final : public PacketListener {
   public:
    void OnPacket(std::span<const uint8_t> packet) override;
    void OnBatchEnd() override;
    CKralEvents* dispatcher = nullptr;
    ReceiveLoop* loop = nullptr;
    std::atomic<uint64_t> packets{0};
    // That there was no memory for.
    std::atomic<uint64_t> lost_answers{0};
    std::atomic<uint64_t> lost_others{0};

   private:
    void Lose(std::span<const uint8_t> packet);
    std::vector<Packet> gathered_;
  };

  bool OpenPort(uint32_t port_number, const UserTransport& user);
  bool BindUserTransport(const UserTransport& user);
  bool QuietThread();
  bool RunThread(std::shared_ptr<void> owner);
  void WakeReceiver();
  void BeginTraffic();  // nothing reads
  void EndWaits();
  void DropPartial();

  bool Transmit(std::span<const uint8_t> request, uint32_t time_out_ms);
  bool IsMomentBehindAbortOver();
  std::optional<Packet> AwaitRecord(std::chrono::milliseconds time_out);
  std::optional<Packet> PopWithin(std::chrono::milliseconds time_out);
  Reply PollRecord(std::span<uint8_t> room, uint32_t time_out_ms);
  ReplyKind WhyNotWritten() const;
  ReplyKind WhyNoReply() const;
  void TimedOut(std::span<const uint8_t> request);
  Reply AskForUnframedMode();
  Reply ReturnToFramedMode();

  void LogWritten(uint32_t time_out_ms, uint32_t start);

  DataLogFileHandler& log_;
  Clock& clock_;
  PacketQueue* responses_ = nullptr;
  PortWatcher* watcher_ = nullptr;
  std::atomic<bool> connected_{false};
  std::atomic<bool> null_port_{false};
  std::atomic<bool> waits_ended_{false};      // since the port was opened
  const std::atomic<bool>* abort_ = nullptr;  // these three are of whoever holds the request lock
  std::optional<uint32_t> aborted_at_;        // as the request that was sent last has seen it
  std::function<void(std::span<const uint8_t>)> unclaimed_;
  uint64_t garbled_before_ = 0;  // the request that was sent last
  std::atomic<bool> user_defined_{false};
  bool paused_ = false;
  std::vector<uint8_t> timed_out_request_;

  CSerialPort port_;
  CProtAHDLC framer_;
  UserTransport bound_;  // what the port is bound to while it is a caller's
  DispatcherFeed feed_;
  ChunkSplitter splitter_{feed_, log_};
  ThreadControl control_;
  ReceiveLoop loop_{clock_, log_, framer_, port_, control_, splitter_};
  WorkerThread worker_;  // last: nothing above may be gone while it is parked
};

}  // namespace kral

#endif
