// Declares the command line to the parser library, and turns its words into values itself, so that a value that cannot
// be is named with what it may be.
#include "tools/kral/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <limits>
#include <optional>
#include <string_view>
#include <type_traits>
#include <utility>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr int kAnyNumber = CLI::detail::expected_max_vector_size;
constexpr const char* kSeeHelp = "--help behind the verb tells what it takes";

[[noreturn]] void Reject(const std::string& text) {
  throw ToolError(ExitCode::kUsage, text, kSeeHelp);
}

// "1 to 3600000 ms", for the help "1-3600000 ms".
std::string TextOf(const NumberRange& range, const char* to) {
  const auto unit = *range.unit == '\0' ? std::string() : Format(" {}", range.unit);
  return Format("{:.12g}{}{:.12g}{}", range.least, to, range.most, unit);
}

template <class Number>
std::optional<Number> ParseNumber(std::string_view text) {
  const char* const end = text.data() + text.size();
  Number value{};
  std::from_chars_result parsed{};
  if constexpr (std::is_floating_point_v<Number>) {
    parsed = std::from_chars(text.data(), end, value);
  } else if (text.starts_with("0x") || text.starts_with("0X")) {
    parsed = std::from_chars(text.data() + 2, end, value, 16);
  } else {
    parsed = std::from_chars(text.data(), end, value);
  }
  if (parsed.ec != std::errc() || parsed.ptr != end) return std::nullopt;
  return value;
}

// 64-bit numbers have no range of their own to tell: a double would not hold it.
template <class Number>
constexpr bool kIsNarrow = sizeof(Number) <= 4;

template <class Number>
NumberRange RangeOf() {
  using Limits = std::numeric_limits<Number>;
  if constexpr (kIsNarrow<Number>) {
    return {static_cast<double>(Limits::lowest()), static_cast<double>(Limits::max())};
  }
  return {-std::numeric_limits<double>::infinity(), std::numeric_limits<double>::infinity()};
}

bool IsLimited(const NumberRange& range) {
  return range.most < std::numeric_limits<double>::infinity();
}

template <class Number>
Number TakeNumber(const std::string& name, const std::string& text, const NumberRange& range) {
  const auto value = ParseNumber<Number>(text);
  if (value && static_cast<double>(*value) >= range.least && static_cast<double>(*value) <= range.most) return *value;
  Reject(Format("{} takes a number{}, not '{}'", name, IsLimited(range) ? " from " + TextOf(range, " to ") : "", text));
}

// How a person names it: "--port" of "-p,--port".
std::string NameOf(std::string_view names) {
  return std::string(names.substr(names.rfind(',') + 1));
}

template <class Target>
struct NumberOf {
  using Type = Target;
  static std::string Text(Target value) { return Format("{}", value); }
};
template <class Number>
struct NumberOf<std::optional<Number>> {
  using Type = Number;
  static std::string Text(const std::optional<Number>& value) { return value ? Format("{}", *value) : ""; }
};

}  // namespace

// --- Options --------------------------------------------------------------------------------------------------------

Option& Option::Required() {
  option_->required();
  return *this;
}

Option& Option::Between(double least, double most, const char* unit) {
  *range_ = {std::max(least, range_->least), std::min(most, range_->most), unit};
  option_->type_name(TextOf(*range_, "-"));
  return *this;
}

Option& Option::OneOf(std::initializer_list<std::string> words) {
  const std::vector<std::string> list(words);
  option_->type_name(Joined(list, "|"));
  return Check([list](const std::string& text) {
    const bool known = std::find(list.begin(), list.end(), text) != list.end();
    return known ? std::string() : Format("it is {}", Joined(list, " or "));
  });
}

Option& Option::ShowDefault() {
  option_->default_str(default_text_);
  return *this;
}

Option& Option::OneEach() {
  option_->allow_extra_args(false);
  return *this;
}

Option& Option::Separated(char by) {
  option_->delimiter(by);
  return *this;
}

Option& Option::Count(int least, int most) {
  option_->expected(least, most);
  return *this;
}

Option& Option::Check(std::function<std::string(const std::string&)> fault) {
  const auto name = option_->get_name();
  option_->check([name, fault = std::move(fault)](const std::string& text) {
    const auto problem = fault(text);
    if (!problem.empty()) Reject(Format("{} cannot be '{}': {}", name, text, problem));
    return std::string();
  });
  return *this;
}

// --- Commands -------------------------------------------------------------------------------------------------------

Command Command::Noun(const std::string& name, const std::string& help) const {
  const auto noun = Verb(name, help);
  noun.app_->require_subcommand(1);
  return noun;
}

Command Command::Verb(const std::string& name, const std::string& help) const {
  auto* const verb = app_->add_subcommand(name, help);
  verb->fallthrough();
  return {*verb, *chosen_};
}

