// Asks the file system, because two names say little.
#include "tools/kral/one_file.h"

#include <filesystem>
#include <system_error>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {

bool IsOneFile(const std::string& one, const std::string& other) {
  namespace fs = std::filesystem;
  const auto path = [](const std::string& name) { return fs::absolute(std::u8string(name.begin(), name.end())); };
  std::error_code error;
  if (fs::equivalent(path(one), path(other), error)) return true;
  std::error_code other_error;
  const auto whole = fs::weakly_canonical(path(one), error);
  return whole == fs::weakly_canonical(path(other), other_error) && !error && !other_error;
}

void RefuseSource(const std::string& source, const std::string& target, const char* option) {
  if (target.empty() || !IsOneFile(source, target)) return;
  throw ToolError(ExitCode::kUsage, Format("{} {} would replace what is read", option, target),
                  Format("name another file than {}", source));
}

}  // namespace kral::tool
