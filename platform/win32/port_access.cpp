// Rights to ports are no matter of groups here; processes are found through a snapshot of the system.
#include "platform/port_access.h"

#include <windows.h>

#include <tlhelp32.h>

#include "platform/win32/wide_text.h"
#include "platform/win32/win_handle.h"

namespace kral {

PortAccess DescribePortAccess(const std::string&) {
  return {};
}

uint32_t FindProcess(const std::string& name) {
  const WinHandle snapshot(::CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0));
  if (!snapshot.valid()) return 0;
  PROCESSENTRY32W entry{};
  entry.dwSize = sizeof entry;
  for (BOOL more = ::Process32FirstW(snapshot.get(), &entry); more; more = ::Process32NextW(snapshot.get(), &entry)) {
    if (Utf8Text(entry.szExeFile) == name) return entry.th32ProcessID;
  }
  return 0;
}

std::string SystemName() {
  return "Windows";
}

}  // namespace kral
