// Wakes the flash programmer with no-operations and asks for its limits.
#include "download/stream/stream_hello.h"

#include <algorithm>
#include <array>
#include <vector>

#include "base/little_endian.h"
#include "download/link/download_failure.h"
#include "download/stream/stream_format.h"

namespace kral::stream {
namespace {

constexpr int kNops = 3;
constexpr uint32_t kNopMs = 1000;
constexpr uint32_t kHelloMs = 2000;
constexpr size_t kReplyRoom = 2048;

constexpr size_t kVersionAt = kMagicAt + kHostMagic.size();
constexpr size_t kRequestSize = kVersionAt + 3;

std::array<uint8_t, kRequestSize> HelloRequest() {
  std::array<uint8_t, kRequestSize> request{kHello};
  std::ranges::copy(kHostMagic, request.begin() + kMagicAt);
  request[kVersionAt] = kVersion;
  request[kVersionAt + 1] = kCompatibleVersion;
  request[kVersionAt + 2] = kFeatures;
  return request;
}

std::optional<HelloReply> ExchangeHello(download::DownloadConnection& connection, uint32_t variant,
                                        uint32_t time_out_ms) {
  if (variant != kHelloVariant) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "no hello exchange of variant %u is known", variant));
    return std::nullopt;
  }
  const Reply reply = connection.Exchange(HelloRequest(), kHelloReply, time_out_ms);
  if (!reply) return std::nullopt;
  const auto bytes = reply.bytes();
  const auto answer = ParseHelloReply(bytes.first(std::min(bytes.size(), kReplyRoom)));
  if (!answer)
    Fail(Failure(KRAL_ERROR_LINK, "an answer of %zu bytes to the hello is no flash programmer's", bytes.size()));
  return answer;
}

}  // namespace

std::optional<HelloReply> ParseHelloReply(std::span<const uint8_t> reply) {
  if (reply.size() < kShortestHelloReply || reply[0] != kHelloReply) return std::nullopt;
  if (!std::equal(kTargetMagic.begin(), kTargetMagic.end(), reply.begin() + kMagicAt)) return std::nullopt;
  const auto block_size = LoadLe<uint32_t>(reply, kBlockSizeAt);
  const auto window = LoadLe<uint16_t>(reply, kIdAt + reply[kIdLengthAt]);
  // No image can be written in blocks of nothing.
  if (!block_size || *block_size == 0 || !window) return std::nullopt;
  return HelloReply{*block_size, *window};
}

std::optional<HelloReply> Hello(download::DownloadConnection& connection, const download::Settings& settings,
                                uint32_t variant) {
  auto& log = connection.log();
  const uint32_t nop_ms = std::min(kNopMs, settings.handshake_limit_ms);
  for (int i = 1; i <= kNops && !connection.aborted(); ++i) {
    log.WriteLine(kLogRet, "Sending NOP to flash programmer, %d", i);
    connection.TakeWhoIsThere();  // a programmer comes as a new device
    connection.Exchange(kNopRequest, kNopReply, nop_ms);
  }
  std::optional<HelloReply> answer;
  const uint32_t tries = std::max(settings.hello_tries.load(), 1u);
  for (uint32_t i = 1; i <= tries && !answer && !connection.aborted(); ++i) {
    if (i > 1 && !connection.Pause(settings.hello_retry_delay_ms)) break;
    log.WriteLine(kLogRet, "Sending HELLO to flash programmer, %d", static_cast<int>(i));
    connection.TakeWhoIsThere();
    answer = ExchangeHello(connection, variant, std::min(kHelloMs, settings.handshake_limit_ms));
  }
  const HelloReply limits = answer.value_or(HelloReply{});
  log.WriteLine(answer ? kLogRet : kLogErr, "HELLO command %s, block size %u, window size %u",
                answer ? "succeeded" : "failed", limits.block_size, static_cast<unsigned>(limits.window));
  if (!answer && connection.aborted()) download::Aborted();
  return answer;
}

}  // namespace kral::stream
