// Starting, joining and parking of the library's threads. What a thread does, and how it is told to end, is its
// owner's affair.
#include "transport/worker_thread.h"

#include <algorithm>
#include <iterator>
#include <mutex>
#include <system_error>
#include <utility>
#include <vector>

namespace kral {
namespace {

struct ParkedThread {
  std::thread thread;
  std::shared_ptr<const WorkerThread::Progress> progress;
};

struct ParkingLot {
  std::mutex mutex;
  std::vector<ParkedThread> threads;
};

// Never destroyed: a parked thread must not be joined, nor its handle thrown away, while the process ends.
ParkingLot& Lot() {
  static ParkingLot* const lot = new ParkingLot;
  return *lot;
}

}  // namespace

size_t ReapParkedThreads() {
  std::vector<ParkedThread> ended;
  size_t left = 0;
  {
    ParkingLot& lot = Lot();
    const std::lock_guard lock(lot.mutex);
    const auto first_ended = std::partition(lot.threads.begin(), lot.threads.end(), [](const ParkedThread& parked) {
      return !parked.progress->owner_released;
    });
    std::move(first_ended, lot.threads.end(), std::back_inserter(ended));
    lot.threads.erase(first_ended, lot.threads.end());
    left = lot.threads.size();
  }
  for (ParkedThread& parked : ended) parked.thread.join();
  return left;
}

WorkerThread::~WorkerThread() {
  if (!thread_.joinable()) return;
  ParkingLot& lot = Lot();
  const std::lock_guard lock(lot.mutex);
  lot.threads.push_back({std::move(thread_), progress_});
}

bool WorkerThread::Start(std::function<void()> body, std::shared_ptr<void> owner) {
  ReapParkedThreads();
  if (running()) return false;
  Join();
  progress_ = std::make_shared<Progress>();
  try {
    thread_ = std::thread([body = std::move(body), owner = std::move(owner), progress = progress_]() mutable {
      body();
      progress->body_ended.store(true, std::memory_order_release);
      owner.reset();  // may destroy the WorkerThread itself
      progress->owner_released.store(true, std::memory_order_release);
    });
  } catch (const std::system_error&) {
    return false;
  }
  return true;
}

void WorkerThread::Join() {
  if (thread_.joinable() && thread_.get_id() != std::this_thread::get_id()) thread_.join();
}

}  // namespace kral
