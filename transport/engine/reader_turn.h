// Whose turn it is to read the port: the connection's receive thread, or the thread that awaits a reply. In a
// conversation of requests and replies the receive thread stands aside after each reply, and whoever awaits the next
// one reads it without a change of threads. Traffic that nobody asked for ends that for a while.
#ifndef KRAL_TRANSPORT_ENGINE_READER_TURN_H
#define KRAL_TRANSPORT_ENGINE_READER_TURN_H

#include <atomic>
#include <cstdint>

#include "base/mutex.h"
#include "platform/clock.h"

namespace kral {

class ReaderTurn {
 public:
  // Some systems give a mutex its memory when it is first locked: that is here, where a lack of it is a failed connect,
  // and not on the receive thread.
  explicit ReaderTurn(Clock& clock) : clock_(clock) { Reset(); }

  // --- Who awaits a reply -------------------------------------------------------------------------------------------
  // True: it reads until GiveBack. False: the receive thread does, and will not stand aside until a reply has come.
  bool Take();
  void GiveBack();
  bool is_aside();  // the receive thread does not read

  // --- Who reads ----------------------------------------------------------------------------------------------------
  void NoteReply();  // before anybody sees it
  void NoteOther();  // traffic that nobody awaits, or that has gone to another thread
  bool is_quiet() const { return !busy_; }

  // --- The receive thread -------------------------------------------------------------------------------------------
  void Reset();  // it has begun
  // After each turn of its own: true when it is to stand aside.
  bool StandAside();
  // Waits while another thread reads. True when it is its turn again: at once, or where nobody has read since the last
  // call.
  bool Resume(bool at_once);

 private:
  enum class Reader : uint8_t { kThread, kNobody, kWaiter };

  Clock& clock_;
  std::atomic<bool> busy_{false};
  uint32_t busy_since_ = 0;  // of who reads
  Mutex mutex_;
  Condition given_back_;
  Reader reader_ KRAL_GUARDED_BY(mutex_) = Reader::kThread;
  bool waits_ KRAL_GUARDED_BY(mutex_) = false;     // somebody awaits what the receive thread is to read
  bool answered_ KRAL_GUARDED_BY(mutex_) = false;  // and has been given a reply in this turn
  bool used_ KRAL_GUARDED_BY(mutex_) = false;      // somebody has read while the receive thread stood aside
};

}  // namespace kral

#endif
