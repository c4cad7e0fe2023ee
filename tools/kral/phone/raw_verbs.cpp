// kral raw: sends one request as given and shows the reply as it came.
#include <array>
#include <memory>

#include "tools/kral/format.h"
#include "tools/kral/hex_bytes.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::size_t kMostRequest = 4096;
constexpr std::size_t kReplyRoom = 4096;
constexpr std::int32_t kDefaultTimeOutMs = 4000;

std::vector<std::uint8_t> ParseRequest(const std::vector<std::string>& words) {
  auto request = ParseHex(words);
  if (!request.empty() && request.size() <= kMostRequest) return request;
  throw ToolError(ExitCode::kUsage, Format("a request has 1 to {} bytes, not {}", kMostRequest, request.size()),
                  "give the bytes in hex, command code first: kral raw 7C");
}

void SendRaw(Context& context, const std::vector<std::string>& words) {
  const auto request = ParseRequest(words);
  Session session(context.session);
  const auto time_out = static_cast<std::int32_t>(context.session.time_out_ms.value_or(kDefaultTimeOutMs));
  std::array<std::uint8_t, kReplyRoom> reply{};
  auto size = static_cast<std::uint16_t>(reply.size());
  session.Begin();
  const bool answered = KRAL_SendSync(session.handle(), static_cast<std::uint16_t>(request.size()), request.data(),
                                      &size, reply.data(), static_cast<std::uint32_t>(time_out)) != 0;
  // A refusal also leaves its bytes, with their size; without any reply the size is as it was.
  const bool replied = answered || size < reply.size();
  const auto bytes = std::span(reply).first(replied ? size : 0);
  const Json members{{"port", session.port()}, {"request", HexText(request)}, {"reply", HexText(bytes)}};
  if (answered) {
    context.out.Result(members, HexDump(bytes));
    return;
  }
  if (context.out.json()) {
    context.found = members;
  } else if (replied) {
    context.out.Result(members, HexDump(bytes));
  }
  throw session.Explain(Format("command {:02X}", request.front()));
}

}  // namespace

void AddRawVerbs(const Command& root, Context& context) {
  const auto words = std::make_shared<std::vector<std::string>>();
  const auto raw = root.Verb("raw", "Send one request, given in hex, and print the reply");
  raw.Add("bytes", *words, "The request without framing, such as 4B 0F 00 00").Required();
  raw.ForMany();
  raw.Checks([words] { ParseRequest(*words); });
  raw.Run([&context, words] { SendRaw(context, *words); });
}

}  // namespace kral::tool
