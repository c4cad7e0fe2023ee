// Turns of reading. Who awaits replies, and how the receive thread is told of anything else, is the engine's affair.
#include "transport/engine/reader_turn.h"

namespace kral {
namespace {

// How long traffic keeps the receive thread at its work: while more of it comes, reading must not wait for requests.
constexpr uint32_t kBusyMs = 100;

}  // namespace

bool ReaderTurn::Take() {
  const MutexLock lock(mutex_);
  if (reader_ == Reader::kNobody) {
    reader_ = Reader::kWaiter;
    return true;
  }
  waits_ = true;
  return false;
}

void ReaderTurn::GiveBack() {
  const MutexLock lock(mutex_);
  reader_ = Reader::kNobody;
  used_ = true;
  given_back_.NotifyAll();
}

bool ReaderTurn::is_aside() {
  const MutexLock lock(mutex_);
  return reader_ != Reader::kThread;
}

void ReaderTurn::NoteReply() {
  const MutexLock lock(mutex_);
  answered_ = answered_ || waits_;
  waits_ = false;
}

void ReaderTurn::NoteOther() {
  busy_since_ = clock_.TickMs();
  busy_ = true;
}

void ReaderTurn::Reset() {
  const MutexLock lock(mutex_);
  reader_ = Reader::kThread;
  waits_ = answered_ = used_ = busy_ = false;
}

bool ReaderTurn::StandAside() {
  const MutexLock lock(mutex_);
  const bool answered = answered_ && !waits_;
  answered_ = false;
  if (busy_ && clock_.TickMs() - busy_since_ >= kBusyMs) busy_ = false;
  if (!answered || busy_) return false;
  reader_ = Reader::kNobody;
  used_ = false;
  return true;
}

bool ReaderTurn::Resume(bool at_once) {
  MutexLock lock(mutex_);
  given_back_.Wait(lock, [this]() KRAL_REQUIRES(mutex_) { return reader_ != Reader::kWaiter; });
  const bool in_use = used_ && !busy_;
  used_ = false;
  if (in_use && !at_once) return false;
  reader_ = Reader::kThread;
  return true;
}

}  // namespace kral
