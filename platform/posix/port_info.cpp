// What sysfs tells of the device behind a tty, and who has it open: the table of locks, which names every user of this
// library, and the descriptors of those processes that this user may look into.
#include "platform/port_info.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/posix/port_sources.h"
#include "platform/posix/system_files.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

constexpr unsigned int kFirstTerminalSlave = 136;  // device numbers of pseudo terminals
constexpr unsigned int kLastTerminalSlave = 143;

uint16_t HexIn(const fs::path& file) {
  return NumberIn<uint16_t>(FirstLineOf(file), 16).value_or(0);
}

// The tty of the system that a port is: links lead to it.
std::string TtyName(const std::string& device) {
  return RealPath(device).value_or(device).filename().string();
}

// The interface is a folder of the device's, and the tty is somewhere below it.
void DescribeUsb(const PortSources& sources, PortInfo& info) {
  fs::path folder = RealPath(sources.tty_class / TtyName(info.device) / "device").value_or(fs::path());
  std::string interface_text;
  for (; folder.has_relative_path(); folder = folder.parent_path()) {
    if (Exists(folder / "bInterfaceNumber")) {
      info.usb_interface = static_cast<uint8_t>(HexIn(folder / "bInterfaceNumber"));
      interface_text = FirstLineOf(folder / "interface");
    }
    if (!Exists(folder / "idVendor")) continue;
    info.usb_path = folder.filename().string();
    info.vendor = HexIn(folder / "idVendor");
    info.product = HexIn(folder / "idProduct");
    info.serial = FirstLineOf(folder / "serial");
    for (const std::string& part :
         {FirstLineOf(folder / "manufacturer"), FirstLineOf(folder / "product"), interface_text}) {
      if (!part.empty()) info.description += (info.description.empty() ? "" : " ") + part;
    }
    return;
  }
}

// --- Who has it open ------------------------------------------------------------------------------------------------

// "3: FLOCK  ADVISORY  WRITE 1234 00:18:5 0 EOF": process, and device and inode of the file.
std::optional<uint32_t> HolderOfLock(const fs::path& processes, const struct stat& device) {
  enum Word : size_t { kKind = 1, kProcess = 4, kFile = 5 };
  std::array<char, 64> wanted{};
  std::snprintf(wanted.data(), wanted.size(), "%02x:%02x:%ju", major(device.st_dev), minor(device.st_dev),
                static_cast<uintmax_t>(device.st_ino));
  const std::string locks = TextOf(processes / "locks");
  std::string_view left = locks;
  while (const auto line = TakeUntil('\n', left)) {
    const auto words = WordsOf(*line);
    if (words.size() <= kFile || words[kKind] != "FLOCK" || words[kFile] != wanted.data()) continue;
    return NumberIn<uint32_t>(words[kProcess]).value_or(0);
  }
  return std::nullopt;
}

bool HasOpen(const fs::path& process, const struct stat& device) {
  const auto names = NamesIn(process / "fd");
  if (!names) return false;  // not ours to look into, or it has just ended
  for (const std::string& name : *names) {
    struct stat open {};
    if (::stat((process / "fd" / name).c_str(), &open) == 0 && S_ISCHR(open.st_mode) &&
        open.st_rdev == device.st_rdev) {
      return true;
    }
  }
  return false;
}

std::optional<uint32_t> HolderOfDescriptor(const fs::path& processes, const struct stat& device) {
  for (const std::string& name : NamesIn(processes).value_or(std::vector<std::string>())) {
    const auto process = NumberIn<uint32_t>(name);
    if (process && HasOpen(processes / name, device)) return process;
  }
  return std::nullopt;
}

// Whoever simulates a handset on a pseudo terminal has both of its ends open: there only the lock tells.
bool IsPseudoTerminal(const struct stat& device) {
  const unsigned int kind = major(device.st_rdev);
  return kind >= kFirstTerminalSlave && kind <= kLastTerminalSlave;
}

// Whether a line of the table of terminal drivers, "usbserial /dev/ttyUSB 188 0-511 serial", is that of the device.
bool IsDriverOf(std::string_view line, const struct stat& device) {
  enum Word : size_t { kMajor = 2, kMinors = 3 };
  const auto words = WordsOf(line);
  if (words.size() <= kMinors || NumberIn<unsigned int>(words[kMajor]) != major(device.st_rdev)) return false;
  std::string_view minors = words[kMinors];
  const auto first = NumberIn<unsigned int>(*TakeUntil('-', minors));
  const auto last = minors.empty() ? first : NumberIn<unsigned int>(minors);
  return first && last && minor(device.st_rdev) >= *first && minor(device.st_rdev) <= *last;
}

// A device, but no terminal, /dev/null for instance: as far as the system tells.
bool IsOtherDevice(const fs::path& processes, const struct stat& device) {
  if (IsPseudoTerminal(device)) return false;
  const std::string drivers = TextOf(processes / "tty" / "drivers");
  std::string_view left = drivers;
  while (const auto line = TakeUntil('\n', left)) {
    if (IsDriverOf(*line, device)) return false;
  }
  return !drivers.empty();
}

void FindHolder(const PortSources& sources, const struct stat& device, PortInfo& info) {
  auto holder = HolderOfLock(sources.processes, device);
  if (!holder && !IsPseudoTerminal(device)) holder = HolderOfDescriptor(sources.processes, device);
  if (!holder) return;
  info.process = *holder;
  const bool is_ours = *holder == static_cast<uint32_t>(::getpid());
  info.obstacle = is_ours ? PortObstacle::kInUseHere : PortObstacle::kInUse;
  if (info.process != 0) info.process_name = FirstLineOf(sources.processes / std::to_string(info.process) / "comm");
}

void FindObstacle(const PortSources& sources, PortInfo& info) {
  struct stat device {};
  if (info.device.empty() || ::stat(info.device.c_str(), &device) != 0) {
    info.obstacle = errno == EACCES && !info.device.empty() ? PortObstacle::kNotPermitted : PortObstacle::kNotFound;
    return;
  }
  if (!S_ISCHR(device.st_mode) || IsOtherDevice(sources.processes, device)) {
    info.obstacle = PortObstacle::kNotFound;
    return;
  }
  FindHolder(sources, device, info);
  if (::eaccess(info.device.c_str(), R_OK | W_OK) != 0) info.obstacle = PortObstacle::kNotPermitted;
}

}  // namespace

PortInfo DescribeComPort(const PortSources& sources, int number) {
  PortInfo info;
  info.device = ComPortDevice(sources, number);
  if (!info.device.empty()) DescribeUsb(sources, info);
  FindObstacle(sources, info);
  return info;
}

PortInfo DescribeComPort(int number) {
  return DescribeComPort(CurrentPortSources(), number);
}

}  // namespace kral
