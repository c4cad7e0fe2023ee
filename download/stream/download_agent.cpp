// The queues of a streaming download, each move between them one step.
#include "download/stream/download_agent.h"

#include <chrono>
#include <utility>

namespace kral::stream {

void DownloadAgent::Start(uint32_t window) {
  Stop();
  const std::lock_guard lock(mutex_);
  free_.Fill(window);
  outstanding_.SetWindow(window);
  final_block_.Clear();
  acknowledgement_arrived_ = false;
  failed_ = false;
  blocks_sent_ = blocks_acknowledged_ = bytes_acknowledged_ = 0;
}

void DownloadAgent::Enqueue(const CDownloadBlock& piece) {
  const std::lock_guard lock(mutex_);
  pending_.Push(std::make_unique<CDownloadBlock>(piece));
}

void DownloadAgent::Stop() {
  const std::lock_guard lock(mutex_);
  free_.Clear();
  pending_.Clear();
  resend_.Clear();
  outstanding_.Clear();
}

bool DownloadAgent::done() const {
  const std::lock_guard lock(mutex_);
  return pending_.empty() && resend_.empty() && outstanding_.empty();
}

// While there is something to carve, a slot of the window decides; then only acknowledgements bring anything new.
bool DownloadAgent::HasTurn() const {
  if (!pending_.empty()) return outstanding_.slots() > 0;
  return acknowledgement_arrived_ || !resend_.empty();
}

DownloadAgent::Wait DownloadAgent::AwaitTurn(uint32_t slice_ms) {
  std::unique_lock lock(mutex_);
  changed_.wait_for(lock, std::chrono::milliseconds(slice_ms), [this] { return failed_ || HasTurn(); });
  if (failed_) return Wait::kFailed;
  if (!HasTurn()) return Wait::kTimeOut;
  acknowledgement_arrived_ = false;
  return Wait::kReady;
}

std::optional<CDownloadBlock> DownloadAgent::TakeResend() {
  const std::lock_guard lock(mutex_);
  if (resend_.empty() || !outstanding_.TakeSlot()) return std::nullopt;
  return MakeOutstanding(resend_.Pop());
}

std::optional<CDownloadBlock> DownloadAgent::head() const {
  const std::lock_guard lock(mutex_);
  const CDownloadBlock* const head = pending_.oldest();
  return head == nullptr ? std::nullopt : std::optional(*head);
}

std::optional<CDownloadBlock> DownloadAgent::Carve(uint32_t size) {
  const std::lock_guard lock(mutex_);
  CDownloadBlock* const head = pending_.oldest();
  if (head == nullptr || size == 0 || size > head->size || !outstanding_.TakeSlot()) return std::nullopt;
  DownloadBlockPtr block = free_.Pop();
  if (block == nullptr) return std::nullopt;
  *block = {head->address, size, head->device};
  head->address += size;
  head->size -= size;
  if (head->size == 0) pending_.Pop();
  if (pending_.empty()) final_block_.Record(block->address);
  return MakeOutstanding(std::move(block));
}

std::optional<CDownloadBlock> DownloadAgent::Newest() const {
  const std::lock_guard lock(mutex_);
  const CDownloadBlock* const block = outstanding_.newest();
  return block == nullptr ? std::nullopt : std::optional(*block);
}

std::optional<CDownloadBlock> DownloadAgent::MakeOutstanding(DownloadBlockPtr block) {
  const CDownloadBlock copy = *block;
  outstanding_.Push(std::move(block));
  return copy;
}

std::optional<DownloadAgent::Acknowledged> DownloadAgent::Acknowledge(uint32_t address) {
  const std::lock_guard lock(mutex_);
  // A reply that came twice, or for a block that is to be sent again, is nothing to go by.
  if (!outstanding_.Holds(address)) return std::nullopt;
  Acknowledged result;
  for (;;) {
    DownloadBlockPtr block = outstanding_.Pop();
    outstanding_.ReleaseSlot();
    if (block->address != address) {
      // Replies come in order, so this one's was lost.
      resend_.Push(std::move(block));
      continue;
    }
    result = {block->size, final_block_.Is(address)};
    free_.Push(std::move(block));
    break;
  }
  bytes_acknowledged_ += result.size;
  ++blocks_acknowledged_;
  acknowledgement_arrived_ = true;
  changed_.notify_all();
  return result;
}

void DownloadAgent::Fail(const std::optional<OtherReply>& reply) {
  const std::lock_guard lock(mutex_);
  failed_ = true;
  other_reply_ = reply;
  changed_.notify_all();
}

std::optional<DownloadAgent::OtherReply> DownloadAgent::other_reply() const {
  const std::lock_guard lock(mutex_);
  return other_reply_;
}

void DownloadAgent::CountSent() {
  const std::lock_guard lock(mutex_);
  ++blocks_sent_;
}

uint32_t DownloadAgent::blocks_sent() const {
  const std::lock_guard lock(mutex_);
  return blocks_sent_;
}

uint32_t DownloadAgent::bytes_acknowledged() const {
  const std::lock_guard lock(mutex_);
  return bytes_acknowledged_;
}

uint32_t DownloadAgent::blocks_acknowledged() const {
  const std::lock_guard lock(mutex_);
  return blocks_acknowledged_;
}

}  // namespace kral::stream
