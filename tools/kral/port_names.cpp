// Finds ports by what is known of them; knows where the slots of a fixture are kept.
#include "tools/kral/port_names.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <thread>
#include <vector>

#include "platform/environment.h"
#include "platform/file_util.h"
#include "platform/port_list.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/config_folder.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/many_handsets.h"
#include "tools/kral/port_report.h"

namespace kral::tool {
namespace {

constexpr std::uint16_t kLastSlot = 999;
constexpr std::size_t kLargestSlotFile = 1 << 20;
constexpr std::string_view kEsn = "esn:", kUsb = "usb:", kSlot = "slot:";
constexpr const char* kNames =
    "-p takes numbers (7, 20-27), devices (/dev/ttyUSB0), esn:80C0FFEE, usb:1-4.2 and slot:3";

// Whole, or nothing.
template <class Number>
std::optional<Number> NumberIn(std::string_view text, int base = 10) {
  Number number{};
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  if (error != std::errc() || text.empty() || end != text.data() + text.size()) return std::nullopt;
  return number;
}

bool IsDevice(std::string_view name) {
  return name.starts_with('/') || name.starts_with("\\\\.\\");
}

bool IsName(std::string_view text) {
  return IsDevice(text) || text.starts_with(kEsn) || text.starts_with(kUsb) || text.starts_with(kSlot);
}

ToolError NoPort(std::string_view name, const char* hint) {
  return {ExitCode::kNoPort, Format("there is no port {}", name), hint};
}

std::uint16_t TheOne(std::string_view name, const std::vector<std::uint16_t>& found, const char* hint) {
  if (found.size() == 1) return found.front();
  if (found.empty()) throw NoPort(name, hint);
  std::vector<std::string> names;
  names.reserve(found.size());
  for (const auto port : found) names.push_back(DescribePort(port));
  throw ToolError(ExitCode::kUsage, Format("{} is not one port but {}", name, Joined(names, ", ")),
                  name.starts_with(kUsb) ? "add the interface: kral ports shows it, as in usb:1-4.2:1"
                                         : "choose one by its number");
}

// --- Devices --------------------------------------------------------------------------------------------------------

// A device without a number gets one for as long as this process runs.
std::uint16_t NumberFor(const std::string& device) {
  const auto listed = ListPorts();
  for (std::uint16_t port = kLastPort; port > 0; --port) {
    if (std::ranges::find(listed, port) != listed.end()) continue;
    SetEnvironmentValue(Format("KRAL_COM{}", port).c_str(), device);
    if (ComPortDevice(port) == device) return port;
    break;  // where ports have fixed names
  }
  throw NoPort(device, "kral ports lists the ports there are");
}

std::uint16_t PortOfDevice(const std::string& device) {
  std::error_code error;
  const auto real = std::filesystem::canonical(device, error);
  for (const auto port : ListPorts()) {
    const auto candidate = ComPortDevice(port);
    std::error_code ignored;
    if (candidate == device || (!error && std::filesystem::canonical(candidate, ignored) == real)) return port;
  }
  if (error) throw NoPort(device, "kral ports lists the ports there are");
  return NumberFor(device);
}

// --- Serial numbers and sockets -------------------------------------------------------------------------------------

std::uint32_t SerialIn(std::string_view name) {
  const auto serial = NumberIn<std::uint32_t>(name.substr(kEsn.size()), 16);
  if (!serial) throw ToolError(ExitCode::kUsage, Format("{} is no serial number", name), kNames);
  return *serial;
}

// Behind what a handset sends by itself its answer comes late: as long as packets come it is asked again.
bool ReadSerial(KRAL_HANDLE handle, const SessionOptions& options, std::uint32_t& serial) {
  constexpr int kMostAskings = 3;
  constexpr std::uint64_t kLeastPackets = 100;  // in the time of an answer
  const auto received = [handle] {
    KRAL_TRAFFIC_COUNTERS counters{};
    return KRAL_GetTrafficCounters(handle, &counters) == 0 ? std::uint64_t{0} : counters.packets_received;
  };
  KRAL_SetResynchronise(handle, 1);
  if (options.time_out_ms) {
    KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_COMMAND, static_cast<std::int32_t>(*options.time_out_ms));
  }
  for (int asked = 0; asked < kMostAskings && !Interrupted(); ++asked) {
    const auto before = received();
    if (KRAL_DIAG_READ_ESN_F(handle, &serial) != 0) return true;
    if (LastError(handle).value_or(KRAL_ERROR{}).code == KRAL_ERROR_REFUSED) return false;
    if (received() - before < kLeastPackets) return false;
  }
  return false;
}

std::uint16_t PortOfSerial(std::string_view name, const SessionOptions& options) {
  const auto wanted = SerialIn(name);
  const auto ports = ListPorts();
  std::mutex mutex;
  std::vector<std::uint16_t> found;
  std::vector<std::string> late;
  InParallel(ports.size(), [&](std::size_t number) {
    KRAL_PORT_INFO info{};
    if (KRAL_GetPortInfo(ports[number], 1, &info) == 0 || info.answers != KRAL_ANSWERS_DIAGNOSTICS) return;
    const KRAL_HANDLE handle = KRAL_ConnectServer(ports[number]);
    std::uint32_t serial = 0;
    const bool told = ReadSerial(handle, options, serial);
    // What came in place of its answer may have been due to an earlier question.
    const bool is_late = !told && LastError(handle).value_or(KRAL_ERROR{}).code != KRAL_ERROR_REFUSED;
    KRAL_DisconnectServer(handle);
    const std::lock_guard lock(mutex);
    if (is_late) late.push_back(DescribePort(ports[number]));
    if (told && serial == wanted) found.push_back(ports[number]);
  });
  ThrowIfInterrupted();
  std::ranges::sort(found);
  if (found.empty() && !late.empty()) {
    throw ToolError(
        ExitCode::kNoAnswer,
        Format("no handset tells the serial number {}; {} did not answer in time", name, Joined(late, ", ")),
        "kral -p N info tells why");
  }
  return TheOne(name, found, "kral --all info tells the serial numbers of the handsets that answer");
}

std::uint16_t PortOfSocket(std::string_view name) {
  const auto path = name.substr(kUsb.size());
  std::vector<std::uint16_t> found;
  for (const auto& report : ReportPorts(ListPorts(), false)) {
    const auto& info = report.info;
    if (info.usb_path[0] == '\0') continue;
    if (path == info.usb_path || path == Format("{}:{}", info.usb_path, info.usb_interface)) {
      found.push_back(report.port);
    }
  }
  return TheOne(name, found, "kral ports shows the sockets in use; check that the handset is plugged in and on");
}

std::uint16_t PortOf(const std::string& name, const SessionOptions& options) {
  if (name.starts_with(kEsn)) return PortOfSerial(name, options);
  if (name.starts_with(kUsb)) return PortOfSocket(name);
  return IsDevice(name) ? PortOfDevice(name) : ParsePort(name);
}

// --- Slots ----------------------------------------------------------------------------------------------------------

std::uint16_t SlotNumber(std::string_view text, std::string_view whole) {
  const auto slot = NumberIn<std::uint16_t>(text);
  if (slot && *slot >= 1 && *slot <= kLastSlot) return *slot;
  throw ToolError(ExitCode::kUsage, Format("{} is no slot", whole),
                  "slots are numbers from 1 to 999: slot:3, slot:1-8");
}

// "slot:1-8", in which every slot is assigned.
std::vector<std::uint16_t> SlotsOf(std::string_view name) {
  const auto text = name.substr(kSlot.size());
  const auto dash = text.find('-');
  const auto first = SlotNumber(text.substr(0, dash), name);
  const auto last = dash == std::string_view::npos ? first : SlotNumber(text.substr(dash + 1), name);
  if (last < first) SlotNumber("", name);
  std::vector<std::uint16_t> slots;
  for (auto slot = first; slot <= last; ++slot) slots.push_back(slot);
  return slots;
}

// The list in the making.
struct Resolved {
  std::string numbers;
  std::map<std::uint16_t, std::string> names;  // of each port

