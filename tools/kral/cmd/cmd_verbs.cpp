// kral cmd: commands that a definition file describes.
#include <algorithm>
#include <array>
#include <functional>
#include <memory>
#include <optional>

#include "platform/file_util.h"
#include "tools/kral/cmd/cmd_definitions.h"
#include "tools/kral/cmd/cmd_header.h"
#include "tools/kral/format.h"
#include "tools/kral/one_file.h"
#include "tools/kral/settings.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct CmdOptions {
  std::vector<std::string> files;
  std::string command;
  std::vector<std::string> fields;
  std::optional<std::uint16_t> mode_id;
  std::optional<std::uint16_t> rf_mode;
};

std::string LibraryText(std::uint32_t length, const std::function<std::uint8_t(char*, std::uint32_t)>& get) {
  std::string text(length, '\0');
  get(text.data(), length);
  text.resize(text.find('\0'));
  return text;
}

void List(const Context& context, const CmdOptions& options) {
  Session session(WithoutHandset(context.session));
  LoadCommands(session, options.files);
  Json rows = Json::array();
  std::string text;
  for (const auto& [name, record] : ListCommands(session)) {
    rows.push_back({{"name", name}, {"id", record.id}, {"doc", record.documentation}});
    text +=
        Format("{:>5}  {}{}{}\n", record.id, name, record.documentation[0] == '\0' ? "" : "  ", record.documentation);
  }
  context.out.Result({{"commands", rows}}, text);
}

// "  channel  u8  1 to 14  Channel of the 2.4 GHz band"
std::string FieldLine(const KRAL_CMD_FIELD& field) {
  constexpr std::array<const char*, 8> kKinds = {"u{}", "s{}", "f{}", "text", "bytes", "record", "bits of u{}", "zlib"};
  std::string type = kKinds.at(field.kind);
  if (const auto place = type.find("{}"); place != std::string::npos)
    type.replace(place, 2, std::to_string(field.bits));
  if ((field.flags & KRAL_CMD_FIELD_ARRAY) != 0) {
    type += Format("[{}{}]", (field.flags & KRAL_CMD_FIELD_VARIABLE) != 0 ? "up to " : "", field.count);
  }
  std::string line(2 + 2 * field.depth, ' ');
  line += Format("{}  {}", field.name, type);
  if (field.kind <= KRAL_CMD_KIND_REAL) line += Format("  {:.15g} to {:.15g}", field.least, field.most);
  if (field.room != 0) line += Format("  up to {} bytes", field.room);
  if (field.unit[0] != '\0') line += Format(" {}", field.unit);
  if ((field.flags & KRAL_CMD_FIELD_DEFAULT) != 0) {
    line += field.kind <= KRAL_CMD_KIND_REAL ? Format(", else {:.15g}", field.preset) : ", may be left out";
  }
  if ((field.flags & KRAL_CMD_FIELD_COUNTS) != 0) line += ", follows from what it counts";
  if ((field.flags & KRAL_CMD_FIELD_CONDITIONAL) != 0) line += ", not always there";
  if ((field.flags & KRAL_CMD_FIELD_STATUS) != 0) line += ", the status";
  if (field.documentation[0] != '\0') line += Format("  {}", field.documentation);
  return line + "\n";
}

void Show(const Context& context, const CmdOptions& options) {
  Session session(WithoutHandset(context.session));
  LoadCommands(session, options.files);
  const auto command = FindCommand(session, options.command);
  std::uint32_t length = 0;
  session.Run("the description",
              [&] { return KRAL_CMD_DescribeLength(session.handle(), command.name.c_str(), &length); });
  const auto description = LibraryText(length, [&](char* text, std::uint32_t size) {
    return KRAL_CMD_Describe(session.handle(), command.name.c_str(), text, size);
  });
  std::string text = Format("{} ({})  {}\nrequest:\n", command.name, command.record.id, command.record.documentation);
  for (const auto& field : FieldsOf(session, command, false)) text += FieldLine(field);
  text += "reply:\n";
  for (const auto& field : FieldsOf(session, command, true)) text += FieldLine(field);
  context.out.Result({{"command", Json::parsed(description)}}, text);
}

