// The steps of writing one image, and what each of them says when it fails.
#include "download/stream/write_image.h"

#include "base/at_exit.h"
#include "download/link/download_failure.h"
#include "download/stream/block_writer.h"

namespace kral::stream {
namespace {

// Stops the thread on every way out.
class RunningThread {
 public:
  explicit RunningThread(CImageWriteRsp& replies) : replies_(&replies) {}
  ~RunningThread() {
    if (replies_ != nullptr) replies_->StopThread();
  }
  RunningThread(const RunningThread&) = delete;
  RunningThread& operator=(const RunningThread&) = delete;

  bool Stop() {
    CImageWriteRsp* const replies = replies_;
    replies_ = nullptr;
    return replies->StopThread();
  }

 private:
  CImageWriteRsp* replies_;
};

}  // namespace

CWriteImage::CWriteImage(download::DownloadConnection& connection, std::unique_ptr<CImageOpen> opener)
    : connection_(connection), time_out_ms_(connection.time_out_ms()), opener_(std::move(opener)) {}

CWriteImageFramed::CWriteImageFramed(download::DownloadConnection& connection)
    : CWriteImage(connection, std::make_unique<CImageOpenFramed>(connection, connection.time_out_ms())) {}

CWriteNORImageFramed::CWriteNORImageFramed(download::DownloadConnection& connection)
    : CWriteImage(connection, std::make_unique<CImageOpenNOR>(connection, connection.time_out_ms())) {}

WriteOutcome CWriteImage::Write(const images::PhoneImage& image, uint8_t type, const images::PhoneImage* header,
                                const WriteLimits& requested) {
  const uint32_t size = image.GetSize(0);
  WriteLimits limits;
  if (connection_.aborted()) return Failed(WriteOutcome::kAborted, "aborted before the image was opened\n");
  if (requested.block_size == 0 || !opener_->OpenMulti(type, header, requested, limits)) {
    return Failed(WriteOutcome::kNotOpened, "multi-image open failed\n");
  }
  // An image of nothing is opened and closed.
  if (size != 0) {
    const WriteOutcome outcome = Stream(image, size, limits);
    if (outcome != WriteOutcome::kDone) return outcome;
  }
  if (connection_.aborted()) return Failed(WriteOutcome::kAborted, "aborted before the image was closed\n");
  return opener_->Close() ? WriteOutcome::kDone : WriteOutcome::kNotClosed;
}

WriteOutcome CWriteImage::Stream(const images::PhoneImage& image, uint32_t size, const WriteLimits& limits) {
  const auto replies = std::make_shared<CImageWriteRspFramed>(connection_);
  DownloadAgent& agent = replies->agent();
  agent.Start(limits.window);
  const AtExit empty_queues([&agent] { agent.Stop(); });
  RunningThread thread(*replies);
  switch (replies->StartThread(time_out_ms_)) {
    case CImageWriteRsp::Start::kStarted:
      break;
    case CImageWriteRsp::Start::kNoThread:
      return Failed(WriteOutcome::kNoThread, "failed to start the write response thread\n");
    case CImageWriteRsp::Start::kTimeOut:
      return Failed(WriteOutcome::kThreadNotStarted, "timeout waiting for response thread to start\n");
  }

  const CDownloadBlock whole{image.GetBaseAddress(0), size, 0};
  agent.Enqueue(whole);
  connection_.log().WriteLine(kLogRet, "Enqueued address 0x%08X, size 0x%X, device %d\n", whole.address, whole.size,
                              static_cast<int>(whole.device));
  if (!WriteLoop(image, limits, *replies)) {
    const auto outcome = connection_.aborted() ? WriteOutcome::kAborted : WriteOutcome::kNotWritten;
    return Failed(outcome, "failed during image write\n");
  }
  if (!replies->AwaitFinished(time_out_ms_)) {
    return Failed(WriteOutcome::kNotCompleted, "failed waiting for completion\n");
  }
  connection_.log().WriteLine(kLogRet, "Sent %u Acknowledged %u\n", agent.blocks_sent(), agent.blocks_acknowledged());
  if (thread.Stop()) return WriteOutcome::kDone;
  return Failed(WriteOutcome::kThreadNotStopped, "failed to stop the write response thread\n");
}

bool CWriteImage::WriteLoop(const images::PhoneImage& image, const WriteLimits& limits, CImageWriteRsp& replies) {
  connection_.log().WriteLine(kLogRet, "Streaming start max write %u, window size %u\n", limits.block_size,
                              limits.window);
  CImageWriteCmdFramed command(connection_, time_out_ms_);
  BlockWriter writer(connection_, replies.agent(), image, command, limits.block_size, connection_.acknowledge_ms());
  return writer.Run(image.GetSize(0));
}

WriteOutcome CWriteImage::Failed(WriteOutcome outcome, const char* text) {
  connection_.log().WriteLine(kLogErr, "%s", text);
  switch (outcome) {
    case WriteOutcome::kAborted:
      download::Aborted();
      break;
    case WriteOutcome::kNotCompleted:
      Fail(Failure(KRAL_ERROR_LOST, "the last block was not acknowledged within %u ms", time_out_ms_));
      break;
    case WriteOutcome::kNoThread:
    case WriteOutcome::kThreadNotStarted:
    case WriteOutcome::kThreadNotStopped:
      Fail(Failure(KRAL_ERROR_INTERNAL, "the response thread does not obey: %s", text));
      break;
    default:  // noted by the opener and the writer
      break;
  }
  return outcome;
}

}  // namespace kral::stream
