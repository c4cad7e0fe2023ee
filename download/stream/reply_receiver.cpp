// Hands reply frames to the parser and passes on what it says.
#include "download/stream/reply_receiver.h"

#include <algorithm>

#include "base/wire_codes.h"

namespace kral::stream {
namespace {

constexpr size_t kShortestFrame = 5;

const char* TextOf(WriteReply result) {
  switch (result) {
    case WriteReply::kBadCrc:
      return "write error - bad CRC\n";
    case WriteReply::kParseFailure:
      return "write error - parse fail\n";
    case WriteReply::kBadLength:
      return "write error - invalid response length\n";
    case WriteReply::kBadCode:
      return "write error - invalid response code\n";
    case WriteReply::kBadSequence:
      return "write error - wrong sequence number\n";
    default:
      return "write error - unknown error\n";
  }
}

}  // namespace

void CReplyRcvrCont::OnFrame(std::span<const uint8_t> frame) {
  if (!response_.Accepts(frame)) return;
  if (frame.size() < kShortestFrame) log_.WriteLine(kLogErr, "yes: size too small\n");
  const auto payload = frame.first(frame.size() - std::min(frame.size(), kFcsSize));
  const WriteReply result = parser_.ParseReply(payload);
  switch (result) {
    case WriteReply::kAcknowledged:
      return;
    case WriteReply::kComplete:
      if (!done_) finished_.Set();
      done_ = true;
      return;
    default:
      log_.WriteLine(kLogErr, "%s", TextOf(result));
      agent_.Fail(DownloadAgent::OtherReply{payload.size(), payload.empty() ? uint8_t{0} : payload[0]});
  }
}

}  // namespace kral::stream