// A word of the command line, as the library takes it: the shell has taken the quotation marks away.
std::string QuotedField(const std::string& word) {
  const auto equals = word.find('=');
  if (equals == std::string::npos) {
    throw ToolError(ExitCode::kUsage, Format("{} is not of the form field=value", word), "as in channel=6");
  }
  std::string field = word.substr(0, equals + 1) + '"';
  for (const char character : word.substr(equals + 1)) {
    if (character == '"' || character == '\\') field += '\\';
    field += character;
  }
  return field + '"';
}

std::string QuotedFields(const CmdOptions& options) {
  std::string fields;
  for (const auto& word : options.fields) fields += QuotedField(word) + ' ';
  return fields;
}

void CheckCall(const Context& context, const CmdOptions& options) {
  const auto fields = QuotedFields(options);
  Session session(OfNullPort(context.session));
  LoadCommands(session, options.files);
  const auto command = FindCommand(session, options.command);
  std::uint32_t call = 0;
  session.Run(command.name, [&] { return KRAL_CMD_Prepare(session.handle(), command.name.c_str(), &call); });
  session.Run(command.name, [&] { return KRAL_CMD_SetFields(session.handle(), call, fields.c_str()); });
}

void Call(const Context& context, const CmdOptions& options) {
  const auto fields = QuotedFields(options);
  Session session(context.session);
  LoadCommands(session, options.files);
  const auto command = FindCommand(session, options.command);
  if (options.mode_id) KRAL_FTM_SET_MODE_ID(session.handle(), *options.mode_id);
  if (options.rf_mode) {
    session.Run(Format("RF mode {}", *options.rf_mode),
                [&] { return KRAL_FTM_SET_MODE(session.handle(), *options.rf_mode); });
  }
  session.Run(command.name,
              [&] { return KRAL_CMD_Call(session.handle(), command.name.c_str(), fields.c_str(), nullptr, 0); });
  std::uint32_t length = 0;
  KRAL_CMD_GetReplyLength(session.handle(), &length);
  const auto reply = LibraryText(
      length, [&](char* text, std::uint32_t size) { return KRAL_CMD_GetReply(session.handle(), text, size); });
  context.out.Result({{"port", session.port()}, {"command", command.name}, {"reply", Json::parsed(reply)}},
                     reply + "\n");
}

// --- What may be typed ----------------------------------------------------------------------------------------------

// The files that a line names with --defs, or those that are settled.
std::vector<std::string> FilesOf(const std::vector<std::string>& words) {
  constexpr std::string_view kOption = "--defs=";
  std::vector<std::string> files;
  for (std::size_t i = 0; i + 1 < words.size(); ++i) {
    if (words[i] == "--defs" && i + 2 < words.size()) files.push_back(words[i + 1]);
    if (words[i].starts_with(kOption)) files.push_back(words[i].substr(kOption.size()));
  }
  if (!files.empty()) return files;
  const auto settled = SettledFor("commands");
  return settled ? settled->words : files;
}

std::vector<Completion> SuggestCommands(const std::vector<std::string>& words) {
  Session session(WithoutHandset({}));
  LoadCommands(session, FilesOf(words));
  std::vector<Completion> found;
  for (const auto& [name, record] : ListCommands(session)) found.push_back({name, record.documentation});
  return found;
}

