// Writes manual pages from what the verbs have declared, so that these and the help of the tool cannot differ.
#include "tools/kral/man_pages.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cstdint>
#include <sstream>
#include <string_view>

#include "kral/kral.h"
#include "platform/file_util.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr const char* kEnvironment =
    R"(.TP
.B KRAL_PORT\fR, \fBKRAL_TIME_OUT\fR, \fBKRAL_LOG\fR, \fBKRAL_LOG_FLAGS\fR, \fBKRAL_DEFINITIONS\fR, \fBKRAL_TYPES\fR, \fBKRAL_COMMANDS\fR
In place of the options of these names; see
.BR kral\-config (1).
.TP
.B KRAL_CONFIG
The file of settings, in place of the one below.
.TP
.BI KRAL_COM n
The device of the port of that number:
.BR KRAL_COM7=/dev/pts/4 .
.TP
.B KRAL_PORT_DIR
A folder of links
.IR com1 ,
.IR com2 " ..."
to devices.
)";

constexpr const char* kFiles =
    R"(.TP
.I ~/.config/kral/config.toml
Settings for every verb;
.B $XDG_CONFIG_HOME
is respected.
.TP
.IR ~/.config/kral/ports ", " /etc/kral/ports
Links to devices, as in
.BR KRAL_PORT_DIR .
)";

// Text as it is: nothing in it is a request, an escape, or a hyphen to break at.
std::string Roff(std::string_view text) {
  std::string escaped;
  bool at_start = true;
  for (const char character : text) {
    if (at_start && (character == '.' || character == '\'')) escaped += "\\&";
    if (character == '\\') {
      escaped += "\\e";
    } else if (character == '-') {
      escaped += "\\-";
    } else {
      escaped += character;
    }
    at_start = character == '\n';
  }
  return escaped;
}

std::string Bold(std::string_view text) {
  return Format("\\fB{}\\fR", Roff(text));
}

std::string Italic(std::string_view text) {
  return Format("\\fI{}\\fR", Roff(text));
}

std::string Upper(std::string text) {
  std::ranges::transform(text, text.begin(),
                         [](unsigned char letter) { return static_cast<char>(std::toupper(letter)); });
  return text;
}

std::string Sentence(const std::string& help) {
  return Roff(help.ends_with('.') ? help : help + '.');
}

// "-p, --port TEXT", "file..."
std::string TitleOf(const ParameterText& parameter) {
  if (!parameter.usage.empty()) return Italic(parameter.usage);
  if (!parameter.names.starts_with('-')) return Italic(parameter.names) + (parameter.many ? "..." : "");
  std::string title;
  std::istringstream names(parameter.names);
  for (std::string name; std::getline(names, name, ',');) title += (title.empty() ? "" : ", ") + Bold(name);
  if (!parameter.values.empty()) title += " " + Italic(parameter.values);
  return title + (parameter.many ? " ..." : "");
}

void AddParameters(const std::vector<ParameterText>& parameters, std::string& page) {
  for (const auto& parameter : parameters) {
    if (!parameter.help.empty()) page += Format(".TP\n{}\n{}\n", TitleOf(parameter), Sentence(parameter.help));
  }
}

void AddLines(std::string_view lines, std::string& page) {
  page += Format(".PP\n.EX\n{}{}.EE\n", Roff(lines), lines.ends_with('\n') ? "" : "\n");
}

// "kral [OPTION]... fs put [OPTION]... LOCAL... :PATH"
std::string Synopsis(const std::string& words, const CommandText& verb) {
  std::string line = Format("{} [{}]... {}", Bold("kral"), Italic("OPTION"), Bold(words));
  if (!verb.options.empty()) line += Format(" [{}]...", Italic("OPTION"));
  for (const auto& argument : verb.arguments) {
    if (!argument.usage.empty()) {
      line += " " + Italic(argument.usage);
      continue;
    }
    const auto name = Italic(argument.names) + (argument.many ? "..." : "");
    line += argument.required ? " " + name : Format(" [{}]", name);
  }
  return line + "\n";
}

// A name and what it is about, as indexes of pages show it: a sentence without its ends.
std::string Start(const std::string& name, std::string about) {
  if (about.ends_with('.')) about.pop_back();
  if (about.size() > 1 && std::islower(static_cast<unsigned char>(about[1])) != 0) {
    about[0] = static_cast<char>(std::tolower(static_cast<unsigned char>(about[0])));
  }
  return Format(".TH {} 1 \"\" \"kral {}.{}.{}\" \"kral\"\n.SH NAME\n{} \\- {}\n", Upper(Roff(name)),
                KRAL_VERSION_MAJOR, KRAL_VERSION_MINOR, KRAL_VERSION_PATCH, Roff(name), Roff(about));
}