  void Add(std::uint16_t port, const std::string& name) {
    const auto [first, is_new] = names.emplace(port, name);
    if (!is_new) {
      throw ToolError(ExitCode::kUsage, Format("{} and {} are both {}", first->second, name, DescribePort(port)),
                      "name each port once");
    }
    numbers += (numbers.empty() ? "" : ",") + std::to_string(port);
  }
};

void AddSlots(const std::string& name, SessionOptions& options, Resolved& resolved) {
  const auto known = ReadSlots();
  for (const auto slot : SlotsOf(name)) {
    const auto found = known.find(slot);
    if (found == known.end()) {
      throw ToolError(ExitCode::kUsage, Format("slot {} is not assigned", slot),
                      Format("kral ports assign {} usb:1-4.2 tells where it is", slot));
    }
    const auto port = PortOf(found->second, options);
    resolved.Add(port, Format("slot:{}", slot));
    options.slots[port] = slot;
  }
}

}  // namespace

void ResolvePortNames(SessionOptions& options) {
  const std::string list = options.port;
  std::vector<std::string> parts;
  for (std::size_t at = 0; at <= list.size();) {
    parts.push_back(list.substr(at, list.find(',', at) - at));
    at += parts.back().size() + 1;
  }
  if (std::ranges::none_of(parts, IsName)) return;
  Resolved resolved;
  for (const auto& part : parts) {
    if (part.starts_with(kSlot)) {
      AddSlots(part, options, resolved);
    } else if (IsName(part)) {
      resolved.Add(PortOf(part, options), part);
    } else {
      for (const auto port : ParsePorts(part)) resolved.Add(port, part);
    }
  }
  options.port = resolved.numbers;
}

