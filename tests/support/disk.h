// A disk that fills up, and one that is slow.
#ifndef KRAL_TESTS_SUPPORT_DISK_H
#define KRAL_TESTS_SUPPORT_DISK_H

#include <algorithm>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <span>
#include <vector>

#include "transport/collection/batch_writer.h"

namespace kral::test {

// Takes bytes until it is full, and holds the writer up while it is told to.
class Disk {
 public:
  explicit Disk(size_t capacity = SIZE_MAX) : capacity_(capacity) {}

  std::function<CaptureSink()> Opener() {
    return [this] {
      ++opened_;
      return CaptureSink([this](std::span<const uint8_t> bytes) { return Write(bytes); });
    };
  }
  size_t Write(std::span<const uint8_t> bytes) {
    std::unique_lock lock(mutex_);
    ++writes_;
    held_.wait(lock, [this] { return !hold_; });
    const size_t taken = std::min(bytes.size(), capacity_ - content_.size());
    content_.insert(content_.end(), bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(taken));
    return taken;
  }
  void Hold(bool hold) {
    const std::lock_guard lock(mutex_);
    hold_ = hold;
    held_.notify_all();
  }
  int opened() const { return opened_; }
  int writes() {
    const std::lock_guard lock(mutex_);
    return writes_;
  }
  std::vector<uint8_t> content() {
    const std::lock_guard lock(mutex_);
    return content_;
  }

 private:
  const size_t capacity_;
  std::mutex mutex_;
  std::condition_variable held_;
  bool hold_ = false;
  int opened_ = 0;
  int writes_ = 0;
  std::vector<uint8_t> content_;
};

}  // namespace kral::test

#endif