void AddVerb(const std::string& words, const CommandText& verb, std::string& page) {
  page += Format(".SS {}\n{}\n.PP\n{}", Roff(words), Sentence(verb.help), Synopsis(words, verb));
  AddParameters(verb.arguments, page);
  AddParameters(verb.options, page);
  if (!verb.explanation.empty()) AddLines(verb.explanation, page);
  if (!verb.examples.empty()) AddLines(Joined(verb.examples, "\n"), page);
  for (const auto& below : verb.verbs) AddVerb(words + " " + below.name, below, page);
}

std::string PageOf(const CommandText& noun) {
  auto page = Start("kral-" + noun.name, noun.help);
  page += ".SH SYNOPSIS\n";
  if (!noun.needs_verb) page += Synopsis(noun.name, noun);
  for (const auto& verb : noun.verbs) {
    page += (page.ends_with("SYNOPSIS\n") ? "" : ".br\n") + Synopsis(noun.name + " " + verb.name, verb);
  }
  page += Format(".SH DESCRIPTION\n{}\n", Sentence(noun.help));
  AddParameters(noun.arguments, page);
  if (!noun.explanation.empty()) AddLines(noun.explanation, page);
  page += ".SH OPTIONS\nThose of every verb are in\n.BR kral (1).\n";
  AddParameters(noun.options, page);
  if (!noun.verbs.empty()) page += ".SH VERBS\n";
  for (const auto& verb : noun.verbs) AddVerb(noun.name + " " + verb.name, verb, page);
  if (!noun.examples.empty()) page += ".SH EXAMPLES\n";
  if (!noun.examples.empty()) AddLines(Joined(noun.examples, "\n"), page);
  return page + ".SH SEE ALSO\n.BR kral (1)\n";
}

void AddExitCodes(std::string& page) {
  page += ".SH EXIT STATUS\n";
  for (const auto& [code, name] : kExitNames) {
    std::array<char, 64> text{};
    if (code == ExitCode::kDone || KRAL_GetErrorText(static_cast<std::uint32_t>(code), text.data(), text.size()) == 0) {
      text = {};
    }
    std::string_view meaning(text.data());
    if (code == ExitCode::kDone) meaning = "all is done";
    if (code == ExitCode::kUsage) meaning = "the command line cannot be understood";
    if (code == ExitCode::kSomeFailed) meaning = "some of several handsets failed";
    page += Format(".TP\n.B {}\n{} ({})\n", static_cast<int>(code), Roff(meaning), Roff(name));
  }
}

std::string MainPage(const CommandText& program) {
  auto page = Start(program.name, program.help);
  page += Format(".SH SYNOPSIS\n{} [{}]... {} [{}] [{}]...\n.br\n{} {} [{}] [{}]\n", Bold("kral"), Italic("OPTION"),
                 Italic("NOUN"), Italic("VERB"), Italic("ARGUMENT"), Bold("kral"), Bold("help"), Italic("NOUN"),
                 Italic("VERB"));
  page += Format(".SH DESCRIPTION\n{}\n.PP\nData goes to the standard output and everything else to standard error.\n",
                 Sentence(program.help));
  page += ".SH COMMANDS\n";
  for (const auto& noun : program.verbs) page += Format(".TP\n.BR kral\\-{} (1)\n{}\n", noun.name, Sentence(noun.help));
  page += ".SH OPTIONS\nThey come before or after the verb.\n";
  AddParameters(program.options, page);
  AddExitCodes(page);
  page += Format(".SH ENVIRONMENT\n{}.SH FILES\n{}.SH SEE ALSO\n", kEnvironment, kFiles);
  for (const auto& noun : program.verbs) {
    page += Format(".BR kral\\-{} (1){}\n", noun.name, &noun == &program.verbs.back() ? "" : ",");
  }
  return page;
}

void Write(const std::string& file, const std::string& page) {
  const auto error = ReplaceWholeFile(file, {reinterpret_cast<const std::uint8_t*>(page.data()), page.size()});
  if (error) throw ToolError(ExitCode::kBadFile, Format("{} cannot be written: {}", file, error.message()), "");
}

}  // namespace

void WriteManPages(const CommandText& program, const std::string& folder) {
  Write(Format("{}/{}.1", folder, program.name), MainPage(program));
  for (const auto& noun : program.verbs) {
    Write(Format("{}/{}-{}.1", folder, program.name, noun.name), PageOf(noun));
  }
}

}  // namespace kral::tool
