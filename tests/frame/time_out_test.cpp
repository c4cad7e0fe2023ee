// The time-outs of a handset: defaults, refusals, and the file of a station.
#include "kral/connection.h"
#include "kral/text_log.h"
#include "tests/support/handset_ports.h"
#include "tests/support/phone_log.h"
#include "tests/support/scripted_server.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

constexpr int32_t kDefaults[] = {4000,  80,  200, 3000, 6000, 10000, 10000, 900,  900, 3000,
                                 10000, 150, 140, 3000, 100,  100,   5000,  2000, 500, 10000};

class TimeOuts : public testing::Test {
 protected:
  test::HandsetPorts ports_;
};

TEST_F(TimeOuts, HaveTheirDefaultsAndAreStoredPerHandset) {
  const KRAL_HANDLE one = KRAL_ConnectServer(3);
  const KRAL_HANDLE other = KRAL_ConnectServer(4);
  for (uint32_t id = 0; id < 20; ++id) {
    EXPECT_EQ(KRAL_ConfigureTimeOut(one, id, static_cast<int32_t>(1000 + id)), 1);
    EXPECT_EQ(KRAL_GetTimeOut(one, id), static_cast<int32_t>(1000 + id));
    EXPECT_EQ(KRAL_GetTimeOut(other, id), kDefaults[id]) << id;
  }
  for (const uint32_t id : {20u, 21u, 1000u, 0xFFFFFFFFu}) {
    EXPECT_EQ(KRAL_ConfigureTimeOut(one, id, 5), 0) << id;
    EXPECT_EQ(KRAL_GetTimeOut(one, id), 0) << id;
  }
}

TEST_F(TimeOuts, ServerModeRefusesThoseOfTheTransportAndAsksTheDownloadForItsOwn) {
  test::ScriptedServer server;
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  const test::PhoneLog log(handle, KRAL_LOG_FN);
  for (const uint32_t id : {7u, 8u}) {
    EXPECT_EQ(KRAL_GetTimeOut(handle, id), 0);
    EXPECT_EQ(KRAL_ConfigureTimeOut(handle, id, 1234), 0);
    EXPECT_EQ(KRAL_GetTimeOut(handle, id), 1234) << "refused, and stored";
  }
  EXPECT_EQ(log.Count("2 KRAL_ConfigureTimeOut() - error, this timeout cannot be set in ORBT mode"), 2u);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 20), 0);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 19), kDefaults[19]);
  EXPECT_EQ(KRAL_ConfigureTimeOut(handle, 20, 77), 1);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 20), 77);
  EXPECT_EQ(KRAL_ConfigureTimeOut(handle, 21, 78), 0);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 21), 0);
  const auto calls = server.TakeCalls();
  EXPECT_EQ(std::ranges::count(calls, "make KRAL-SW Download"), 1);
}

TEST_F(TimeOuts, CallsAreTold) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  KRAL_StartLogging(handle, "");  // no file: only so that formatted lines are written
  test::PhoneLog log(handle);
  KRAL_ConfigureTimeOut(handle, 0, 5);
  KRAL_GetTimeOut(handle, 0);
  const auto lines = log.Take();
  EXPECT_EQ(std::vector<std::string>(lines.end() - 5, lines.end()),
            (std::vector<std::string>{
                "512 KRAL_ConfigureTimeOut( eTimeOutId = 0, iNewValue_ms = 5 )",
                "2 KRAL_ConfigureTimeOut( eTimeOutId = 0, iNewValue_ms = 5)",
                "512 KRAL_GetTimeOut",
                "2 KRAL_GetTimeOut( eTimeOutId = 0 )",
                "4 KRAL_GetTimeOut( eTimeOutId = 0, iNewValue_ms = 5)",
            }));
}

// --- WLANEVKConfig.txt ----------------------------------------------------------------------------------------------

struct StationFile {
  const char* name;
  std::string text;
  int32_t liveness;
  int32_t server_connect;
};

const StationFile kStationFiles[] = {
    {"the one known word", "ConnectDelay 500\n", 500, 500},
    {"among others, the last counts", "Other 1\nConnectDelay\t500\n\nConnectDelay 600", 600, 600},
    {"Windows line ends", "ConnectDelay 500\r\n", 500, 500},
    {"another spelling", "connectdelay 500\n", 80, 200},
    {"no number", "ConnectDelay soon\n", 80, 200},
    {"a number out of range", "ConnectDelay 99999999999999999999\n", 80, 200},
    {"beyond 80 characters", std::string(80, ' ') + "ConnectDelay 500\n", 80, 200},
    {"empty", "", 80, 200},
};

TEST_F(TimeOuts, StationFileSetsTheConnectDelay) {
  const test::TempFolder folder;
  const auto home = std::filesystem::current_path();
  std::filesystem::current_path(std::filesystem::path(folder.Path("here")).parent_path());
  for (const auto& file : kStationFiles) {
    folder.Add("WLANEVKConfig.txt", file.text);
    const KRAL_HANDLE handle = KRAL_ConnectServer(3);
    EXPECT_EQ(KRAL_GetTimeOut(handle, 1), file.liveness) << file.name;
    EXPECT_EQ(KRAL_GetTimeOut(handle, 2), file.server_connect) << file.name;
    EXPECT_EQ(KRAL_GetTimeOut(handle, 0), 4000) << file.name;
    KRAL_DisconnectServer(handle);
  }
  std::filesystem::current_path(home);
}

}  // namespace
}  // namespace kral
