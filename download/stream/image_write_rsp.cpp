// Takes the replies to stream writes from the response queue for as long as an image is written.
#include "download/stream/image_write_rsp.h"

#include <chrono>

#include "base/at_exit.h"
#include "base/little_endian.h"
#include "download/stream/stream_format.h"
#include "platform/forced_unwind.h"

namespace kral::stream {
namespace {

constexpr std::chrono::milliseconds kHeadStart{100};
constexpr std::chrono::milliseconds kPoll{1};
constexpr uint32_t kStopMs = 1000;

}  // namespace

CImageWriteRsp::CImageWriteRsp(download::DownloadConnection& connection)
    : log_(connection.log()),
      connection_(connection),
      parts_(connection.KeepParts()),
      responses_(connection.responses()) {}

CImageWriteRsp::Start CImageWriteRsp::StartThread(uint32_t time_out_ms) {
  connection_.ForgetReplies();
  if (!worker_.Start([this] { Run(); }, shared_from_this())) return Start::kNoThread;
  return thread_started_.WaitFor(time_out_ms) ? Start::kStarted : Start::kTimeOut;
}

bool CImageWriteRsp::StopThread() {
  stop_.Set();
  if (worker_.running() && !thread_ended_.WaitFor(kStopMs)) return false;
  worker_.Join();
  return true;
}

// The writer gets a head start, which the first reply ends: with a narrow window it would stand still for the rest.
void CImageWriteRsp::Run() {
  CReplyRcvrCont receiver(*this, agent_, finished_, log_);
  const AtExit ended([this] { thread_ended_.Set(); });
  thread_started_.Set();
  auto patience = kHeadStart;
  while (!stop_.WaitFor(0)) {
    try {
      if (const auto frame = responses_.PopWithin(patience)) {
        receiver.OnFrame(*frame);
      } else if (responses_.closed()) {
        agent_.Fail({});  // no reply will come any more
        break;
      }
    } catch (...) {
      PassForcedUnwind();
      agent_.Fail({});  // out of memory: the reply is lost, and the thread must not be
    }
    patience = kPoll;
  }
}

WriteReply CImageWriteRspFramed::ParseReply(std::span<const uint8_t> payload) {
  if (payload.size() != kWriteReplySize) {
    log_.WriteLine(kLogErr, "WriteResponse bad length %u\n", static_cast<unsigned>(payload.size()));
    return WriteReply::kBadLength;
  }
  if (payload[0] != kWriteReply) {
    log_.WriteLine(kLogErr, "WriteResponse bad command %u\n", static_cast<unsigned>(payload[0]));
    return WriteReply::kBadCode;
  }
  const uint32_t address = *LoadLe<uint32_t>(payload, kAddressAt);
  const auto block = agent_.Acknowledge(address);
  if (!block) return WriteReply::kAcknowledged;
  log_.WriteLine(kLogRet, "Reply address 0x%08X size 0x%X\n", address, block->size);
  return block->final ? WriteReply::kComplete : WriteReply::kAcknowledged;
}

}  // namespace kral::stream
