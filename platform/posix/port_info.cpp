// What sysfs tells of the device behind a tty, and who has it open: the table of locks, which names every user of this
// library, and the descriptors of those processes that this user may look into.
#include "platform/port_info.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <fstream>
#include <optional>
#include <sstream>
#include <string_view>
#include <system_error>

#include "platform/posix/port_sources.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

constexpr unsigned int kFirstTerminalSlave = 136;  // device numbers of pseudo terminals
constexpr unsigned int kLastTerminalSlave = 143;

std::string FirstLine(const fs::path& file) {
  std::ifstream stream(file);
  std::string line;
  std::getline(stream, line);
  return line;
}

template <class Number>
std::optional<Number> NumberIn(std::string_view text, int base) {
  Number number{};
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return number;
}

uint16_t HexIn(const fs::path& file) {
  return NumberIn<uint16_t>(FirstLine(file), 16).value_or(0);
}

// The tty of the system that a port is: links lead to it.
std::string TtyName(const std::string& device) {
  std::error_code error;
  const fs::path real = fs::canonical(device, error);
  return fs::path(error ? fs::path(device) : real).filename().string();
}

// The interface is a folder of the device's, and the tty is somewhere below it.
void DescribeUsb(const PortSources& sources, PortInfo& info) {
  std::error_code error;
  fs::path folder = fs::canonical(sources.tty_class / TtyName(info.device) / "device", error);
  if (error) return;
  std::string interface_text;
  for (; folder.has_relative_path(); folder = folder.parent_path()) {
    if (fs::exists(folder / "bInterfaceNumber", error)) {
      info.usb_interface = static_cast<uint8_t>(HexIn(folder / "bInterfaceNumber"));
      interface_text = FirstLine(folder / "interface");
    }
    if (!fs::exists(folder / "idVendor", error)) continue;
    info.usb_path = folder.filename().string();
    info.vendor = HexIn(folder / "idVendor");
    info.product = HexIn(folder / "idProduct");
    info.serial = FirstLine(folder / "serial");
    for (const std::string& part :
         {FirstLine(folder / "manufacturer"), FirstLine(folder / "product"), interface_text}) {
      if (!part.empty()) info.description += (info.description.empty() ? "" : " ") + part;
    }
    return;
  }
}

// --- Who has it open ------------------------------------------------------------------------------------------------

// "3: FLOCK  ADVISORY  WRITE 1234 00:18:5 0 EOF": process, and device and inode of the file.
std::optional<uint32_t> HolderOfLock(const fs::path& processes, const struct stat& device) {
  std::ifstream locks(processes / "locks");
  for (std::string line; std::getline(locks, line);) {
    std::istringstream words(line);
    std::string number, kind, mode, access, process, file;
    words >> number >> kind >> mode >> access >> process >> file;
    if (kind != "FLOCK") continue;
    std::ostringstream wanted;
    wanted.width(2);
    wanted.fill('0');
    wanted << std::hex << major(device.st_dev) << ':';
    wanted.width(2);
    wanted << minor(device.st_dev) << ':' << std::dec << device.st_ino;
    if (file == wanted.str()) return NumberIn<uint32_t>(process, 10).value_or(0);
  }
  return std::nullopt;
}

bool HasOpen(const fs::path& process, const struct stat& device) {
  std::error_code error;
  fs::directory_iterator entry(process / "fd", error);
  if (error) return false;  // not ours to look into, or it has just ended
  for (const fs::directory_iterator end; !error && entry != end; entry.increment(error)) {
    struct stat open {};
    if (::stat(entry->path().c_str(), &open) == 0 && S_ISCHR(open.st_mode) && open.st_rdev == device.st_rdev) {
      return true;
    }
  }
  return false;
}

std::optional<uint32_t> HolderOfDescriptor(const fs::path& processes, const struct stat& device) {
  std::error_code error;
  fs::directory_iterator entry(processes, error);
  if (error) return std::nullopt;
  for (const fs::directory_iterator end; !error && entry != end; entry.increment(error)) {
    const auto process = NumberIn<uint32_t>(entry->path().filename().string(), 10);
    if (process && HasOpen(entry->path(), device)) return process;
  }
  return std::nullopt;
}

// Whoever simulates a handset on a pseudo terminal has both of its ends open: there only the lock tells.
bool IsPseudoTerminal(const struct stat& device) {
  const unsigned int kind = major(device.st_rdev);
  return kind >= kFirstTerminalSlave && kind <= kLastTerminalSlave;
}

// Whether a line of the table of terminal drivers, "usbserial /dev/ttyUSB 188 0-511 serial", is that of the device.
bool IsDriverOf(const std::string& line, const struct stat& device) {
  std::istringstream words(line);
  std::string name, node, kind, minors;
  words >> name >> node >> kind >> minors;
  const size_t dash = minors.find('-');
  const auto first = NumberIn<unsigned int>(std::string_view(minors).substr(0, dash), 10);
  const auto last = dash == std::string::npos ? first : NumberIn<unsigned int>(minors.substr(dash + 1), 10);
  return NumberIn<unsigned int>(kind, 10) == major(device.st_rdev) && first && last &&
         minor(device.st_rdev) >= *first && minor(device.st_rdev) <= *last;
}

// A device, but no terminal, /dev/null for instance: as far as the system tells.
bool IsOtherDevice(const fs::path& processes, const struct stat& device) {
  if (IsPseudoTerminal(device)) return false;
  std::ifstream drivers(processes / "tty" / "drivers");
  bool tells = false;
  for (std::string line; std::getline(drivers, line); tells = true) {
    if (IsDriverOf(line, device)) return false;
  }
  return tells;
}

void FindHolder(const PortSources& sources, const struct stat& device, PortInfo& info) {
  auto holder = HolderOfLock(sources.processes, device);
  if (!holder && !IsPseudoTerminal(device)) holder = HolderOfDescriptor(sources.processes, device);
  if (!holder) return;
  info.process = *holder;
  const bool is_ours = *holder == static_cast<uint32_t>(::getpid());
  info.obstacle = is_ours ? PortObstacle::kInUseHere : PortObstacle::kInUse;
  if (info.process != 0) info.process_name = FirstLine(sources.processes / std::to_string(info.process) / "comm");
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
