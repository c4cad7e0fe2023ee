// kral ftm: factory test mode commands to the dispatcher of one radio technology.
#include <array>
#include <charconv>
#include <memory>
#include <optional>

#include "tools/kral/format.h"
#include "tools/kral/hex_bytes.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint8_t kHeaderForms = 3;

// What every FTM verb can be told: a handle forgets its FTM settings with the end of the tool.
struct FtmOptions {
  std::optional<std::uint16_t> mode_id;
  std::optional<std::uint16_t> rf_mode;
  std::uint16_t command_code = 75;
};

struct FtmCommand {
  std::uint16_t id;
  std::string name;
};

std::vector<FtmCommand> ListCommands() {
  std::vector<FtmCommand> commands;
  std::array<char, 64> name{};
  for (std::uint16_t i = 0; i < KRAL_FTM_GetCommandCount(); ++i) {
    FtmCommand command{};
    if (KRAL_FTM_GetCommandInfo(i, &command.id, name.data(), static_cast<std::uint16_t>(name.size())) == 0) continue;
    command.name = name.data();
    commands.push_back(std::move(command));
  }
  return commands;
}

// "53" or "GET_RX_AGC", with or without KRAL_FTM_ in front.
std::uint16_t ParseCommand(std::string_view text) {
  std::uint16_t id = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), id);
  if (error == std::errc() && end == text.data() + text.size()) return id;
  constexpr std::string_view kPrefix = "KRAL_FTM_";
  if (text.starts_with(kPrefix)) text.remove_prefix(kPrefix.size());
  for (const auto& command : ListCommands()) {
    if (command.name == text) return command.id;
  }
  throw ToolError(ExitCode::kUsage, Format("there is no FTM command {}", text),
                  "kral ftm list shows the names; any id from 0 to 65535 is taken as well");
}

void Apply(Session& session, const FtmOptions& options) {
  session.Run("the choice of the command code",
              [&] { return KRAL_FTM_SET_COMMAND_CODE(session.handle(), options.command_code); });
  if (options.mode_id) KRAL_FTM_SET_MODE_ID(session.handle(), *options.mode_id);
  if (!options.rf_mode) return;
  session.Run(Format("RF mode {}", *options.rf_mode),
              [&] { return KRAL_FTM_SET_MODE(session.handle(), *options.rf_mode); });
}

std::uint16_t ModeId(const Session& session) {
  std::uint16_t mode_id = 0;
  KRAL_FTM_GET_MODE_ID(session.handle(), &mode_id);
  return mode_id;
}

void SetMode(const Context& context, FtmOptions options, std::uint16_t rf_mode) {
  options.rf_mode = rf_mode;
  Session session(context.session);
  Apply(session, options);
  const std::uint16_t mode_id = ModeId(session);
  context.out.Result({{"port", session.port()}, {"rf_mode", rf_mode}, {"mode_id", mode_id}},
                     Format("RF mode {} (mode id {})\n", rf_mode, mode_id));
}

void SetChannel(const Context& context, const FtmOptions& options, std::uint16_t channel) {
  Session session(context.session);
  Apply(session, options);
  session.Run(Format("channel {}", channel), [&] { return KRAL_FTM_SET_CHAN(session.handle(), channel); });
  context.out.Result({{"port", session.port()}, {"channel", channel}}, Format("channel {}\n", channel));
}

void SwitchTx(const Context& context, const FtmOptions& options, bool on) {
  Session session(context.session);
  Apply(session, options);
  session.Run("the transmitter switch",
              [&] { return on ? KRAL_FTM_SET_TX_ON(session.handle()) : KRAL_FTM_SET_TX_OFF(session.handle()); });
  context.out.Result({{"port", session.port()}, {"transmitter", on ? "on" : "off"}},
                     Format("transmitter {}\n", on ? "on" : "off"));
}

struct CommandArguments {
  std::string command;
  std::vector<std::string> payload;
  std::uint8_t form = 0;
};

// The library's packet, or the one byte that tells the length under code 59; without the header.
std::size_t MostPayload(std::uint16_t command_code, std::uint8_t form) {
  constexpr std::size_t kRoom = 6143;
  constexpr std::size_t kLegacyRoom = 260;
  constexpr std::uint16_t kLegacyCode = 59;
  const std::size_t lengths = form == KRAL_FTM_HEADER_PLAIN ? 0 : 4;
  return command_code == kLegacyCode ? kLegacyRoom - 7 - lengths : kRoom - 6 - lengths;
}

