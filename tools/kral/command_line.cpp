// Declares the command line to the parser library, and turns its words into values itself, so that a value that cannot
// be is named with what it may be.
#include "tools/kral/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <iostream>
#include <limits>
#include <map>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <type_traits>
#include <utility>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/json.h"
#include "tools/kral/man_pages.h"
#include "tools/kral/nearest_word.h"
#include "tools/kral/numbers.h"
#include "tools/kral/output.h"
#include "tools/kral/settings.h"

namespace kral::tool {

struct Chosen {
  std::function<void()> act;
  const CLI::App* verb = nullptr;
  std::set<const CLI::App*> for_many;
  std::set<const CLI::App*> takes_ports;
  std::map<const CLI::App*, Command::InDownload> in_download;
  std::map<const CLI::App*, std::function<std::vector<std::string>()>> writes;
  std::map<const CLI::App*, std::function<std::vector<std::string>()>> reads;
  std::map<const CLI::App*, std::function<void()>> checks;
  std::map<const CLI::App*, std::function<bool()>> without_handset;
  std::map<const CLI::App*, std::function<bool()>> asks_nobody;
  struct SettledOption {
    const CLI::App* app;
    CLI::Option* option;
    const char* name;
    const CLI::Option* unless;
    bool in_use = false;  // for the latest command line
  };
  std::vector<SettledOption> settled;
  Names names;
  std::set<std::string> asked;
  std::vector<std::string> words;
  std::map<const CLI::Option*, Suggest> suggestions;
  std::map<const CLI::Option*, const char*> usages;
};

namespace {

constexpr int kAnyNumber = CLI::detail::expected_max_vector_size;

[[noreturn]] void Reject(const std::string& text) {
  throw ToolError(ExitCode::kUsage, text, "--help behind the verb tells what it takes");
}

// "1 to 3600000 ms", for the help "1-3600000 ms".
std::string TextOf(const NumberRange& range, const char* to) {
  const auto unit = *range.unit == '\0' ? std::string() : Format(" {}", range.unit);
  return Format("{:.12g}{}{:.12g}{}", range.least, to, range.most, unit);
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

// --- Names of files -------------------------------------------------------------------------------------------------

constexpr std::array kPlaceholders{"port", "serial", "model", "slot"};

// Everything else in braces is a name like any other.
std::string Expanded(std::string text, Chosen& chosen) {
  for (const std::string name : kPlaceholders) {
    const auto braced = "{" + name + "}";
    for (auto at = text.find(braced); at != std::string::npos; at = text.find(braced, at)) {
      chosen.asked.insert(name);
      const auto known = chosen.names.find(name);
      if (known == chosen.names.end()) break;
      text.replace(at, braced.size(), known->second);
      at += known->second.size();
    }
  }
  return text;
}

std::vector<std::string> Expanded(std::vector<std::string> words, Chosen& chosen) {
  for (auto& word : words) word = Expanded(word, chosen);
  return words;
}

// --- Words that lead nowhere ----------------------------------------------------------------------------------------

// "kral nv read"
std::string TitleOf(const CLI::App& app) {
  const auto* const parent = app.get_parent();
  return parent == nullptr ? app.get_name() : Format("{} {}", TitleOf(*parent), app.get_name());
}

std::vector<std::string> VerbsOf(const CLI::App& app) {
  std::vector<std::string> names;
  for (const auto* verb : app.get_subcommands([](const CLI::App*) { return true; })) names.push_back(verb->get_name());
  return names;
}

bool NeedsVerb(const CLI::App& app) {
  return app.get_require_subcommand_min() > 0;
}

std::vector<std::string> OptionsOf(const CLI::App* app) {
  std::vector<std::string> names;
  for (; app != nullptr; app = app->get_parent()) {
    for (const auto* option : app->get_options()) {
      if (option->nonpositional()) names.push_back(option->get_name());
    }
  }
  return names;
}

const CLI::Option* FindOption(const CLI::App* app, const std::string& name) {
  const CLI::Option* option = nullptr;
  for (; app != nullptr && option == nullptr; app = app->get_parent()) option = app->get_option_no_throw(name);
  return option;
}

// The noun or verb that words lead to, and the first word that leads nowhere.
struct Place {
  CLI::App* app;
  std::string unknown;
};

Place Follow(CLI::App& root, const std::vector<std::string>& words) {
  Place place{&root, {}};
  for (std::size_t i = 0; i < words.size() && words[i] != "--"; ++i) {
    const auto& word = words[i];
    if (word.size() > 1 && word.front() == '-') {
      const bool is_long = word.starts_with("--");
      const auto name = is_long ? word.substr(0, word.find('=')) : word.substr(0, 2);
      const auto* const option = FindOption(place.app, name);
      if (option == nullptr) return {place.app, name};
      if (name.size() == word.size()) i += static_cast<std::size_t>(option->get_items_expected_min());
    } else if (!VerbsOf(*place.app).empty()) {
      const auto found = place.app->get_subcommands([&word](const CLI::App* verb) { return verb->check_name(word); });
      if (found.empty()) return {place.app, word};
      place.app = found.front();
    }
  }
  return place;
}

std::string DescribeUnknown(const Place& place) {
  const auto& word = place.unknown;
  const auto title = TitleOf(*place.app);
  if (word.front() == '-') {
    const auto nearest = NearestWord(word, OptionsOf(place.app));
    return Format("{} has no option {}{}", title, word, nearest ? Format("; did you mean {}?", *nearest) : "");
  }
  const auto nearest = NearestWord(word, VerbsOf(*place.app));
  const auto noun = place.app->get_parent() == nullptr ? std::string() : place.app->get_name() + " ";
  return Format("there is no verb {}{}{}", noun, word, nearest ? Format("; did you mean {}{}?", noun, *nearest) : "");
}

// An option with too few or too many values; the parser names it in front of a colon.
std::string DescribeCount(const CLI::App& app, std::string_view problem) {
  const std::string name(problem.substr(0, problem.find(':')));
  const auto* const option = FindOption(&app, name);
  const auto least = option == nullptr ? 1 : option->get_items_expected_min();
  if (option != nullptr && static_cast<int>(option->count()) > least) return name + " is given too often";
  return Format("{} needs {}", name, least > 1 ? Counted(static_cast<std::uint64_t>(least), "value") : "a value");
}

// What was wrong with a command line that the parser did not take.
ToolError Explain(CLI::App& root, const std::vector<std::string>& words, const CLI::ParseError& error) {
  const auto place = Follow(root, words);
  const auto title = TitleOf(*place.app);
  const auto hint = Format("{} --help tells what it takes", title);
  if (!place.unknown.empty()) return {ExitCode::kUsage, DescribeUnknown(place), hint};
  if (const auto verbs = VerbsOf(*place.app); !verbs.empty() && NeedsVerb(*place.app)) {
    return {ExitCode::kUsage, Format("{} needs a verb: {}", title, Joined(verbs, ", ")), hint};
  }
  if (const auto rest = root.remaining(true); !rest.empty()) {
    return {ExitCode::kUsage, Format("{} takes no '{}'", title, rest.front()), hint};
  }
  const bool is_count = dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr;
  const auto problem = is_count ? DescribeCount(*place.app, error.what()) : std::string(error.what());
  return {ExitCode::kUsage, Format("{}: {}", title, problem), hint};
}

// --- What is settled elsewhere --------------------------------------------------------------------------------------

using SometimesSo = std::map<const CLI::App*, std::function<bool()>>;

bool IsSo(const SometimesSo& verbs, const CLI::App* verb) {
  const auto found = verbs.find(verb);
  return found != verbs.end() && (!found->second || found->second());
}

// The options of the root are about handsets, those of a verb are its own.
bool IsForVerb(const Chosen& chosen, const Chosen::SettledOption& settled) {
  const bool is_common = settled.app->get_parent() == nullptr;
  if (is_common ? IsSo(chosen.without_handset, chosen.verb) : settled.app != chosen.verb) return false;
  return settled.option->count() == 0 && (settled.unless == nullptr || settled.unless->count() == 0);
}

// As if its words were on the command line; a fault names where they are.
void TakeSettled(Chosen& chosen) {
  for (auto& settled : chosen.settled) {
    // Verbs for which nothing can be settled do not mind a file that is wrong, help above all.
    const auto value = IsForVerb(chosen, settled) ? SettledFor(settled.name) : std::nullopt;
    settled.in_use = value.has_value();
    if (!value) continue;
    try {
      settled.option->add_result(value->words);
      settled.option->run_callback();
    } catch (const ToolError& error) {
      throw ToolError(value->fault, Format("{}: {}", value->source, error.what()), error.hint());
    }
  }
}

// --- Lines that are being typed -------------------------------------------------------------------------------------

// Where the last word stands: a noun or verb, or the value of an option or argument.
struct Cursor {
  CLI::App* app;
  const CLI::Option* option = nullptr;
};

const CLI::Option* ArgumentAt(const CLI::App& app, std::size_t number) {
  for (const auto* option : app.get_options()) {
    if (!option->get_positional()) continue;
    const auto most = static_cast<std::size_t>(option->get_items_expected_max());
    if (number < most) return option;
    number -= most;
  }
  return nullptr;
}

Cursor CursorOf(CLI::App& root, const std::vector<std::string>& words) {
  Cursor cursor{&root};
  const CLI::Option* option = nullptr;
  int values = 0;
  std::size_t arguments = 0;
  bool only_arguments = false;
  for (std::size_t i = 0; i + 1 < words.size(); ++i) {
    const auto& word = words[i];
    if (values > 0) {
      --values;
    } else if (!only_arguments && word == "--") {
      only_arguments = true;
    } else if (!only_arguments && word.size() > 1 && word.front() == '-') {
      option = FindOption(cursor.app, word);
      values = option == nullptr ? 0 : option->get_items_expected_min();
    } else if (!VerbsOf(*cursor.app).empty()) {
      const auto found = cursor.app->get_subcommands([&word](const CLI::App* verb) { return verb->check_name(word); });
      if (found.empty()) continue;
      cursor.app = found.front();
    } else {
      ++arguments;
    }
  }
  if (values > 0) {
    cursor.option = option;
  } else if (VerbsOf(*cursor.app).empty()) {
    cursor.option = ArgumentAt(*cursor.app, arguments);
  }
  return cursor;
}

// What a verb has in common with those above it is its own.
std::vector<Completion> OptionsAt(const CLI::App* app) {
  std::vector<Completion> found;
  std::set<std::string> names;
  for (; app != nullptr; app = app->get_parent()) {
    for (const auto* option : app->get_options()) {
      if (!option->nonpositional() || !names.insert(option->get_name()).second) continue;
      found.push_back({option->get_name(), option->get_description()});
    }
  }
  return found;
}

// --- As text --------------------------------------------------------------------------------------------------------

using Examples = std::map<const CLI::App*, std::vector<std::string>>;

std::string FooterOf(const std::vector<std::string>& examples) {
  return examples.empty() ? "" : Format("Examples:\n  {}\n", Joined(examples, "\n  "));
}

// The help of the parser library, but for arguments: "paths..." however many these are, or as their verb puts them.
class HelpFormat : public CLI::Formatter {
 public:
  explicit HelpFormat(const std::map<const CLI::Option*, const char*>& usages) : usages_(usages) {}

  std::string make_option_usage(const CLI::Option* option) const override {
    if (const auto found = usages_.find(option); found != usages_.end()) return found->second;
    const auto name = option->get_name(true) + (option->get_items_expected_max() > 1 ? "..." : "");
    return option->get_required() ? name : Format("[{}]", name);
  }

  std::string make_option_name(const CLI::Option* option, bool is_argument) const override {
    const auto found = usages_.find(option);
    return found == usages_.end() ? Formatter::make_option_name(option, is_argument) : found->second;
  }

  std::string make_option_opts(const CLI::Option* option) const override {
    return usages_.count(option) != 0 ? std::string() : Formatter::make_option_opts(option);
  }

 private:
  const std::map<const CLI::Option*, const char*>& usages_;
};

ParameterText TextOf(const CLI::Option& option, const Chosen& chosen) {
  const bool has_value = option.get_items_expected_max() > 0;
  const auto& standard = option.get_default_str();
  return {option.get_name(option.get_positional(), true),
          has_value ? option.get_type_name() + (standard.empty() ? "" : "=" + standard) : "",
          option.get_description(),
          option.get_required(),
          option.get_items_expected_max() > 1,
          chosen.usages.count(&option) == 0 ? "" : chosen.usages.at(&option)};
}

CommandText TextOf(const CLI::App& app, const Chosen& chosen, const Examples& examples) {
  CommandText text{app.get_name(), app.get_description(), NeedsVerb(app), {}, {}, app.get_footer(), {}, {}};
  if (const auto found = examples.find(&app); found != examples.end()) {
    text.examples = found->second;
    text.explanation.resize(text.explanation.size() - FooterOf(text.examples).size());
  }
  for (const auto* option : app.get_options()) {
    if (option == app.get_help_ptr() && app.get_parent() != nullptr) continue;  // the same everywhere
    (option->nonpositional() ? text.options : text.arguments).push_back(TextOf(*option, chosen));
  }
  for (const auto* verb : app.get_subcommands([](const CLI::App*) { return true; })) {
    text.verbs.push_back(TextOf(*verb, chosen, examples));
  }
  return text;
}

Json JsonOf(const std::vector<ParameterText>& parameters) {
  Json list = Json::array();
  for (const auto& each : parameters) {
    list.push_back({{"names", each.names},
                    {"values", each.values},
                    {"help", each.help},
                    {"required", each.required},
                    {"many", each.many}});
    if (!each.usage.empty()) list.back()["usage"] = each.usage;
  }
  return list;
}

Json JsonOf(const CommandText& command) {
  Json verbs = Json::array();
  for (const auto& verb : command.verbs) verbs.push_back(JsonOf(verb));
  Json examples = Json::array();
  for (const auto& example : command.examples) examples.push_back(example);
  return {{"name", command.name},
          {"help", command.help},
          {"arguments", JsonOf(command.arguments)},
          {"options", JsonOf(command.options)},
          {"explanation", command.explanation},
          {"examples", examples},
          {"verbs", verbs}};
}

// As text, or with --json as one object.
void PrintHelp(CLI::App& root, const std::vector<std::string>& words, const Chosen& chosen, const Examples& examples) {
  const auto place = Follow(root, words);
  if (!place.unknown.empty()) throw ToolError(ExitCode::kUsage, DescribeUnknown(place), "kral help lists the verbs");
  const auto title = TitleOf(*place.app);
  const auto* const json = FindOption(&root, "--json");
  if (json != nullptr && json->count() != 0) {
    Json object{{"ok", true}, {"schema", kSchema}, {"verb", title}};
    object.update(JsonOf(TextOf(*place.app, chosen, examples)));
    std::cout << object.dump() << "\n";
    return;
  }
  // Its own help() would be that of the verb in use, which may be "help".
  std::cout << place.app->get_formatter()->make_help(place.app, title, CLI::AppFormatMode::Normal);
}

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
  Suggests([list](const std::vector<std::string>&) {
    std::vector<Completion> found;
    found.reserve(list.size());
    for (const auto& word : list) found.push_back({word, ""});
    return found;
  });
  return Check([list](const std::string& text) {
    const bool known = std::ranges::find(list, text) != list.end();
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

Option& Option::Usage(const char* words) {
  chosen_->usages[option_] = words;
  return *this;
}

Option& Option::File() {
  *is_file_ = true;
  return *this;
}

Option& Option::Settled(const char* name, const char* unless) {
  chosen_->settled.push_back({app_, option_, name, unless == nullptr ? nullptr : app_->get_option(unless)});
  return *this;
}

Option& Option::Suggests(Suggest suggest) {
  chosen_->suggestions[option_] = std::move(suggest);
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
  const auto is_file = std::make_shared<bool>(false);
  auto* const option = app_->add_option(
      names,
      [sink = std::move(sink), is_file, chosen = chosen_,
       is_common = app_->get_parent() == nullptr](const std::vector<std::string>& words) {
        const auto taken = *is_file ? Expanded(words, *chosen) : words;
        if (!is_common) chosen->words.insert(chosen->words.end(), taken.begin(), taken.end());
        sink(taken);
        return true;
      },
      std::string(help));
  option->type_name("TEXT");
  return {app_, chosen_, option, std::move(default_text), is_file};
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
                           const std::string& now) const {
  const auto range = std::make_shared<NumberRange>(RangeOf<Number>());
  auto option = AddWords(
      names,
      [name = NameOf(names), range, set = std::move(set)](const std::vector<std::string>& words) {
        for (const auto& word : words) set(TakeNumber<Number>(name, word, *range));
      },
      help, now);
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
template Option Command::Add(const char*, std::optional<double>&, std::string_view) const;
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
  app_->callback([chosen = chosen_, app = app_, act = std::move(act)] {
    if (!app->get_subcommands().empty()) return;  // one of its own verbs was given
    chosen->act = act;
    chosen->verb = app;
  });
}

void Command::ForMany() const {
  chosen_->for_many.insert(app_);
}

void Command::ForMany(InDownload who) const {
  ForMany();
  chosen_->in_download.emplace(app_, who);
}

void Command::TakesPorts() const {
  chosen_->takes_ports.insert(app_);
}

void Command::NeedsNoHandset(std::function<bool()> is_so) const {
  chosen_->without_handset[app_] = std::move(is_so);
}

void Command::AsksNobody(std::function<bool()> is_so) const {
  chosen_->asks_nobody[app_] = std::move(is_so);
}

std::vector<std::string> Command::Given(const char* option) const {
  const auto* const found = app_->get_option(option);
  const auto is_settled = [found](const Chosen::SettledOption& settled) {
    return settled.option == found && settled.in_use;
  };
  if (std::ranges::any_of(chosen_->settled, is_settled)) return {};
  return found->results();
}

void Command::Checks(std::function<void()> check) const {
  chosen_->checks[app_] = std::move(check);
}

void Command::Reads(std::function<std::vector<std::string>()> files) const {
  chosen_->reads[app_] = std::move(files);
}

void Command::Writes(std::function<std::vector<std::string>()> files) const {
  chosen_->writes[app_] = std::move(files);
}

void Command::Explain(std::function<std::string()> text) const {
  app_->footer(std::move(text));
}

// --- The whole ------------------------------------------------------------------------------------------------------

struct CommandLine::Parser {
  Parser(const std::string& program, const std::string& description) : app(description, program) {
    app.formatter(std::make_shared<HelpFormat>(chosen.usages));
  }

  Chosen chosen;
  CLI::App app;
  Examples examples;
};

CommandLine::CommandLine(const std::string& program, const std::string& description,
                         std::function<std::string()> version)
    : parser_(std::make_unique<Parser>(program, description)) {
  parser_->app.set_version_flag("--version", std::move(version));
  parser_->app.require_subcommand(1);
  const auto words = std::make_shared<std::vector<std::string>>();
  const auto man = std::make_shared<std::string>();
  const auto help = root().Verb("help", "Print the help of a verb");
  help.NeedsNoHandset();
  help.Add("verb", *words, "Noun and verb").Suggests([parser = parser_.get()](const std::vector<std::string>& line) {
    const auto place = Follow(parser->app, {line.begin() + 1, line.end() - 1});
    std::vector<Completion> found;
    for (const auto& verb : VerbsOf(*place.app)) found.push_back({verb, ""});
    return found;
  });
  help.Add("--man", *man, "Write manual pages of the same text into this folder");
  help.Run([parser = parser_.get(), words, man] {
    if (man->empty()) return PrintHelp(parser->app, *words, parser->chosen, parser->examples);
    WriteManPages(TextOf(parser->app, parser->chosen, parser->examples), *man);
  });
}

CommandLine::~CommandLine() = default;

Command CommandLine::root() {
  return {parser_->app, parser_->chosen};
}

void CommandLine::Example(const std::string& words) {
  auto list = CLI::detail::split(words, ' ');
  list.erase(list.begin());
  const auto place = Follow(parser_->app, list);
  if (!place.unknown.empty() || NeedsVerb(*place.app)) throw std::logic_error("no example: " + words);
  auto& examples = parser_->examples[place.app];
  examples.push_back(words);
  place.app->footer(FooterOf(examples));
}

std::function<void()> CommandLine::Parse(const std::vector<std::string>& arguments) {
  parser_->chosen.act = {};
  parser_->chosen.words.clear();
  try {
    // The parser wants them from the last to the first.
    parser_->app.parse(std::vector<std::string>(arguments.rbegin(), arguments.rend()));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) throw Explain(parser_->app, arguments, error);
    if (dynamic_cast<const CLI::CallForHelp*>(&error) != nullptr) {
      PrintHelp(parser_->app, arguments, parser_->chosen, parser_->examples);
    } else {
      parser_->app.exit(error);  // --version
    }
    return {};
  }
  if (parser_->chosen.act) TakeSettled(parser_->chosen);
  return parser_->chosen.act;
}

Completions CommandLine::Complete(const std::vector<std::string>& words) {
  const auto last = words.empty() ? std::string() : words.back();
  auto cursor = CursorOf(parser_->app, words);
  const bool is_option = last.starts_with("-") && (cursor.option == nullptr || cursor.option->get_positional());
  const auto equals = is_option ? last.find('=') : std::string::npos;
  const auto front = equals == std::string::npos ? std::string() : last.substr(0, equals + 1);
  if (!front.empty()) cursor.option = FindOption(cursor.app, last.substr(0, equals));
  Completions all;
  if (is_option && front.empty()) {
    all.words = OptionsAt(cursor.app);
  } else if (cursor.option != nullptr) {
    const auto found = parser_->chosen.suggestions.find(cursor.option);
    const bool is_known = found != parser_->chosen.suggestions.end();
    if (is_known) {
      auto typed = words;
      typed.back().erase(0, front.size());
      all.words = found->second(typed);
    }
    all.files = !is_known && cursor.option->get_type_name() == "TEXT";
  } else {
    for (const auto* verb : cursor.app->get_subcommands([](const CLI::App*) { return true; })) {
      all.words.push_back({verb->get_name(), verb->get_description()});
    }
  }
  for (auto& each : all.words) each.word.insert(0, front);
  std::erase_if(all.words, [&last](const Completion& each) { return !each.word.starts_with(last); });
  return all;
}

void CommandLine::SetNames(Names names) {
  parser_->chosen.names = std::move(names);
}

std::string CommandLine::verb() const {
  const auto* const verb = parser_->chosen.verb;
  return verb == nullptr ? std::string() : TitleOf(*verb).substr(parser_->app.get_name().size() + 1);
}

bool CommandLine::for_many() const {
  return parser_->chosen.for_many.count(parser_->chosen.verb) != 0;
}

bool CommandLine::takes_ports() const {
  return parser_->chosen.takes_ports.count(parser_->chosen.verb) != 0;
}

bool CommandLine::asks_nobody() const {
  return IsSo(parser_->chosen.asks_nobody, parser_->chosen.verb);
}

bool CommandLine::needs_no_handset() const {
  return IsSo(parser_->chosen.without_handset, parser_->chosen.verb);
}

bool CommandLine::asks_identity() const {
  return parser_->chosen.in_download.count(parser_->chosen.verb) == 0;
}

bool CommandLine::may_ask_all() const {
  const auto found = parser_->chosen.in_download.find(parser_->chosen.verb);
  return found == parser_->chosen.in_download.end() || found->second != Command::InDownload::kBootLoader;
}

const std::vector<std::string>& CommandLine::words() const {
  return parser_->chosen.words;
}

void CommandLine::Check() const {
  const auto& chosen = parser_->chosen;
  if (const auto found = chosen.checks.find(chosen.verb); found != chosen.checks.end()) found->second();
}

std::vector<std::string> CommandLine::Read() const {
  const auto found = parser_->chosen.reads.find(parser_->chosen.verb);
  return found == parser_->chosen.reads.end() ? std::vector<std::string>() : found->second();
}

std::vector<std::string> CommandLine::Written() const {
  const auto found = parser_->chosen.writes.find(parser_->chosen.verb);
  return found == parser_->chosen.writes.end() ? std::vector<std::string>() : found->second();
}

const std::set<std::string>& CommandLine::asked() const {
  return parser_->chosen.asked;
}

}  // namespace kral::tool
