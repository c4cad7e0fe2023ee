// Reads the file of settings, and knows what goes in front of it. The one file that knows the parser.
#define TOML_HEADER_ONLY 1
#define TOML_ENABLE_FORMATTERS 0
#define TOML_ENABLE_WINDOWS_COMPAT 0
#include "tools/kral/settings.h"

#include <toml++/toml.h>

#include <algorithm>
#include <cstdint>
#include <map>
#include <system_error>

#include "platform/environment.h"
#include "platform/file_util.h"
#include "platform/folder.h"
#include "tools/kral/config_folder.h"
#include "tools/kral/format.h"
#include "tools/kral/nearest_word.h"

namespace kral::tool {
namespace {

constexpr std::size_t kLargestSettings = 1 << 20;
constexpr const char* kHintOfSettings =
    "mend the line; kral help config has an example, docs/tool.md tells what it takes";

using SettingsRead = std::map<std::string, Settled, std::less<>>;

std::string PlaceIn(const std::string& file, const toml::source_region& source) {
  return Format("{}, line {}", file, source.begin.line);
}

bool IsAbsolute(std::string_view file) {
  return file.starts_with('/') || file.starts_with('\\') || (file.size() > 1 && file[1] == ':');
}

// Names of files begin where the settings are, whatever folder a verb runs in.
std::string WordOf(const toml::node& node, const Setting& setting, const std::string& file) {
  const auto number = node.value_exact<std::int64_t>();
  const bool takes_text = setting.kind != SettingKind::kNumber;
  const bool takes_number = setting.kind == SettingKind::kNumber || setting.kind == SettingKind::kWord;
  if (number && takes_number) return std::to_string(*number);
  const auto text = node.value_exact<std::string>();
  if (!text || !takes_text || text->empty()) {
    throw ToolError(ExitCode::kBadFile,
                    Format("{}: {} takes {}", PlaceIn(file, node.source()), setting.name,
                           !takes_text    ? "a number"
                           : takes_number ? "a number or a text"
                                          : "the name of a file"),
                    kHintOfSettings);
  }
  if (takes_number || IsAbsolute(*text)) return *text;
  const auto end = file.find_last_of("/\\");
  return end == std::string::npos ? *text : JoinPath(file.substr(0, end), *text);
}

Settled TakeSetting(const toml::node& node, const Setting& setting, const std::string& file) {
  Settled settled{{}, PlaceIn(file, node.source()), ExitCode::kBadFile};
  const auto* const list = node.as_array();
  if (list == nullptr || setting.kind != SettingKind::kFiles) {
    settled.words.push_back(WordOf(node, setting, file));
  } else {
    for (const auto& element : *list) settled.words.push_back(WordOf(element, setting, file));
  }
  return settled;
}

[[noreturn]] void RejectKey(const toml::key& key, const std::string& file) {
  std::vector<std::string> names;
  names.reserve(std::size(kSettings));
  for (const auto& setting : kSettings) names.emplace_back(setting.name);
  const auto near = NearestWord(std::string(key.str()), names);
  throw ToolError(ExitCode::kBadFile,
                  Format("{}: there is no setting {}{}", PlaceIn(file, key.source()), key.str(),
                         near ? Format("; did you mean {}?", *near) : ""),
                  Format("there are {}", Joined(names, ", ")));
}

SettingsRead ParseSettings(std::string_view text, const std::string& file) {
  SettingsRead settings;
  try {
    for (const auto table = toml::parse(text); const auto& [key, node] : table) {
      const auto known = std::ranges::find(kSettings, key.str(), &Setting::name);
      if (known == kSettings.end()) RejectKey(key, file);
      settings.emplace(known->name, TakeSetting(node, *known, file));
    }
  } catch (const toml::parse_error& error) {
    throw ToolError(ExitCode::kBadFile, Format("{}: {}", PlaceIn(file, error.source()), error.description()),
                    kHintOfSettings);
  }
  return settings;
}

std::optional<std::string> NamedSettings() {
  const auto named = EnvironmentValue("KRAL_CONFIG");
  return named && !named->empty() ? named : std::nullopt;
}

SettingsRead ReadSettings() {
  const auto file = SettingsFile();
  if (file.empty()) return {};
  std::vector<std::uint8_t> bytes;
  const auto error = ReadWholeFile(file, kLargestSettings, bytes);
  // Only one that was named has to be there.
  const bool is_missing = error == std::errc::no_such_file_or_directory || error == std::errc::not_a_directory;
  if (is_missing && !NamedSettings()) return {};
  if (error) {
    throw ToolError(ExitCode::kBadFile, Format("the settings {} cannot be read: {}", file, error.message()),
                    "check its permissions, or name another file in KRAL_CONFIG");
  }
  return ParseSettings({reinterpret_cast<const char*>(bytes.data()), bytes.size()}, file);
}

}  // namespace

std::string SettingsFile() {
  if (const auto named = NamedSettings()) return *named;
  try {
    return ConfigFile("config.toml");
  } catch (const ToolError&) {
    return {};
  }
}

std::optional<Settled> SettledFor(std::string_view name) {
  const auto* const setting =
      std::ranges::find_if(kSettings, [name](const Setting& known) { return name == known.name; });
  static const SettingsRead in_file = ReadSettings();
  const auto value = EnvironmentValue(setting->variable);
  if (value && !value->empty()) return Settled{{*value}, setting->variable, ExitCode::kUsage};
  const auto found = in_file.find(name);
  return found == in_file.end() ? std::nullopt : std::optional(found->second);
}

}  // namespace kral::tool