Command Command::Find(const std::string& name) const {
  return {*app_->get_subcommand(name), *chosen_};
}

Option Command::AddWords(const char* names, Sink sink, std::string_view help, std::string default_text) const {
  auto* const option = app_->add_option(
      names,
      [sink = std::move(sink)](const std::vector<std::string>& words) {
        sink(words);
        return true;
      },
      std::string(help));
  option->type_name("TEXT");
  return {option, std::move(default_text)};
}

Option Command::Add(const char* names, std::string& target, std::string_view help) const {
  return AddWords(
      names, [&target](const std::vector<std::string>& words) { target = words.front(); }, help, target);
}

Option Command::Add(const char* names, std::vector<std::string>& target, std::string_view help) const {
  auto option = AddWords(names, [&target](const std::vector<std::string>& words) { target = words; }, help, {});
  option.option_->expected(kAnyNumber);
  return option;
}

Option Command::Add(const char* names, std::vector<std::pair<std::string, std::string>>& target,
                    std::string_view help) const {
  auto option = AddWords(names,
                         [&target](const std::vector<std::string>& words) {
                           for (std::size_t i = 0; i + 1 < words.size(); i += 2)
                             target.emplace_back(words[i], words[i + 1]);
                         },
                         help, {});
  option.option_->type_size(2)->expected(kAnyNumber);
  return option;
}

template <class Number>
Option Command::AddNumbers(const char* names, std::string_view help, std::function<void(Number)> set,
                           std::string now) const {
  const auto range = std::make_shared<NumberRange>(RangeOf<Number>());
  auto option = AddWords(
      names,
      [name = NameOf(names), range, set = std::move(set)](const std::vector<std::string>& words) {
        for (const auto& word : words) set(TakeNumber<Number>(name, word, *range));
      },
      help, std::move(now));
  option.range_ = range;
  option.option_->type_name("NUMBER");
  return option;
}

template <class Target>
Option Command::Add(const char* names, Target& target, std::string_view help) const {
  using Number = typename NumberOf<Target>::Type;
  return AddNumbers<Number>(
      names, help, [&target](Number value) { target = value; }, NumberOf<Target>::Text(target));
}

template Option Command::Add(const char*, std::uint8_t&, std::string_view) const;
template Option Command::Add(const char*, std::uint16_t&, std::string_view) const;
template Option Command::Add(const char*, std::uint32_t&, std::string_view) const;
template Option Command::Add(const char*, std::uint64_t&, std::string_view) const;
template Option Command::Add(const char*, std::int32_t&, std::string_view) const;
template Option Command::Add(const char*, double&, std::string_view) const;
template Option Command::Add(const char*, std::optional<std::uint8_t>&, std::string_view) const;
template Option Command::Add(const char*, std::optional<std::uint16_t>&, std::string_view) const;
template Option Command::Add(const char*, std::optional<std::uint32_t>&, std::string_view) const;

Option Command::Add(const char* names, std::vector<std::uint16_t>& target, std::string_view help) const {
  auto option = AddNumbers<std::uint16_t>(names, help, [&target](std::uint16_t value) { target.push_back(value); }, {});
  option.option_->expected(kAnyNumber);
  return option;
}

void Command::Flag(const char* names, bool& target, std::string_view help) const {
  app_->add_flag(names, target, std::string(help));
}

void Command::Flag(const char* names, std::function<void()> given, std::string_view help) const {
  app_->add_flag_callback(names, std::move(given), std::string(help));
}

void Command::Run(std::function<void()> act) const {
  app_->callback([chosen = chosen_, act = std::move(act)] { *chosen = act; });
}

void Command::Explain(std::function<std::string()> text) const {
  app_->footer(std::move(text));
}

// --- The whole ------------------------------------------------------------------------------------------------------

struct CommandLine::Parser {
  Parser(const std::string& program, const std::string& description) : app(description, program) {}

  CLI::App app;
  std::function<void()> chosen;
};

CommandLine::CommandLine(const std::string& program, const std::string& description,
                         std::function<std::string()> version)
    : parser_(std::make_unique<Parser>(program, description)) {
  parser_->app.set_version_flag("--version", std::move(version));
  parser_->app.require_subcommand(1);
}

CommandLine::~CommandLine() = default;

Command CommandLine::root() {
  return {parser_->app, parser_->chosen};
}

std::function<void()> CommandLine::Parse(std::vector<std::string> arguments) {
  parser_->chosen = {};
  try {
    std::reverse(arguments.begin(), arguments.end());  // as the parser wants them
    parser_->app.parse(std::move(arguments));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) {  // --help, --version
      parser_->app.exit(error);
      return {};
    }
    throw ToolError(ExitCode::kUsage, error.what(), "kral --help lists the verbs and options");
  }
  return parser_->chosen;
}

}  // namespace kral::tool
