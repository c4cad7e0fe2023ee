// COM numbers on Windows: the serial-device map that the drivers keep in the registry.
#include "platform/port_list.h"

#include <windows.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <optional>

namespace kral {
namespace {

constexpr const char* kSerialDeviceMap = "HARDWARE\\DEVICEMAP\\SERIALCOMM";
constexpr size_t kPrefixLength = 3;  // "COM"

// The text of the value at an index; nothing when it cannot be read.
std::optional<std::string> ValueText(HKEY key, DWORD index) {
  std::array<char, 16384> name{};  // as long as value names can be
  std::array<BYTE, 256> data{};
  auto name_length = static_cast<DWORD>(name.size());
  auto data_size = static_cast<DWORD>(data.size());
  if (::RegEnumValueA(key, index, name.data(), &name_length, nullptr, nullptr, data.data(), &data_size) !=
      ERROR_SUCCESS) {
    return std::nullopt;
  }
  const auto end = data.begin() + data_size;
  return std::string(data.begin(), std::find(data.begin(), end, BYTE{0}));
}

}  // namespace

bool ListComPorts(std::vector<uint16_t>& ports) {
  ports.clear();
  HKEY key = nullptr;
  if (::RegOpenKeyExA(HKEY_LOCAL_MACHINE, kSerialDeviceMap, 0, KEY_READ, &key) != ERROR_SUCCESS) return false;
  DWORD count = 0;
  ::RegQueryInfoKeyA(key, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, &count, nullptr, nullptr, nullptr,
                     nullptr);
  for (DWORD index = 0; index < count; ++index) {
    const auto text = ValueText(key, index);
    if (!text || text->size() < kPrefixLength) continue;
    ports.push_back(static_cast<uint16_t>(std::atoi(text->c_str() + kPrefixLength)));
  }
  ::RegCloseKey(key);
  return true;
}

std::string ComPortDevice(int number) {
  return "\\\\.\\COM" + std::to_string(number);
}

}  // namespace kral
