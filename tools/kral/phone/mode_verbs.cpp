// kral mode: asks for the operating mode and switches it.
#include <algorithm>

#include "tools/kral/format.h"
#include "tools/kral/phone/operating_mode.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

// The operating-mode query: subsystem 15, command 0; the state is a 32-bit value at offset 8 of the reply.
constexpr std::array<std::uint8_t, 4> kQuery{0x4B, 0x0F, 0x00, 0x00};
constexpr std::size_t kStateOffset = 8;

struct StateName {
  std::uint32_t state;
  std::string_view name;
};
constexpr std::array<StateName, 6> kStateNames{
    {{1, "ftm"}, {2, "offline"}, {3, "offline"}, {4, "offline"}, {5, "online"}, {6, "lpm"}}};

void GetMode(const Context& context) {
  Session session(context.session);
  std::uint32_t state = 0;
  session.Run("the operating-mode query", [&] { return ReadOperatingState(session, state); });
  context.out.Result({{"port", session.port()}, {"mode", NameOfState(state)}, {"state", state}},
                     Format("{}\n", NameOfState(state)));
}

void SetMode(const Context& context, const ModeRequest& request) {
  Session session(context.session);
  session.Run(Format("the switch to mode {}", request.name),
              [&] { return KRAL_DIAG_CONTROL_F(session.handle(), request.mode); });
  context.out.Result({{"port", session.port()}, {"mode", request.name}}, Format("{}\n", request.name));
}

}  // namespace

std::uint8_t ReadOperatingState(const Session& session, std::uint32_t& state) {
  std::array<std::uint8_t, 64> reply{};
  auto size = static_cast<std::uint16_t>(reply.size());
  std::int32_t time_out = KRAL_GetTimeOut(session.handle(), 0);
  if (KRAL_SendSync(session.handle(), kQuery.size(), kQuery.data(), &size, reply.data(),
                    static_cast<std::uint32_t>(time_out)) == 0) {
    return 0;
  }
  if (size < kStateOffset + 4) {
    throw ToolError(ExitCode::kLink,
                    Format("the reply to the operating-mode query on {} has {} bytes: too few for a mode",
                           DescribePort(session.port()), size),
                    "other firmware may tell it; kral raw 4B 0F 00 00 shows the reply");
  }
  state = 0;
  for (std::size_t i = 0; i < 4; ++i) state |= std::uint32_t{reply[kStateOffset + i]} << (8 * i);
  return 1;
}

std::string_view NameOfState(std::uint32_t state) {
  const auto known = std::ranges::find_if(kStateNames, [state](const StateName& row) { return row.state == state; });
  return known == kStateNames.end() ? "unknown" : known->name;
}

void AddModeVerbs(const Command& root, Context& context) {
  const auto mode = root.Noun("mode", "Ask for the operating mode, or switch it");
  const auto add = [&mode](std::string_view name, const std::string& help, std::function<void()> act) {
    const auto verb = mode.Verb(std::string(name), help);
    verb.ForMany();
    verb.Run(std::move(act));
  };
  add("get", "Print the operating mode", [&context] { GetMode(context); });
  for (const auto& request : kModeRequests) {
    add(request.name,
        request.name == "reset" ? "Restart the handset" : Format("Switch to mode {} and wait for it", request.name),
        [&context, &request] { SetMode(context, request); });
  }
}

}  // namespace kral::tool
