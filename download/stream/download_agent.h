// Which blocks of an image are still to be sent, on their way, or to be sent again. Two threads share it: the writer
// takes blocks, the response thread acknowledges them. Sending and parsing are theirs.
#ifndef KRAL_DOWNLOAD_STREAM_DOWNLOAD_AGENT_H
#define KRAL_DOWNLOAD_STREAM_DOWNLOAD_AGENT_H

#include <cstddef>
#include <cstdint>
#include <optional>

#include "base/mutex.h"
#include "base/waitable_timer.h"
#include "download/stream/download_block.h"

namespace kral::stream {

class DownloadAgent {
 public:
  // --- The writer -------------------------------------------------------------------------------------------------
  void Start(uint32_t window);  // empties everything
  void Enqueue(const CDownloadBlock& piece);
  void Stop();  // empties all queues
  // Nothing pending, outstanding or to be sent again. A block on its way from one queue to another is never missed.
  bool done() const;

  enum class Wait { kReady, kTimeOut, kFailed };
  // Until a block may be taken; gives up every `slice_ms` with kTimeOut, so that the caller can look around. The timer
  // tells whether the time is up.
  Wait AwaitTurn(uint32_t slice_ms);

  // The next block, now outstanding: one that is to be sent again, or else none.
  std::optional<CDownloadBlock> TakeResend();
  // What is left of the piece being carved; nothing when all is carved.
  std::optional<CDownloadBlock> head() const;
  // The next `size` bytes of the head, now outstanding.
  std::optional<CDownloadBlock> Carve(uint32_t size);
  // The outstanding block that was queued last.
  std::optional<CDownloadBlock> Newest() const;

  // --- The response thread ----------------------------------------------------------------------------------------
  struct Acknowledged {
    uint32_t size = 0;
    bool final = false;
  };
  // Nothing, and nothing changed, for an address that is not outstanding, and after a failure.
  std::optional<Acknowledged> Acknowledge(uint32_t address);
  // What came instead of an acknowledgement.
  struct OtherReply {
    size_t size = 0;
    uint8_t code = 0;
  };
  // The error event; nothing for a line from which no reply will come.
  void Fail(const std::optional<OtherReply>& reply);
  std::optional<OtherReply> other_reply() const;  // of the last one; for the writer

  // --- Both -------------------------------------------------------------------------------------------------------
  void CountSent();
  uint32_t blocks_sent() const;
  uint32_t bytes_acknowledged() const;
  uint32_t blocks_acknowledged() const;

 private:
  bool HasTurn() const KRAL_REQUIRES(mutex_);
  CDownloadBlock MakeOutstanding(const CDownloadBlock& block) KRAL_REQUIRES(mutex_);

  mutable Mutex mutex_;
  Condition changed_;
  CDownloadBlockFreeQueue free_ KRAL_GUARDED_BY(mutex_);
  CDownloadBlockQueue pending_ KRAL_GUARDED_BY(mutex_);
  CDownloadBlockQueue resend_ KRAL_GUARDED_BY(mutex_);
  CSemaphoreQueue outstanding_ KRAL_GUARDED_BY(mutex_);
  CFinalBlock final_block_ KRAL_GUARDED_BY(mutex_);
  bool acknowledgement_arrived_ KRAL_GUARDED_BY(mutex_) = false;  // reset by the wait that it ends
  bool failed_ KRAL_GUARDED_BY(mutex_) = false;
  std::optional<OtherReply> other_reply_ KRAL_GUARDED_BY(mutex_);
  uint32_t blocks_sent_ KRAL_GUARDED_BY(mutex_) = 0;
  uint32_t blocks_acknowledged_ KRAL_GUARDED_BY(mutex_) = 0;
  uint32_t bytes_acknowledged_ KRAL_GUARDED_BY(mutex_) = 0;
};

}  // namespace kral::stream

#endif