std::vector<Completion> SuggestFields(const std::vector<std::string>& words) {
  Session session(WithoutHandset({}));
  LoadCommands(session, FilesOf(words));
  const auto call = std::ranges::find(words, "call");
  std::vector<Completion> found;
  for (const auto& command : ListCommands(session)) {
    if (std::find(call, words.end(), command.name) == words.end()) continue;
    for (const auto& field : FieldsOf(session, command, false)) {
      if (field.kind >= KRAL_CMD_KIND_RECORD) continue;
      const auto begin = std::string(field.path) + "=";
      const auto is_begin = [&begin](const std::string& word) { return word.starts_with(begin); };
      const bool is_set = std::any_of(words.begin(), words.end() - 1, is_begin);
      if (is_set || (field.flags & KRAL_CMD_FIELD_COUNTS) != 0) continue;
      if (!is_begin(words.back())) {
        const auto help = FieldLine(field);
        found.push_back({begin, help.substr(help.find_first_not_of(' '))});
        continue;
      }
      std::array<char, 64> word{};
      std::int64_t value = 0;
      for (std::uint32_t i = 0; KRAL_CMD_GetWord(session.handle(), command.name.c_str(), 0, field.index, i, word.data(),
                                                 word.size(), &value) != 0;
           ++i) {
        found.push_back({begin + word.data(), std::to_string(value)});
      }
    }
  }
  return found;
}

struct HeaderOptions {
  std::vector<std::string> files;
  std::string output;
};

void WriteHeader(const Context& context, const HeaderOptions& options) {
  for (const auto& file : options.files) RefuseSource(file, options.output, "--output");
  Session session(WithoutHandset(context.session));
  LoadCommands(session, options.files);
  const auto& name = options.output.empty() ? options.files.front() : options.output;
  const auto header = MakeCmdHeader(session, name.substr(name.find_last_of("/\\") + 1));
  Json left_out = Json::array();
  for (const auto& [command, why] : header.left_out) {
    left_out.push_back(command);
    context.out.Note(Format("{} is left out: {}", command, why));
  }
  if (options.output.empty()) return context.out.Result({{"header", header.text}, {"left_out", left_out}}, header.text);
  const std::vector<std::uint8_t> bytes(header.text.begin(), header.text.end());
  if (const auto error = ReplaceWholeFile(options.output, bytes)) {
    throw ToolError(ExitCode::kBadFile, Format("{} cannot be written: {}", options.output, error.message()),
                    "check the folder and the permissions");
  }
  context.out.Result({{"file", options.output}, {"left_out", left_out}}, Format("{}\n", options.output));
}

void AddHeaderVerb(const Command& cmd, Context& context) {
  const auto options = std::make_shared<HeaderOptions>();
  const auto header = cmd.Verb("header", "Write a C header with a typed function for each command");
  header.NeedsNoHandset();
  header.Add("files", options->files, "Definition files").Required();
  header.Add("--output", options->output, "The header; default: the standard output").File();
  header.Writes([options] { return std::vector<std::string>{options->output}; });
  header.Run([&context, options] { WriteHeader(context, *options); });
}

}  // namespace

void AddCmdVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<CmdOptions>();
  const auto cmd = root.Noun("cmd", "Call commands that a definition file describes (docs/commands.md)");
  const auto add_files = [&](const Command& verb) {
    verb.Add("--defs", options->files, "Definition file; may be given several times. Default: KRAL_COMMANDS names it")
        .OneEach()
        .Settled("commands");
  };
  const auto list = cmd.Verb("list", "List the commands");
  list.NeedsNoHandset();
  add_files(list);
  list.Run([&context, options] { List(context, *options); });

  const auto show = cmd.Verb("show", "Show the fields of a command and of its reply");
  show.NeedsNoHandset();
  show.Add("command", options->command, "FAMILY.NAME").Required().Suggests(SuggestCommands);
  add_files(show);
  show.Run([&context, options] { Show(context, *options); });

  const auto call = cmd.Verb("call", "Call a command, and print its reply as JSON");
  call.Add("command", options->command, "FAMILY.NAME").Required().Suggests(SuggestCommands);
  call.Add("fields", options->fields, "field=value, as in channel=6 flags.on=1 list=1,2,3 data=00FF")
      .Suggests(SuggestFields);
  add_files(call);
  call.Add("--mode-id", options->mode_id, "Mode id, of families that use the current one");
  call.Add("--rf-mode", options->rf_mode, "RF mode to be set in front");
  call.ForMany();
  call.Checks([&context, options] { CheckCall(context, *options); });
  call.Run([&context, options] { Call(context, *options); });
  AddHeaderVerb(cmd, context);
}

}  // namespace kral::tool
