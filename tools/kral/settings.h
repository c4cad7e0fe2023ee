// What a user has settled for all verbs: in the environment, or in config.toml of the tool's folder of settings. The
// command line goes in front of both, and the environment in front of the file.
#ifndef KRAL_TOOLS_SETTINGS_H
#define KRAL_TOOLS_SETTINGS_H

#include <array>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/exit_codes.h"

namespace kral::tool {

enum class SettingKind { kWord, kNumber, kFile, kFiles };

struct Setting {
  const char* name;      // in the file
  const char* variable;  // of the environment
  SettingKind kind;
  const char* otherwise;  // what holds where nothing is settled
};

inline constexpr std::array<Setting, 7> kSettings{{
    {"port", "KRAL_PORT", SettingKind::kWord, "the only one with a handset"},
    {"time_out", "KRAL_TIME_OUT", SettingKind::kNumber, "4000"},
    {"log", "KRAL_LOG", SettingKind::kFile, "none"},
    {"log_flags", "KRAL_LOG_FLAGS", SettingKind::kNumber, "those that the library takes"},
    {"definitions", "KRAL_DEFINITIONS", SettingKind::kFiles, "none"},
    {"types", "KRAL_TYPES", SettingKind::kFiles, "none"},
    {"commands", "KRAL_COMMANDS", SettingKind::kFiles, "none"},
}};

struct Settled {
  std::vector<std::string> words;  // as on a command line
  std::string source;              // "KRAL_PORT", "~/.config/kral/config.toml, line 3"
  ExitCode fault;                  // what a value is that cannot be used
};

// The file of settings, whether it is there or not: KRAL_CONFIG names another one. Empty where no folder is known.
std::string SettingsFile();
// What is settled; nothing for what is not. ToolError for a file that cannot be used. Read once.
std::optional<Settled> SettledFor(std::string_view name);

}  // namespace kral::tool

#endif
