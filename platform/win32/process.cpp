// Processes, found through a snapshot of the system.
#include "platform/process.h"

#include <windows.h>

#include <tlhelp32.h>

#include <cstring>

namespace kral {
namespace {

void Terminate(DWORD id) {
  const HANDLE process = ::OpenProcess(PROCESS_ALL_ACCESS, FALSE, id);
  if (process == nullptr) return;
  DWORD exit_code = 0;
  ::GetExitCodeProcess(process, &exit_code);
  ::TerminateProcess(process, exit_code);
  ::CloseHandle(process);
}

}  // namespace

void TerminateProcessByName(const char* executable) {
  const HANDLE snapshot = ::CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  if (snapshot == INVALID_HANDLE_VALUE) return;
  PROCESSENTRY32 entry{};
  entry.dwSize = sizeof entry;
  for (BOOL more = ::Process32First(snapshot, &entry); more; more = ::Process32Next(snapshot, &entry)) {
    if (std::strcmp(entry.szExeFile, executable) != 0) continue;
    Terminate(entry.th32ProcessID);
    break;
  }
  ::CloseHandle(snapshot);
}

}  // namespace kral
