// Finds the folder by the environment, as other programs do.
#include "tools/kral/config_folder.h"

#include "platform/environment.h"
#include "platform/folder.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {

std::string ConfigFile(const std::string& name) {
  for (const auto& [variable, folder] :
       {std::pair{"XDG_CONFIG_HOME", ""}, std::pair{"APPDATA", ""}, std::pair{"HOME", ".config"}}) {
    const auto value = EnvironmentValue(variable);
    if (!value || value->empty()) continue;
    const auto base = *folder == '\0' ? *value : JoinPath(*value, folder);
    return JoinPath(JoinPath(base, "kral"), name);
  }
  throw ToolError(ExitCode::kBadFile, Format("there is no folder for {}", name), "set XDG_CONFIG_HOME or HOME");
}

void MakeFoldersOf(const std::string& file) {
  for (auto at = file.find('/', 1); at != std::string::npos; at = file.find('/', at + 1)) {
    const auto folder = file.substr(0, at);
    if (LookAt(folder).kind == LocalKind::kFolder) continue;
    if (const auto error = MakeFolder(folder)) {
      throw ToolError(ExitCode::kBadFile, Format("the folder {} cannot be made: {}", folder, error.message()),
                      "check its permissions");
    }
  }
}

}  // namespace kral::tool
