// The body of a connection's receive thread: reads the port and feeds the splitter until it is told to stop.
#ifndef KRAL_TRANSPORT_ENGINE_RECEIVE_LOOP_H
#define KRAL_TRANSPORT_ENGINE_RECEIVE_LOOP_H

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <thread>
#include <utility>
#include <vector>

#include "base/mutex.h"
#include "kral/connection.h"
#include "platform/clock.h"
#include "transport/engine/reader_turn.h"

namespace kral {

class CProtAHDLC;
class CSerialPort;
class ChunkSplitter;
class DataLogFileHandler;
class ThreadControl;

enum class ReceiveMode : uint8_t {
  kAsWritten = KRAL_RECEIVE_MODE_POLL,   // the sleep rule of the receive loop
  kWakeOnData = KRAL_RECEIVE_MODE_WAKE,  // waits in the port and sleeps nowhere
};

// The settings and the counter may be used on any thread.
class ReceiveLoop {
 public:
  ReceiveLoop(Clock& clock, DataLogFileHandler& log, CProtAHDLC& framer, CSerialPort& port, ThreadControl& control,
              ChunkSplitter& splitter)
      : clock_(clock), log_(log), framer_(framer), port_(port), control_(control), splitter_(splitter) {}

  // Before Run. Called on the receive thread when it has found the device gone and closed the port.
  void SetGoneHandler(std::function<void()> handler) { on_gone_ = std::move(handler); }
  void SetMode(ReceiveMode mode) { mode_ = mode; }
  void SetReadTimeOut(uint32_t milliseconds) { read_time_out_ms_ = milliseconds; }
  // How long a caller's receive function waits for bytes by itself; 0: it does not.
  void SetCallersWait(uint32_t milliseconds) { callers_wait_ms_ = milliseconds; }
  // The caller's transport has bytes. From the first time on it is relied upon to say so.
  void NotifyReceived();
  void ForgetCaller();  // another one brings the bytes: what the former one said of itself no longer holds
  bool caller_notifies() const { return caller_notifies_; }
  void SetSleepDivisor(uint32_t divisor) { sleep_divisor_ = divisor == 0 ? 1 : divisor; }

  void Run();

  // Reads on the calling thread, which awaits a reply, until `done` holds or for at most that long, unless the receive
  // thread reads, or is to take over. Not on a caller's transport, nor in receive mode 0.
  void ReadHere(std::chrono::milliseconds time_out, const std::function<bool()>& done);
  // The same for what has come already.
  void ReadWaiting();
  // The receive thread goes on at once should it have stood aside.
  void TakeBack();
  ReaderTurn& turn() { return turn_; }
  bool on_thread() const { return std::this_thread::get_id() == thread_.load(); }

  // Waits until the chunk that is being made packets of is through; false when that takes longer.
  bool WaitForChunk(uint32_t time_out_ms);

  uint64_t bytes_received() const { return bytes_received_.load(std::memory_order_relaxed); }

 private:
  void SleepByRule();
  bool IsPaused();
  bool WaitForBytes(uint32_t changes_seen);
  void ReadFromCaller(uint32_t changes_seen);
  void StandAside(uint32_t changes_seen);
  bool TakeTurn();
  bool ReadChunk();
  void Split(uint32_t count);
  void SetSplitting(bool splitting);

  Clock& clock_;
  DataLogFileHandler& log_;
  CProtAHDLC& framer_;
  CSerialPort& port_;
  ThreadControl& control_;
  ChunkSplitter& splitter_;
  std::function<void()> on_gone_;
  std::atomic<ReceiveMode> mode_{ReceiveMode::kAsWritten};
  std::atomic<uint32_t> read_time_out_ms_{500};
  std::atomic<uint32_t> sleep_divisor_{1};
  std::atomic<uint32_t> callers_wait_ms_{0};
  std::atomic<bool> caller_notifies_{false};
  std::atomic<std::thread::id> thread_{};
  std::atomic<uint64_t> bytes_received_{0};

  Mutex chunk_mutex_;
  Condition chunk_done_;
  bool splitting_ KRAL_GUARDED_BY(chunk_mutex_) = false;
  uint64_t chunks_ KRAL_GUARDED_BY(chunk_mutex_) = 0;

  ReaderTurn turn_{clock_};

  // Of who reads. Memory that is refused once it runs has nobody to be told to.
  static constexpr size_t kReadSize = 40960;
  std::vector<uint8_t> buffer_ = std::vector<uint8_t>(kReadSize);
  uint32_t sleep_counter_ = 0;
  uint32_t acknowledged_pause_ = 0;
};

}  // namespace kral

#endif