std::vector<Completion> SuggestPorts(const std::vector<std::string>& words) {
  const auto& typed = words.back();
  const auto front = typed.substr(0, typed.rfind(',') + 1);
  const bool wants_device = IsDevice(std::string_view(typed).substr(front.size()));
  std::vector<Completion> found;
  for (const auto port : ListPorts()) {
    const auto device = ComPortDevice(port);
    if (!wants_device) found.push_back({Format("{}{}", front, port), device});
    if (wants_device && IsDevice(device)) found.push_back({front + device, Format("COM{}", port)});
  }
  for (const auto& [slot, name] : ReadSlots()) found.push_back({Format("{}{}{}", front, kSlot, slot), name});
  return found;
}

std::string PortName(const std::string& name) {
  const bool is_text = std::ranges::none_of(
      name, [](unsigned char character) { return character <= ' ' || character == ',' || character == 0x7F; });
  if (is_text && IsDevice(name)) return name;
  if (name.starts_with(kEsn)) return Format("{}{:08X}", kEsn, SerialIn(name));
  if (is_text && name.starts_with(kUsb) && name.size() > kUsb.size()) return name;
  if (!is_text || IsName(name)) throw ToolError(ExitCode::kUsage, Format("'{}' is no name of one port", name), kNames);
  if (const auto ports = ParsePorts(name); ports.size() == 1) return std::to_string(ports.front());
  throw ToolError(ExitCode::kUsage, Format("'{}' is no name of one port", name), kNames);
}

std::string SlotFile() {
  const auto named = EnvironmentValue("KRAL_SLOTS");
  return named && !named->empty() ? *named : ConfigFile("slots");
}

