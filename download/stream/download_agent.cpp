// The queues of a streaming download, each move between them one step.
#include "download/stream/download_agent.h"

#include <chrono>

namespace kral::stream {

void DownloadAgent::Start(uint32_t window) {
  Stop();
  const MutexLock lock(mutex_);
  free_.Fill(window);
  outstanding_.SetWindow(window);
  final_block_.Clear();
  acknowledgement_arrived_ = false;
  failed_ = false;
  blocks_sent_ = blocks_acknowledged_ = bytes_acknowledged_ = 0;
}

void DownloadAgent::Enqueue(const CDownloadBlock& piece) {
  const MutexLock lock(mutex_);
  pending_.Push(piece);
}

void DownloadAgent::Stop() {
  const MutexLock lock(mutex_);
  free_.Clear();
  pending_.Clear();
  resend_.Clear();
  outstanding_.Clear();
}

bool DownloadAgent::done() const {
  const MutexLock lock(mutex_);
  return pending_.empty() && resend_.empty() && outstanding_.empty();
}

// While there is something to carve, a slot of the window decides; then only acknowledgements bring anything new.
bool DownloadAgent::HasTurn() const {
  if (!pending_.empty()) return outstanding_.slots() > 0;
  return acknowledgement_arrived_ || !resend_.empty();
}

DownloadAgent::Wait DownloadAgent::AwaitTurn(uint32_t slice_ms) {
  MutexLock lock(mutex_);
  changed_.WaitFor(lock, std::chrono::milliseconds(slice_ms),
                   [this]() KRAL_REQUIRES(mutex_) { return failed_ || HasTurn(); });
  if (failed_) return Wait::kFailed;
  if (!HasTurn()) return Wait::kTimeOut;
  acknowledgement_arrived_ = false;
  return Wait::kReady;
}

std::optional<CDownloadBlock> DownloadAgent::TakeResend() {
  const MutexLock lock(mutex_);
  if (resend_.empty() || !outstanding_.TakeSlot()) return std::nullopt;
  return MakeOutstanding(*resend_.Pop());
}

std::optional<CDownloadBlock> DownloadAgent::head() const {
  const MutexLock lock(mutex_);
  return pending_.oldest();
}

std::optional<CDownloadBlock> DownloadAgent::Carve(uint32_t size) {
  const MutexLock lock(mutex_);
  const auto head = pending_.oldest();
  if (!head || size == 0 || size > head->size || !outstanding_.TakeSlot()) return std::nullopt;
  if (!free_.Pop()) return std::nullopt;
  pending_.Shorten(size);
  if (pending_.empty()) final_block_.Record(head->address);
  return MakeOutstanding({head->address, size, head->device});
}

std::optional<CDownloadBlock> DownloadAgent::Newest() const {
  const MutexLock lock(mutex_);
  return outstanding_.newest();
}

CDownloadBlock DownloadAgent::MakeOutstanding(const CDownloadBlock& block) {
  outstanding_.Push(block);
  return block;
}

std::optional<DownloadAgent::Acknowledged> DownloadAgent::Acknowledge(uint32_t address) {
  const MutexLock lock(mutex_);
  // A reply that came twice, or for a block that is to be sent again, is nothing to go by; nor is one that comes after
  // the writing has failed: what is reported as acknowledged is so at the failure.
  if (failed_ || !outstanding_.Holds(address)) return std::nullopt;
  Acknowledged result;
  for (;;) {
    const CDownloadBlock block = *outstanding_.Pop();
    outstanding_.ReleaseSlot();
    if (block.address != address) {
      // Replies come in order, so this one's was lost.
      resend_.Push(block);
      continue;
    }
    result = {block.size, final_block_.Is(address)};
    free_.Push(block);
    break;
  }
  bytes_acknowledged_ += result.size;
  ++blocks_acknowledged_;
  acknowledgement_arrived_ = true;
  changed_.NotifyAll();
  return result;
}

void DownloadAgent::Fail(const std::optional<OtherReply>& reply) {
  const MutexLock lock(mutex_);
  failed_ = true;
  other_reply_ = reply;
  changed_.NotifyAll();
}

std::optional<DownloadAgent::OtherReply> DownloadAgent::other_reply() const {
  const MutexLock lock(mutex_);
  return other_reply_;
}

void DownloadAgent::CountSent() {
  const MutexLock lock(mutex_);
  ++blocks_sent_;
}

uint32_t DownloadAgent::blocks_sent() const {
  const MutexLock lock(mutex_);
  return blocks_sent_;
}

uint32_t DownloadAgent::bytes_acknowledged() const {
  const MutexLock lock(mutex_);
  return bytes_acknowledged_;
}

uint32_t DownloadAgent::blocks_acknowledged() const {
  const MutexLock lock(mutex_);
  return blocks_acknowledged_;
}

}  // namespace kral::stream