std::vector<std::uint8_t> ParsePayload(const FtmOptions& options, const CommandArguments& arguments) {
  if (arguments.payload.empty()) return {};
  auto payload = ParseHex(arguments.payload);
  const auto most = MostPayload(options.command_code, arguments.form);
  if (payload.size() <= most) return payload;
  throw ToolError(ExitCode::kUsage, Format("a payload of {} bytes is too long: at most {}", payload.size(), most),
                  "an FTM request is one packet");
}

void SendCommand(const Context& context, const FtmOptions& options, const CommandArguments& arguments) {
  const std::uint16_t command = ParseCommand(arguments.command);
  const auto payload = ParsePayload(options, arguments);
  Session session(context.session);
  Apply(session, options);
  std::array<std::uint8_t, 4096> response{};
  auto size = static_cast<std::uint16_t>(response.size());
  session.Run(Format("FTM command {}", command), [&] {
    return KRAL_FTM_SendCommandTo(session.handle(), ModeId(session), arguments.form, command, payload.data(),
                                  static_cast<std::uint16_t>(payload.size()), response.data(), &size);
  });
  const auto bytes = std::span(response).first(size);
  context.out.Result({{"port", session.port()}, {"command", command}, {"response", HexText(bytes)}}, HexDump(bytes));
}

void PrintList(const Context& context) {
  Json rows = Json::array();
  std::string text;
  for (const auto& command : ListCommands()) {
    rows.push_back({{"id", command.id}, {"name", command.name}});
    text += Format("{:5}  {}\n", command.id, command.name);
  }
  context.out.Result({{"commands", rows}}, text);
}

void AddOptions(const Command& verb, const std::shared_ptr<FtmOptions>& options) {
  verb.Add("--mode-id", options->mode_id, "Dispatcher of the handset, such as 1 for WCDMA");
  verb.Add("--code", options->command_code, "Diagnostic command code that carries FTM: 75 or 59").OneOf({"75", "59"});
}

void AddRfMode(const Command& verb, const std::shared_ptr<FtmOptions>& options) {
  verb.Add("--rf-mode", options->rf_mode, "Set this RF mode first");
}

}  // namespace

void AddFtmVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<FtmOptions>();
  const auto ftm = root.Noun("ftm", "Factory test mode commands (kral mode ftm takes the handset there)");
  AddOptions(ftm, options);

  const auto number = std::make_shared<std::uint16_t>();
  const auto mode = ftm.Verb("mode", "Set the RF mode: technology and band");
  mode.Add("rf-mode", *number, "RF mode, such as 9").Required();
  mode.Run([&context, options, number] { SetMode(context, *options, *number); });

  const auto channel = ftm.Verb("chan", "Set the channel");
  channel.Add("channel", *number, "Channel number of the RF mode's band").Required();
  AddRfMode(channel, options);
  channel.Run([&context, options, number] { SetChannel(context, *options, *number); });

  const auto tx = ftm.Verb("tx", "Switch the transmitter");
  const auto state = std::make_shared<std::string>();
  tx.Add("state", *state, "on or off").Required().OneOf({"on", "off"});
  AddRfMode(tx, options);
  tx.Run([&context, options, state] { SwitchTx(context, *options, *state == "on"); });

  const auto arguments = std::make_shared<CommandArguments>();
  const auto command = ftm.Verb("cmd", "Send any command and print what the handset answers");
  command.Add("command", arguments->command, "Name or id of the command, such as GET_RX_AGC or 53").Required();
  command.Add("payload", arguments->payload, "Payload in hex, little-endian fields");
  command.Add("--form", arguments->form, "Header: 0 plain, 1 with data lengths, 2 PMIC").Between(0, kHeaderForms - 1);
  AddRfMode(command, options);
  command.Run([&context, options, arguments] { SendCommand(context, *options, *arguments); });

  command.Checks([options, arguments] {
    ParseCommand(arguments->command);
    ParsePayload(*options, *arguments);
  });
  for (const auto& verb : {mode, channel, tx, command}) verb.ForMany();

  const auto list = ftm.Verb("list", "Print the table of RF commands");
  list.NeedsNoHandset();
  list.Run([&context] { PrintList(context); });
}

}  // namespace kral::tool
