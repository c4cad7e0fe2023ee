// One piece of the work of a streaming download, and the queues it travels through.
#ifndef KRAL_DOWNLOAD_STREAM_DOWNLOAD_BLOCK_H
#define KRAL_DOWNLOAD_STREAM_DOWNLOAD_BLOCK_H

#include <cstdint>
#include <deque>
#include <optional>

namespace kral::stream {

struct CDownloadBlock {
  uint32_t address = 0;
  uint32_t size = 0;
  uint32_t device = 0;  // the region of the image
};

// First in, first out. A block is in one queue at a time and moves between them in one step, so the queues of an agent
// share its critical section.
class CDownloadBlockQueue {
 public:
  bool empty() const { return blocks_.empty(); }
  void Push(const CDownloadBlock& block) { blocks_.push_back(block); }
  std::optional<CDownloadBlock> Pop() {  // nothing when empty
    const auto block = oldest();
    if (block) blocks_.pop_front();
    return block;
  }
  std::optional<CDownloadBlock> oldest() const {
    return blocks_.empty() ? std::nullopt : std::optional(blocks_.front());
  }
  std::optional<CDownloadBlock> newest() const {
    return blocks_.empty() ? std::nullopt : std::optional(blocks_.back());
  }
  // So much less of the oldest, which goes when nothing is left of it.
  void Shorten(uint32_t size) {
    CDownloadBlock& block = blocks_.front();
    block.address += size;
    block.size -= size;
    if (block.size == 0) blocks_.pop_front();
  }
  bool Holds(uint32_t address) const {
    for (const CDownloadBlock& block : blocks_) {
      if (block.address == address) return true;
    }
    return false;
  }
  void Clear() { blocks_.clear(); }

 private:
  std::deque<CDownloadBlock> blocks_;
};

// Blocks allocated ahead, one per slot of the window.
class CDownloadBlockFreeQueue : public CDownloadBlockQueue {
 public:
  void Fill(uint32_t window) {
    Clear();
    for (uint32_t i = 0; i < window; ++i) Push({});
  }
};

// The outstanding writes, with a slot of the window for each.
class CSemaphoreQueue : public CDownloadBlockQueue {
 public:
  void SetWindow(uint32_t window) { slots_ = window_ = window; }
  uint32_t slots() const { return slots_; }
  bool TakeSlot() {
    if (slots_ == 0) return false;
    --slots_;
    return true;
  }
  // Never beyond the window.
  void ReleaseSlot() {
    if (slots_ < window_) ++slots_;
  }

 private:
  uint32_t window_ = 0;
  uint32_t slots_ = 0;
};

// Whether the last block of the image has been carved, and its address.
class CFinalBlock {
 public:
  void Clear() { sent_ = false; }
  void Record(uint32_t address) {
    sent_ = true;
    address_ = address;
  }
  bool Is(uint32_t address) const { return sent_ && address_ == address; }

 private:
  bool sent_ = false;
  uint32_t address_ = 0;
};

}  // namespace kral::stream

#endif
