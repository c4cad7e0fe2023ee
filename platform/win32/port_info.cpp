// What the set-up functions of the system tell of the device behind a COM port. Who has it open they do not tell.
#include "platform/port_info.h"

#include <windows.h>

#include <setupapi.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/port_list.h"
#include "platform/win32/wide_text.h"

namespace kral {
namespace {

// Location paths came after the headers' default version of the system.
constexpr DWORD kLocationPaths = 0x23;

class DeviceSet {
 public:
  DeviceSet() : set_(::SetupDiGetClassDevsW(nullptr, nullptr, nullptr, DIGCF_ALLCLASSES | DIGCF_PRESENT)) {}
  ~DeviceSet() {
    if (set_ != INVALID_HANDLE_VALUE) ::SetupDiDestroyDeviceInfoList(set_);
  }
  DeviceSet(const DeviceSet&) = delete;
  DeviceSet& operator=(const DeviceSet&) = delete;

  bool Get(DWORD index, SP_DEVINFO_DATA& device) const {
    device = {};
    device.cbSize = sizeof device;
    return set_ != INVALID_HANDLE_VALUE && ::SetupDiEnumDeviceInfo(set_, index, &device) != FALSE;
  }

  // Of a list of texts the first.
  std::string Property(SP_DEVINFO_DATA& device, DWORD property) const {
    std::array<wchar_t, 1024> text{};
    if (::SetupDiGetDeviceRegistryPropertyW(set_, &device, property, nullptr, reinterpret_cast<BYTE*>(text.data()),
                                            sizeof text - sizeof(wchar_t), nullptr) == FALSE) {
      return {};
    }
    return Utf8Text(text.data());
  }

  std::string InstanceId(SP_DEVINFO_DATA& device) const {
    std::array<wchar_t, 512> text{};
    if (::SetupDiGetDeviceInstanceIdW(set_, &device, text.data(), static_cast<DWORD>(text.size()), nullptr) == FALSE) {
      return {};
    }
    return Utf8Text(text.data());
  }

  // "COM7"; empty for what is no port.
  std::string PortName(SP_DEVINFO_DATA& device) const {
    const HKEY key = ::SetupDiOpenDevRegKey(set_, &device, DICS_FLAG_GLOBAL, 0, DIREG_DEV, KEY_READ);
    if (key == INVALID_HANDLE_VALUE) return {};
    std::array<wchar_t, 64> text{};
    DWORD size = sizeof text - sizeof(wchar_t);
    const bool has = ::RegQueryValueExW(key, L"PortName", nullptr, nullptr, reinterpret_cast<BYTE*>(text.data()),
                                        &size) == ERROR_SUCCESS;
    ::RegCloseKey(key);
    return has ? Utf8Text(text.data()) : std::string();
  }

 private:
  const HDEVINFO set_;
};

uint16_t HexBehind(std::string_view text, std::string_view mark) {
  const size_t at = text.find(mark);
  uint16_t number = 0;
  if (at != std::string_view::npos) {
    const char* const digits = text.data() + at + mark.size();
    std::from_chars(digits, text.data() + text.size(), number, 16);
  }
  return number;
}

// "PCIROOT(0)#PCI(1400)#USBROOT(0)#USB(4)#USB(2)#USBMI(1)" is "1400-4.2".
std::string UsbPath(std::string_view location) {
  std::string bus, sockets;
  while (!location.empty()) {
    const auto part = location.substr(0, location.find('#'));
    location.remove_prefix(std::min(location.size(), part.size() + 1));
    const auto open = part.find('('), close = part.find(')');
    if (open == std::string_view::npos || close == std::string_view::npos || close < open) continue;
    const std::string number(part.substr(open + 1, close - open - 1));
    if (part.starts_with("PCI(")) bus = number;
    if (part.starts_with("USB(")) sockets += (sockets.empty() ? "" : ".") + number;
  }
  return sockets.empty() ? sockets : bus + "-" + sockets;
}

void DescribeUsb(const std::string& instance, const std::string& location, PortInfo& info) {
  if (!instance.starts_with("USB\\")) return;
  info.vendor = HexBehind(instance, "VID_");
  info.product = HexBehind(instance, "PID_");
  info.usb_interface = static_cast<uint8_t>(HexBehind(instance, "&MI_"));
  info.usb_path = UsbPath(location);
  // Where the device tells no serial number the system makes up something with ampersands.
  const std::string last = instance.substr(instance.rfind('\\') + 1);
  if (last.find('&') == std::string::npos) info.serial = last;
}

}  // namespace

PortInfo DescribeComPort(int number) {
  PortInfo info;
  const std::string name = "COM" + std::to_string(number);
  std::vector<uint16_t> ports;
  const bool listed = ListComPorts(ports) && std::ranges::find(ports, number) != ports.end();
  info.obstacle = listed ? PortObstacle::kNone : PortObstacle::kNotFound;
  info.device = ComPortDevice(number);
  const DeviceSet devices;
  SP_DEVINFO_DATA device;
  for (DWORD index = 0; devices.Get(index, device); ++index) {
    if (devices.PortName(device) != name) continue;
    info.description = devices.Property(device, SPDRP_FRIENDLYNAME);
    DescribeUsb(devices.InstanceId(device), devices.Property(device, kLocationPaths), info);
    break;
  }
  return info;
}

}  // namespace kral
