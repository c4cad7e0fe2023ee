// COM numbers on Linux: names given by the user first, then the tty devices of the system by fixed ranges.
#include "platform/port_list.h"

#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <optional>
#include <set>
#include <string_view>

#include "platform/posix/port_sources.h"
#include "platform/posix/system_files.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

constexpr int kLastComNumber = 255;

// Places of a number's names: its variable, the link folders from 1 on, the system's tty.
constexpr uint32_t kVariablePlace = 0;
constexpr uint32_t kFirstLinkPlace = 1;
constexpr uint32_t kTtyPlace = UINT32_MAX - 1;

struct TtyRange {
  std::string_view prefix;
  int first;  // COM number of device 0
  int last;
};
constexpr std::array<TtyRange, 3> kTtyRanges = {{{"ttyS", 1, 64}, {"ttyUSB", 65, 128}, {"ttyACM", 129, 255}}};

// A decimal number written the one way that std::to_string writes it.
std::optional<int> Decimal(std::string_view text) {
  const auto value = NumberIn<int>(text);
  return value && std::to_string(*value) == text ? value : std::nullopt;
}

std::optional<int> NumberAfter(std::string_view prefix, std::string_view text) {
  if (!text.starts_with(prefix)) return std::nullopt;
  return Decimal(text.substr(prefix.size()));
}

bool IsComNumber(const std::optional<int>& number) {
  return number && *number >= 1 && *number <= kLastComNumber;
}

std::optional<int> ComNumberOfTty(std::string_view name) {
  for (const TtyRange& range : kTtyRanges) {
    const auto index = NumberAfter(range.prefix, name);
    if (index && *index >= 0 && *index <= range.last - range.first) return range.first + *index;
  }
  return std::nullopt;
}

// A tty with hardware behind it. The kernel keeps serial entries for chips that are not there, as type 0 (unknown).
bool HasHardware(const fs::path& tty) {
  if (!Exists(tty / "device")) return false;
  if (!tty.filename().string().starts_with("ttyS")) return true;
  return NumberIn<int>(FirstLineOf(tty / "type")).value_or(0) != 0;
}

std::string Variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? std::string() : std::string(value);
}

std::vector<fs::path> LinkFolders() {
  if (const auto chosen = Variable("KRAL_PORT_DIR"); !chosen.empty()) return {chosen};
  std::vector<fs::path> folders;
  const auto config = Variable("XDG_CONFIG_HOME");
  const auto home = Variable("HOME");
  if (!config.empty()) {
    folders.push_back(fs::path(config) / "kral" / "ports");
  } else if (!home.empty()) {
    folders.push_back(fs::path(home) / ".config" / "kral" / "ports");
  }
  folders.emplace_back("/etc/kral/ports");
  return folders;
}

}  // namespace

PortSources CurrentPortSources() {
  PortSources sources;
  for (char** entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
    const std::string_view text(*entry);
    const size_t equals = text.find('=');
    if (equals == std::string_view::npos || equals + 1 == text.size()) continue;
    const auto number = NumberAfter("KRAL_COM", text.substr(0, equals));
    if (IsComNumber(number)) sources.variables.emplace(*number, text.substr(equals + 1));
  }
  sources.link_folders = LinkFolders();
  sources.tty_class = "/sys/class/tty";
  sources.processes = "/proc";
  return sources;
}

bool ListComPorts(const PortSources& sources, std::vector<uint16_t>& ports) {
  std::set<int> found;
  for (const auto& [number, device] : sources.variables) found.insert(number);
  for (const fs::path& folder : sources.link_folders) {
    for (const std::string& name : NamesIn(folder).value_or(std::vector<std::string>())) {
      if (const auto number = NumberAfter("com", name); IsComNumber(number)) found.insert(*number);
    }
  }
  const auto ttys = NamesIn(sources.tty_class);
  for (const std::string& name : ttys.value_or(std::vector<std::string>())) {
    const auto number = ComNumberOfTty(name);
    if (number && HasHardware(sources.tty_class / name)) found.insert(*number);
  }
  // Named ports are a list, too: a container often has no sysfs.
  if (!ttys && found.empty()) return false;
  ports.assign(found.begin(), found.end());
  return true;
}

std::string ComPortDevice(const PortSources& sources, int number) {
  uint32_t place = UINT32_MAX;
  return ComPortDevice(sources, number, place);
}

std::string ComPortDevice(const PortSources& sources, int number, uint32_t& place) {
  const uint32_t last = place;
  place = kVariablePlace;
  if (const auto named = sources.variables.find(number); named != sources.variables.end()) return named->second;
  place = kFirstLinkPlace;
  for (const fs::path& folder : sources.link_folders) {
    if (place > last) return {};
    const auto link = folder / ("com" + std::to_string(number));
    struct stat status {};
    if (::lstat(link.c_str(), &status) == 0) return link.string();
    ++place;
  }
  place = kTtyPlace;
  if (place > last) return {};
  for (const TtyRange& range : kTtyRanges) {
    if (number < range.first || number > range.last) continue;
    return "/dev/" + std::string(range.prefix) + std::to_string(number - range.first);
  }
  return {};
}

bool ListComPorts(std::vector<uint16_t>& ports) {
  return ListComPorts(CurrentPortSources(), ports);
}

std::string ComPortDevice(int number) {
  return ComPortDevice(CurrentPortSources(), number);
}

}  // namespace kral
