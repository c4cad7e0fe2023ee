// Any frames as replies to stream writes, and any bytes as the reply to a hello. Whatever comes, the queues of the
// agent stay whole: acknowledged bytes never exceed those sent, and blocks are neither lost nor doubled.
#include <algorithm>
#include <cstdint>
#include <span>

#include "download/stream/image_write_rsp.h"
#include "download/stream/reply_receiver.h"
#include "download/stream/stream_hello.h"
#include "frame/diag_ftm.h"
#include "fuzz/support.h"

namespace {

using namespace kral;
using fuzz::Require;

constexpr uint32_t kWindow = 4;
constexpr uint32_t kBlock = 16;
constexpr uint32_t kImage = 256;

// What the response thread does with a frame, without the thread.
class Replies final : public stream::CImageWriteRspFramed {
 public:
  using stream::CImageWriteRspFramed::CImageWriteRspFramed;
  void OnFrame(std::span<const uint8_t> frame) { receiver_.OnFrame(frame); }

 private:
  AutoResetEvent finished_;
  stream::CReplyRcvrCont receiver_{*this, agent_, finished_, log_};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::span bytes(data, size);
  if (const auto hello = stream::ParseHelloReply(bytes)) Require(size >= 48);

  static Diag_FTM phone(1);
  download::DownloadConnection connection(phone);
  Replies replies(connection);
  stream::DownloadAgent& agent = replies.agent();
  agent.Start(kWindow);
  agent.Enqueue({0, kImage, 0});
  for (size_t at = 0; at < size;) {
    while (agent.AwaitTurn(0) == stream::DownloadAgent::Wait::kReady) {
      if (!agent.TakeResend() && !agent.Carve(std::min(kBlock, agent.head() ? agent.head()->size : 0))) break;
    }
    const size_t wanted = data[at++] % 12;
    const size_t length = std::min(wanted, size - at);
    replies.OnFrame(bytes.subspan(at, length));
    at += length;
    Require(agent.bytes_acknowledged() <= kImage);
    Require(!agent.done() || agent.bytes_acknowledged() == kImage);
  }
  return 0;
}
