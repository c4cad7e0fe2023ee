// The opening and closing packets of a multi-image download.
#include "download/stream/image_open.h"

#include <algorithm>

#include "base/waitable_timer.h"
#include "download/stream/stream_format.h"

namespace kral::stream {
namespace {

// How the log tells what became of a request that was not answered as it should be.
constexpr unsigned kStatusNoReply = 1;
constexpr unsigned kStatusOtherReply = 2;

bool IsAcknowledgement(std::span<const uint8_t> reply) {
  return reply.size() == kWriteReplySize && reply[0] == kWriteReply;
}

}  // namespace

Failure HeaderTooLong(uint32_t size) {
  return Failure(KRAL_ERROR_ARGUMENT, "a header of %u bytes is too long: an opening packet takes %u", size,
                 static_cast<unsigned>(kLongestHeader));
}

WriteLimits CImageOpen::Limited(const WriteLimits& requested) {
  return {std::min(requested.block_size, kMostWriteData), std::max(requested.window, 1u)};
}

// A block that was sent again may be acknowledged once more, long after: that answers neither opening nor closing.
Reply CImageOpen::Exchange(std::span<const uint8_t> request, uint8_t expected_code) {
  Reply reply = connection_.Exchange(request, expected_code, time_out_ms_);
  CWaitableTimer timer;  // a storm of them must not hold the call up for ever
  timer.Arm(time_out_ms_);
  while (reply.kind() == ReplyKind::kOther && IsAcknowledgement(reply.bytes()) && !timer.expired()) {
    reply = connection_.AwaitReply(expected_code, time_out_ms_);
  }
  return reply;
}

bool CImageOpen::Close() {
  const uint8_t request = kClose;
  const Reply answer = Exchange({&request, 1}, kCloseReply);
  const auto reply = answer.bytes();
  auto& log = connection_.log();
  if (!answer) {
    const unsigned status = answer.came() ? kStatusOtherReply : kStatusNoReply;
    if (!reply.empty()) {
      log.WriteLine(kLogErr, "error - MI close failed: status %u rsp %02X\n", status, reply[0]);
    } else {
      log.WriteLine(kLogErr, "error - MI close failed: status %u\n", status);
    }
    return false;
  }
  if (reply.size() != 1) {
    log.WriteLine(kLogErr, "error - response to MI close: size %u expected %u\n", static_cast<unsigned>(reply.size()),
                  1u);
    return Fail(
        Failure(KRAL_ERROR_LINK, "the answer to the closing of the image has %zu bytes instead of 1", reply.size()));
  }
  if (reply[0] != kCloseReply) {
    log.WriteLine(kLogErr, "error - response to MI close: rsp %u\n", static_cast<unsigned>(reply[0]));
    return false;
  }
  return true;
}

bool CImageOpenFramed::OpenMulti(uint8_t type, const images::PhoneImage* header, const WriteLimits& requested,
                                 WriteLimits& limits) {
  std::vector<uint8_t> request = {kOpen, type};
  if (header != nullptr) {
    const uint32_t size = header->GetSize(0);
    if (size > kLongestHeader) return Fail(HeaderTooLong(size));
    request.resize(request.size() + size);
    header->Read(header->GetBaseAddress(0), request.data() + 2, size, 0);
  }
  const Reply answer = Exchange(request, kOpenReply);
  if (!answer) return false;
  const auto reply = answer.bytes();
  if (reply.size() != kStatusReplySize) {
    return Fail(Failure(KRAL_ERROR_LINK, "the answer to the opening of the image has %zu bytes", reply.size()));
  }
  if (reply[kStatusAt] != kStatusDone) {
    return Fail(
        Failure(KRAL_ERROR_REFUSED, "the handset refused to open an image of type %d with %d", type, reply[kStatusAt])
            .Status(KRAL_ERROR_STATUS_LOADER, reply[kStatusAt]));
  }
  limits = Limited(requested);
  return true;
}

bool CImageOpenNOR::OpenMulti(uint8_t, const images::PhoneImage*, const WriteLimits& requested, WriteLimits& limits) {
  limits = Limited(requested);
  return true;
}

}  // namespace kral::stream
