// The response thread of one image write.
#ifndef KRAL_DOWNLOAD_STREAM_IMAGE_WRITE_RSP_H
#define KRAL_DOWNLOAD_STREAM_IMAGE_WRITE_RSP_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <span>

#include "base/event.h"
#include "base/worker_thread.h"
#include "download/link/download_connection.h"
#include "download/stream/download_agent.h"
#include "download/stream/reply_receiver.h"

namespace kral::stream {

// Held by a shared pointer: a thread that does not end in time keeps it, the agent in it and the queues of the
// connection.
class CImageWriteRsp : public std::enable_shared_from_this<CImageWriteRsp>, protected WriteReplyParser {
 public:
  explicit CImageWriteRsp(download::DownloadConnection& connection);
  ~CImageWriteRsp() override = default;
  CImageWriteRsp(const CImageWriteRsp&) = delete;
  CImageWriteRsp& operator=(const CImageWriteRsp&) = delete;

  enum class Start { kStarted, kNoThread, kTimeOut };
  Start StartThread(uint32_t time_out_ms);
  bool StopThread();  // waits at most 1,000 ms

  bool AwaitFinished(uint32_t time_out_ms) { return finished_.WaitFor(time_out_ms); }
  DownloadAgent& agent() { return agent_; }

 protected:
  DownloadAgent agent_;
  DataLogFileHandler& log_;

 private:
  void Run();

  download::DownloadConnection& connection_;  // for the caller's thread; the thread of this object must not use it
  const std::shared_ptr<void> parts_;         // of the phone object: log and queue
  PacketQueue& responses_;
  AutoResetEvent stop_;
  AutoResetEvent finished_;
  AutoResetEvent thread_started_;
  AutoResetEvent thread_ended_;
  WorkerThread worker_;
};

class CImageWriteRspFramed : public CImageWriteRsp {
 public:
  using CImageWriteRsp::CImageWriteRsp;

 protected:
  WriteReply ParseReply(std::span<const uint8_t> payload) override;
};

}  // namespace kral::stream

#endif
