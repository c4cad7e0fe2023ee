// Reads the lines of name=value that a backup begins with.
#include "tools/kral/nv/pkv_origin.h"

#include <algorithm>
#include <string_view>

#include "platform/compound_file.h"
#include "tools/kral/output.h"

namespace kral::tool {
namespace {

std::string ValueOf(std::string_view text, std::string_view name) {
  while (!text.empty()) {
    auto line = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(text.size(), line.size() + 1));
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (line.size() > name.size() && line.starts_with(name) && line[name.size()] == '=') {
      return Printable(line.substr(name.size() + 1));
    }
  }
  return {};
}

}  // namespace

PkvOrigin OriginOf(const std::string& file) {
  CompoundStorage root;
  if (!LoadCompoundFile(file, root).empty()) return {};
  const auto* const configuration = root.FindStorage("Default_Phone_Configuration");
  const auto* const stream = (configuration != nullptr ? *configuration : root).FindStream("Mobile_Property_Info");
  if (stream == nullptr) return {};
  const std::string_view text(reinterpret_cast<const char*>(stream->bytes.data()), stream->bytes.size());
  return {ValueOf(text, "Model"), ValueOf(text, "ESN")};
}

}  // namespace kral::tool
