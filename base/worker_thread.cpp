// Starting, joining and parking of the library's threads. What a thread does, and how it is told to end, is its
// owner's affair.
#include "base/worker_thread.h"

#include <chrono>
#include <exception>
#include <utility>

#include "base/at_exit.h"
#include "base/mutex.h"
#include "base/thread_maker.h"
#include "platform/signals.h"

namespace kral {
namespace {

using Progress = WorkerThread::Progress;

constexpr std::chrono::milliseconds kLeaveTime{1000};

struct ParkingLot {
  Mutex mutex;
  std::shared_ptr<Progress> first KRAL_GUARDED_BY(mutex);
};

// Never destroyed: a parked thread must not be joined, nor its handle thrown away, while the process ends.
ParkingLot& Lot() {
  static ParkingLot* const lot = new ParkingLot;
  return *lot;
}

ThreadMaker& Maker() {
  static ThreadMaker& maker = *new ThreadMaker;
  return maker;
}

}  // namespace

void SetThreadMaker(ThreadMaker maker) {
  Maker() = std::move(maker);
}

size_t ReapParkedThreads() {
  std::shared_ptr<Progress> ended;
  size_t left = 0;
  {
    ParkingLot& lot = Lot();
    const MutexLock lock(lot.mutex);
    for (std::shared_ptr<Progress>* at = &lot.first; *at;) {
      if ((*at)->owner_released && HasEndedWithin((*at)->parked, {})) {
        std::shared_ptr<Progress> taken = std::exchange(*at, (*at)->next_parked);
        taken->next_parked = std::exchange(ended, taken);
      } else {
        at = &(*at)->next_parked;
        ++left;
      }
    }
  }
  for (; ended; ended = std::exchange(ended->next_parked, nullptr)) ended->parked.join();
  return left;
}

WorkerThread::~WorkerThread() {
  if (thread_.joinable()) Park();
}

void WorkerThread::Park() {
  ParkingLot& lot = Lot();
  const MutexLock lock(lot.mutex);
  progress_->parked = std::move(thread_);
  progress_->parked_module = std::move(module_);
  progress_->next_parked = std::exchange(lot.first, progress_);
}

bool WorkerThread::Start(std::function<void()> body, std::shared_ptr<void> owner) {
  ReapParkedThreads();
  if (running()) return false;
  Join();
  try {
    progress_ = std::make_shared<Progress>();
    module_ = ModuleReference::Take();
    auto run = [body = std::move(body), owner = std::move(owner), progress = progress_]() mutable {
      const AtExit ended([&] {
        progress->body_ended.store(true, std::memory_order_release);
        owner.reset();  // may destroy the WorkerThread itself
        progress->owner_released.store(true, std::memory_order_release);
      });
      body();
    };
    CallWithSignalsBlocked([&] { thread_ = Maker() ? Maker()(std::move(run)) : std::thread(std::move(run)); });
  } catch (const std::exception&) {
    module_ = {};
    return false;
  }
  return true;
}

void WorkerThread::Join() {
  if (!thread_.joinable() || thread_.get_id() == std::this_thread::get_id()) return;
  if (!HasEndedWithin(thread_, kLeaveTime)) return Park();
  thread_.join();
  module_ = {};
}

}  // namespace kral