namespace {

ToolError SlotsNotWritten(const std::string& file, const std::string& why) {
  return {ExitCode::kBadFile, Format("{} cannot be written: {}", file, why),
          "check folder and permissions, or name another file in KRAL_SLOTS"};
}

// Of two that change it at once the later one goes by what the other has written.
std::shared_ptr<std::FILE> LockOf(const std::string& file) {
  constexpr int kTries = 100;
  const auto name = file + ".lock";
  for (int i = 0; i < kTries; ++i) {
    if (std::FILE* const lock = OpenToWrite(name)) return {lock, CloseStream};
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    ThrowIfInterrupted();
  }
  throw SlotsNotWritten(file, Format("{} cannot be opened, or is kept by another program", name));
}

// The lines of whoever has written some.
std::string CommentsOf(const std::string& file) {
  std::vector<std::uint8_t> bytes;
  if (ReadWholeFile(file, kLargestSlotFile, bytes)) return {};
  std::string comments;
  std::string_view rest(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  while (!rest.empty()) {
    const auto line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(rest.size(), line.size() + 1));
    if (line.starts_with('#')) comments.append(line).append("\n");
  }
  return comments;
}

// As it would be assigned; nothing for what would not.
std::optional<std::string> PortNameIn(std::string_view text) {
  try {
    return PortName(std::string(text));
  } catch (const ToolError&) {
    return {};
  }
}

}  // namespace

std::map<std::uint16_t, std::string> ReadSlots() {
  const auto file = SlotFile();
  std::vector<std::uint8_t> bytes;
  const auto error = ReadWholeFile(file, kLargestSlotFile, bytes);
  if (error == std::errc::no_such_file_or_directory) return {};
  const auto bad = [&file](std::string_view what) {
    return ToolError(ExitCode::kBadFile, Format("{} {}", file, what),
                     "a line of it is a slot and a port: 3 usb:1-4.2; kral ports assign writes it");
  };
  if (error) throw bad("cannot be read: " + error.message());
  std::map<std::uint16_t, std::string> slots;
  std::string_view rest(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  for (std::size_t number = 1; !rest.empty(); ++number) {
    auto line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(rest.size(), line.size() + 1));
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (line.empty() || line.starts_with('#')) continue;
    const auto blank = line.find(' ');
    const auto slot = NumberIn<std::uint16_t>(line.substr(0, blank));
    const auto name = blank == std::string_view::npos ? std::nullopt : PortNameIn(line.substr(blank + 1));
    if (!slot || *slot == 0 || *slot > kLastSlot || !name || !slots.emplace(*slot, *name).second) {
      throw bad(Format("has no slot of its own with a port in line {}", number));
    }
  }
  return slots;
}

void ChangeSlots(const std::function<void(std::map<std::uint16_t, std::string>& slots)>& change) {
  const auto file = SlotFile();
  MakeFoldersOf(file);
  const auto lock = LockOf(file);
  auto slots = ReadSlots();
  change(slots);
  auto text = CommentsOf(file);
  if (text.empty()) text = "# Which port each slot of the fixture is: kral ports assign SLOT PORT\n";
  for (const auto& [slot, name] : slots) text += Format("{} {}\n", slot, name);
  if (const auto error = ReplaceWholeFile(file, {reinterpret_cast<const std::uint8_t*>(text.data()), text.size()})) {
    throw SlotsNotWritten(file, error.message());
  }
}

// --- Waiting --------------------------------------------------------------------------------------------------------

namespace {

bool AllAreThere(const SessionOptions& options, bool all, bool is_for_boot_loader) {
  const bool named = !options.port.empty() && !all;
  const auto reports = ReportPorts(named ? ParsePorts(options.port) : ListPorts(), !is_for_boot_loader);
  const auto is_there = [&](const PortReport& report) {
    return is_for_boot_loader ? report.info.state == KRAL_PORT_CLOSED : report.has_handset();
  };
  return named ? std::ranges::all_of(reports, is_there) : std::ranges::any_of(reports, is_there);
}

}  // namespace

void AwaitHandsets(SessionOptions& options, bool all, bool is_for_boot_loader) {
  constexpr std::chrono::milliseconds kLookAround{100};
  const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(options.wait_ms);
  const std::string names = options.port;
  for (;;) {
    const bool is_last = std::chrono::steady_clock::now() >= end;
    try {
      options.port = names;
      ResolvePortNames(options);
      if (is_last || AllAreThere(options, all, is_for_boot_loader)) return;
    } catch (const ToolError& error) {
      if (is_last || error.code() != ExitCode::kNoPort) throw;
    }
    std::this_thread::sleep_for(kLookAround);
    ThrowIfInterrupted();
  }
}

}  // namespace kral::tool
