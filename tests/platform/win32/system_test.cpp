// Registry, window messages, processes, and names of devices, of Windows.
#include <windows.h>

#include "platform/file_util.h"
#include "platform/folder.h"
#include "platform/message_pump.h"
#include "platform/named_mutex.h"
#include "platform/port_list.h"
#include "platform/process.h"
#include "platform/pseudo_terminal.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class SerialDeviceMap {
 public:
  SerialDeviceMap() {
    ::RegCreateKeyExA(HKEY_LOCAL_MACHINE, "HARDWARE\\DEVICEMAP\\SERIALCOMM", 0, nullptr, REG_OPTION_VOLATILE,
                      KEY_ALL_ACCESS, nullptr, &key_, nullptr);
  }
  ~SerialDeviceMap() {
    for (const std::string& name : names_) ::RegDeleteValueA(key_, name.c_str());
    ::RegCloseKey(key_);
  }
  bool Add(const std::string& name, const std::string& data) {
    names_.push_back(name);
    const auto* bytes = reinterpret_cast<const BYTE*>(data.c_str());
    return ::RegSetValueExA(key_, name.c_str(), 0, REG_SZ, bytes, static_cast<DWORD>(data.size() + 1)) == ERROR_SUCCESS;
  }

 private:
  HKEY key_ = nullptr;
  std::vector<std::string> names_;
};

TEST(ComPortListTest, TheNumberBehindTheFirstThreeCharactersOfEachEntryIsListed) {
  SerialDeviceMap map;
  std::vector<uint16_t> before;
  ASSERT_TRUE(ListComPorts(before));
  ASSERT_TRUE(map.Add("\\Device\\KralTest0", "COM203"));
  ASSERT_TRUE(map.Add("\\Device\\KralTest1", "CO"));  // too short to be a port
  ASSERT_TRUE(map.Add("\\Device\\KralTest2", "XYZ204 and more"));
  ASSERT_TRUE(map.Add("\\Device\\KralTest3", std::string(1000, 'x')));
  std::vector<uint16_t> ports;
  ASSERT_TRUE(ListComPorts(ports));
  for (const uint16_t port : before) std::erase(ports, port);
  EXPECT_EQ(ports, (std::vector<uint16_t>{203, 204}));
}

TEST(NamedMutexHandleTest, TheValueIsAMutexOwnedByTheCreator) {
  const auto mutex = CreateNamedMutex("kral test mutex");
  ASSERT_TRUE(mutex);
  const HANDLE other = ::OpenMutexA(SYNCHRONIZE, FALSE, "kral test mutex");
  ASSERT_NE(other, nullptr);
  DWORD flags = HANDLE_FLAG_INHERIT;
  EXPECT_TRUE(::GetHandleInformation(reinterpret_cast<HANDLE>(static_cast<uintptr_t>(mutex->value())), &flags));
  EXPECT_EQ(flags & HANDLE_FLAG_INHERIT, 0u);
  ::CloseHandle(other);
}

TEST(MessagePumpTest, MessagesAreTakenAndTheEndOfTheHostIsLeftToIt) {
  MSG message;
  ::PeekMessageW(&message, nullptr, 0, 0, PM_NOREMOVE);
  ASSERT_TRUE(::PostThreadMessageW(::GetCurrentThreadId(), WM_APP + 1, 0, 0));
  PumpPendingMessages();
  EXPECT_FALSE(::PeekMessageW(&message, nullptr, WM_APP + 1, WM_APP + 1, PM_REMOVE));
  ::PostQuitMessage(3);
  PumpPendingMessages();
  ASSERT_TRUE(::PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE));
  EXPECT_EQ(message.message, static_cast<UINT>(WM_QUIT));
  EXPECT_EQ(message.wParam, 3u);
}

