// kral config: what is settled for all verbs, and where.
#include "tools/kral/format.h"
#include "tools/kral/settings.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

// Of the settings that are options of every verb.
const char* OptionOf(std::string_view name) {
  if (name == "port") return "--port";
  if (name == "time_out") return "--time-out";
  if (name == "log") return "--log";
  return name == "log_flags" ? "--log-flags" : nullptr;
}

struct Held {
  std::vector<std::string> words;  // empty: nothing is settled
  std::string source;
};

Held WhatHolds(const Command& root, const Setting& setting, bool is_overruled) {
  if (const auto* const option = OptionOf(setting.name)) {
    if (auto words = root.Given(option); !words.empty()) return {std::move(words), "the command line"};
  }
  if (is_overruled) return {{"all"}, "the command line"};
  if (auto settled = SettledFor(setting.name)) return {std::move(settled->words), std::move(settled->source)};
  return {{}, "default"};
}

Json WordsJson(const std::vector<std::string>& words, SettingKind kind) {
  if (kind != SettingKind::kFiles) return words.empty() ? Json() : Json(words.front());
  Json list = Json::array();
  for (const auto& word : words) list.push_back(word);
  return list;
}

void ShowSettings(const Command& root, const Context& context) {
  const auto file = SettingsFile();
  Json rows = Json::array();
  std::string text;
  for (const auto& setting : kSettings) {
    const bool is_overruled = context.all && setting.name == std::string_view("port");
    const auto held = WhatHolds(root, setting, is_overruled);
    rows.push_back({{"name", setting.name},
                    {"value", WordsJson(held.words, setting.kind)},
                    {"source", held.source},
                    {"variable", setting.variable}});
    text += Format("{:<12} {:<30} {}\n", setting.name,
                   held.words.empty() ? setting.otherwise : Joined(held.words, ", "), held.source);
  }
  context.out.Result({{"file", file}, {"settings", rows}}, text);
}

std::string ExampleFile() {
  return Format(
      "The file is {}; KRAL_CONFIG names another one. For example:\n"
      "  port = \"slot:3\"                 # or KRAL_PORT\n"
      "  time_out = 8000                 # ms, or KRAL_TIME_OUT\n"
      "  log = \"/tmp/kral.log\"           # or KRAL_LOG\n"
      "  log_flags = 0x421F              # or KRAL_LOG_FLAGS\n"
      "  definitions = [\"nv_items.xml\"]  # --defs of the nv verbs, or KRAL_DEFINITIONS\n"
      "  types = [\"nv_types.xml\"]        # --types of the nv verbs, or KRAL_TYPES\n"
      "  commands = [\"wlan.xml\"]         # --defs of the cmd verbs, or KRAL_COMMANDS\n",
      SettingsFile());
}

}  // namespace

void AddConfigVerbs(const Command& root, Context& context) {
  const auto config =
      root.Verb("config", "Print what is settled for all verbs, and where: file, environment or command line");
  config.AsksNobody();
  config.TakesPorts();
  config.Explain(ExampleFile);
  config.Run([&context, root] { ShowSettings(root, context); });
}

}  // namespace kral::tool