TEST(TerminateProcessTest, EndsTheProcessOfThatNameAndNoOther) {
  const test::TempFolder folder;
  std::array<char, MAX_PATH> self{};
  ::GetModuleFileNameA(nullptr, self.data(), static_cast<DWORD>(self.size()));
  const std::string program = folder.Path("KralTestProcess.exe");
  ASSERT_TRUE(::CopyFileA(self.data(), program.c_str(), TRUE));
  STARTUPINFOA startup{};
  startup.cb = sizeof startup;
  PROCESS_INFORMATION process{};
  // Suspended, it never runs: what counts is that it is there.
  ASSERT_TRUE(::CreateProcessA(program.c_str(), nullptr, nullptr, nullptr, FALSE, CREATE_SUSPENDED, nullptr, nullptr,
                               &startup, &process));
  TerminateProcessByName("KralTestProcess");
  EXPECT_EQ(::WaitForSingleObject(process.hProcess, 0), static_cast<DWORD>(WAIT_TIMEOUT));
  TerminateProcessByName("KralTestProcess.exe");
  EXPECT_EQ(::WaitForSingleObject(process.hProcess, 5000), WAIT_OBJECT_0);
  DWORD exit_code = 0;
  ::GetExitCodeProcess(process.hProcess, &exit_code);
  EXPECT_EQ(exit_code, static_cast<DWORD>(STILL_ACTIVE));
  ::CloseHandle(process.hThread);
  ::CloseHandle(process.hProcess);
}

TEST(DeviceNames, AreNoFilesAndTheNullDeviceTakesLines) {
  std::vector<uint8_t> bytes;
  EXPECT_EQ(ReadWholeFile("NUL", 100, bytes), std::errc::invalid_argument);
  EXPECT_EQ(OpenToRead("NUL"), nullptr);
  EXPECT_EQ(OpenToWrite("NUL"), nullptr);
  for (const char* name : {"NUL", "COM7", "\\\\.\\COM7"}) {
    EXPECT_EQ(AtomicFile().Open(name), std::errc::invalid_argument) << name;
  }
  std::FILE* const file = OpenToWriteText("NUL");
  ASSERT_NE(file, nullptr);
  EXPECT_GE(std::fputs("text\n", file), 0);
  EXPECT_EQ(std::fclose(file), 0);
}

TEST(FileNames, BytesThatAreNoUtf8AreOfTheAnsiCodePage) {
  const test::TempFolder folder;
  const std::string name = "gr\xFCn";
  std::array<wchar_t, 8> wide{};
  ASSERT_EQ(::MultiByteToWideChar(CP_ACP, 0, name.c_str(), -1, wide.data(), static_cast<int>(wide.size())), 5);
  EXPECT_FALSE(ReplaceWholeFile(JoinPath(folder.Path(""), name), std::vector<uint8_t>{'1'}));
  EXPECT_NE(::GetFileAttributesW((std::filesystem::path(folder.Path("")) / wide.data()).c_str()),
            INVALID_FILE_ATTRIBUTES);
}

TEST(PseudoTerminalTest, ThereIsNoneAndTheReasonIsTold) {
  std::string error;
  EXPECT_FALSE(OpenPseudoTerminal(error));
  EXPECT_NE(error, "");
}

TEST(StationSwitchTest, ARegistryKeyChoosesTheWriterOfBackups) {
  constexpr const char* kKey = "SOFTWARE\\Kral\\VARN\\UsePkvFile";
  EXPECT_EQ(pkv::ChosenPkvWriter(), pkv::PkvWriter::kStorageClasses);
  HKEY key = nullptr;
  ASSERT_EQ(::RegCreateKeyExA(HKEY_LOCAL_MACHINE, kKey, 0, nullptr, REG_OPTION_VOLATILE, KEY_ALL_ACCESS, nullptr, &key,
                              nullptr),
            ERROR_SUCCESS);
  ::RegCloseKey(key);
  EXPECT_EQ(pkv::ChosenPkvWriter(), pkv::PkvWriter::kVarnPkvFile);
  EXPECT_EQ(::RegDeleteKeyA(HKEY_LOCAL_MACHINE, kKey), ERROR_SUCCESS);
}

}  // namespace
}  // namespace kral
