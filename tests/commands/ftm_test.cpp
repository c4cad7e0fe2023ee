// Factory test mode: exact requests under both command codes, mode groups, mode switches, readings.
#include "commands/ftm_settings.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "tests/support/ftm_command_rows.h"
#include "tests/support/ftm_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using test::FtmCommandRow;
using test::FtmTest;
using test::Hex16;

TEST_F(FtmTest, EveryCommandIsListedAndSendsItsExactRequestUnderBothCodes) {
  ASSERT_EQ(std::size(test::kFtmCommandRows), 100u);
  ASSERT_EQ(KRAL_FTM_GetCommandCount(), 100u + 4);
  std::vector<std::pair<uint16_t, std::string>> listed;
  for (uint16_t i = 0; i < KRAL_FTM_GetCommandCount(); ++i) {
    std::array<char, 64> name{};
    uint16_t id = 0;
    ASSERT_EQ(KRAL_FTM_GetCommandInfo(i, &id, name.data(), name.size()), 1);
    listed.emplace_back(id, "KRAL_FTM_" + std::string(name.data()));
    EXPECT_GE(id, listed[i == 0 ? 0 : i - 1].first);
  }
  std::array<char, 4> small{};
  uint16_t id = 0;
  EXPECT_EQ(KRAL_FTM_GetCommandInfo(0, &id, small.data(), small.size()), 0);
  EXPECT_EQ(KRAL_FTM_GetCommandInfo(KRAL_FTM_GetCommandCount(), &id, nullptr, 0), 0);
  const std::array<uint8_t, 3> payload{0xA1, 0xB2, 0xC3};
  for (const FtmCommandRow& row : test::kFtmCommandRows) {
    SCOPED_TRACE(row.name);
    EXPECT_EQ(std::ranges::count(listed, std::pair(row.id, std::string(row.name))), 1);
    std::array<uint8_t, 8> response{};
    uint16_t size = response.size();

    ASSERT_EQ(KRAL_FTM_SET_COMMAND_CODE(handle(), 75), 1);
    handset().Expect("4B 0B 01 00 " + Hex16(row.id) + " A1 B2 C3").Reply("4B 0B 01 00 " + Hex16(row.id) + " 11 22");
    EXPECT_EQ(row.function(handle(), payload.data(), payload.size(), response.data(), &size), 1);
    EXPECT_EQ(HexText(ByteView(response).first(size)), "11 22");

    ASSERT_EQ(KRAL_FTM_SET_COMMAND_CODE(handle(), 59), 1);
    size = response.size();
    handset().Expect("3B 77 00 05 00 " + Hex16(row.id) + " A1 B2 C3").Reply("3B 77 00 05 00 " + Hex16(row.id) + " 33");
    EXPECT_EQ(row.function(handle(), payload.data(), payload.size(), response.data(), &size), 1);
    EXPECT_EQ(HexText(ByteView(response).first(size)), "33");

    // Refusals, and calls that cannot be sent, leave everything as it was.
    size = response.size();
    response.fill(0xCC);
    handset().Expect("3B ...").Reply("14 3B");
    EXPECT_EQ(row.function(handle(), payload.data(), payload.size(), response.data(), &size), 0);
    const size_t traffic = Traffic();
    EXPECT_EQ(row.function(handle(), nullptr, 1, response.data(), &size), 0);
    EXPECT_EQ(row.function(handle(), payload.data(), payload.size(), nullptr, &size), 0);
    EXPECT_EQ(size, response.size());
    EXPECT_EQ(response[0], 0xCC);
    uint16_t no_room = 0;
    EXPECT_EQ(row.function(handle(), payload.data(), payload.size(), response.data(), &no_room), 0);
    EXPECT_EQ(Traffic(), traffic);
  }
}

TEST_F(FtmTest, CommandsWithArgumentsOfTheirOwnSendTheirExactRequests) {
  struct Row {
    uint8_t (*call)(KRAL_HANDLE);
    const char* request75;
    const char* request59;
    const char* line;
  };
  const Row rows[] = {
      {[](KRAL_HANDLE h) { return KRAL_FTM_SET_TX_ON(h); }, "4B 0B 01 00 02 00", "3B 77 00 02 00 02 00",
       "2 KRAL_FTM_SET_TX_ON()"},
      {[](KRAL_HANDLE h) { return KRAL_FTM_SET_TX_OFF(h); }, "4B 0B 01 00 03 00", "3B 77 00 02 00 03 00",
       "2 KRAL_FTM_SET_TX_OFF()"},
      {[](KRAL_HANDLE h) { return KRAL_FTM_SET_MODE(h, 9); }, "4B 0B 01 00 07 00 09 00", "3B 77 00 04 00 07 00 09 00",
       nullptr},
      {[](KRAL_HANDLE h) { return KRAL_FTM_SET_CHAN(h, 1013); }, "4B 0B 01 00 08 00 F5 03",
       "3B 77 00 04 00 08 00 F5 03", nullptr},
  };
  for (const Row& row : rows) {
    KRAL_FTM_SET_COMMAND_CODE(handle(), 75);
    EXPECT_EQ(row.call(handle()), 1);
    EXPECT_EQ(LastRequest(), row.request75);
    if (row.line != nullptr) {
      EXPECT_TRUE(Logged(row.line)) << row.line;
    }
    KRAL_FTM_SET_COMMAND_CODE(handle(), 59);
    EXPECT_EQ(row.call(handle()), 1);
    EXPECT_EQ(LastRequest(), row.request59);
    handset().Expect("3B ...").Reply("18 3B");
    EXPECT_EQ(row.call(handle()), 0);
  }
}

TEST_F(FtmTest, EveryFamilyIsReachedByItsHeader) {
  struct Row {
    uint16_t mode_id;
    uint8_t form;
    uint16_t command;
    const char* request;
  };
  const Row rows[] = {
      {14, 0, 1, "4B 0B 0E 00 01 00 AA"},               // audio: plain
      {8, 1, 117, "4B 0B 08 00 75 00 2F 00 00 00 AA"},  // EVDO: 47 bytes expected
      {8, 1, 112, "4B 0B 08 00 70 00 00 00 00 00 AA"},  // EVDO: a command without a known length
      {8, 1, 134, "4B 0B 08 00 86 00 0D 00 00 00 AA"},
      {10, 1, 6, "4B 0B 0A 00 06 00 0C 02 00 00 AA"},  // AGPS: 524
      {10, 1, 122, "4B 0B 0A 00 7A 00 0A 00 00 00 AA"},
      {7, 1, 113, "4B 0B 07 00 71 00 00 00 00 00 AA"},  // CDMA call: no lengths are known
      {11, 2, 4, "4B 0B 0B 00 04 00 00 00 00 00 AA"},   // PMIC: one byte of argument
  };
  const uint8_t argument = 0xAA;
  std::array<uint8_t, 16> response{};
  for (const Row& row : rows) {
    uint16_t size = response.size();
    EXPECT_EQ(
        KRAL_FTM_SendCommandTo(handle(), row.mode_id, row.form, row.command, &argument, 1, response.data(), &size), 1);
    EXPECT_EQ(LastRequest(), row.request);
  }
  EXPECT_EQ(ModeId(), 1);
  const size_t traffic = Traffic();
  uint16_t size = response.size();
  EXPECT_EQ(KRAL_FTM_SendCommandTo(handle(), 1, 3, 1, nullptr, 0, response.data(), &size), 0);
  EXPECT_EQ(Traffic(), traffic);
}

TEST_F(FtmTest, PayloadThatDoesNotFitIsLeftOutAndTheLogSaysSo) {
  const std::vector<uint8_t> payload(6138, 0x55);
  std::array<uint8_t, 16> response{};
  uint16_t size = response.size();
  EXPECT_EQ(KRAL_FTM_SendCommand(handle(), 53, payload.data(), 6138, response.data(), &size), 1);
  EXPECT_EQ(LastRequest(), "4B 0B 01 00 35 00");
  EXPECT_TRUE(Logged("16 FTM payload of 6138 bytes does not fit the request, which is sent without it"));
}

TEST_F(FtmTest, LegacyLengthByteWrapsAndTheRequestIsStillSent) {
  KRAL_FTM_SET_COMMAND_CODE(handle(), 59);
  const std::vector<uint8_t> payload(300, 0x55);
  std::vector<uint8_t> response(512);
  auto size = static_cast<uint16_t>(response.size());
  EXPECT_EQ(KRAL_FTM_SendCommand(handle(), 11, payload.data(), 300, response.data(), &size), 1);
  const auto request = handset().requests().back();
  ASSERT_EQ(request.size(), 307u);
  EXPECT_EQ(request[3], (307 - 5) & 0xFF);
}

TEST_F(FtmTest, LegacyReplyMustRepeatTheSelector) {
  KRAL_FTM_SET_COMMAND_CODE(handle(), 59);
  for (const char* reply : {"3B 77 01 02 00 02 00", "3B 76 00 02 00 02 00", "3B 77"}) {
    handset().Expect("3B 77 00 02 00 02 00").Reply(reply);
    EXPECT_EQ(KRAL_FTM_SET_TX_ON(handle()), 0) << reply;
  }
  handset().Expect("3B 77 00 02 00 02 00").Reply("3B 77 00");
  EXPECT_EQ(KRAL_FTM_SET_TX_ON(handle()), 1);
}

TEST_F(FtmTest, SettingsAreKeptPerHandleAndSendNothing) {
  const size_t traffic = Traffic();
  uint16_t value = 0;
  EXPECT_EQ(KRAL_FTM_GET_COMMAND_CODE(handle(), &value), 1);
  EXPECT_EQ(value, 75);
  for (const uint16_t refused : std::array<uint16_t, 4>{0, 58, 76, 0x4B4B})
    EXPECT_EQ(KRAL_FTM_SET_COMMAND_CODE(handle(), refused), 0);
  EXPECT_EQ(KRAL_FTM_SET_COMMAND_CODE(handle(), 59), 1);
  EXPECT_EQ(KRAL_FTM_GET_COMMAND_CODE(handle(), &value), 1);
  EXPECT_EQ(value, 59);
  EXPECT_EQ(ModeId(), 1);
  EXPECT_EQ(KRAL_FTM_SET_MODE_ID(handle(), 0xFFFE), 1);
  EXPECT_EQ(ModeId(), 0xFFFE);
  EXPECT_EQ(Traffic(), traffic);
}

TEST_F(FtmTest, ModeIdsAreLoggedWithTheirNames) {
  test::TempFolder folder;
  ASSERT_EQ(KRAL_StartLogging(handle(), folder.Path("ftm.log").c_str()), 1);
  struct Row {
    uint16_t id;
    const char* set;
    const char* get;
  };
  const Row rows[] = {
      {0x8000, "512 KRAL_FTM_SET_MODE_ID( eModeId = 32768(FTM_MODE_ID_PRODUCTION) )",
       "512 KRAL_FTM_GET_MODE_ID(iSystem_Mode = 32768(FTM_MODE_ID_PRODUCTION) ) "},
      {21, "512 KRAL_FTM_SET_MODE_ID( eModeId = 21(FTM_MODE_WCDMA_RX1) )",
       "512 KRAL_FTM_GET_MODE_ID(iSystem_Mode = 21(FTM_MODE_WCDMA_RX1) ) "},
      {37, "512 KRAL_FTM_SET_MODE_ID( eModeId = 37 )", "512 KRAL_FTM_GET_MODE_ID( eModeId = 37 )"},
  };
  for (const Row& row : rows) {
    KRAL_FTM_SET_MODE_ID(handle(), row.id);
    EXPECT_TRUE(Logged(row.set)) << row.set;
    EXPECT_EQ(ModeId(), row.id);
    EXPECT_TRUE(Logged(row.get)) << row.get;
  }
  KRAL_StopLogging(handle());
}

TEST_F(FtmTest, RfModesKeepTheIdsOfTheirGroupAndReplaceAllOthers) {
  struct Group {
    std::vector<uint16_t> modes;
    std::vector<uint16_t> kept;
    uint16_t otherwise;
  };
  std::vector<uint16_t> lte{76, 77};
  for (uint16_t mode = 34; mode <= 39; ++mode) lte.push_back(mode);
  for (uint16_t mode = 41; mode <= 74; ++mode) lte.push_back(mode);
  const Group groups[] = {
      {{2}, {0, 1, 2, 3, 19, 21, 29, 32, 40, 42, 45, 49}, 1},
      {{3, 5, 6, 8, 14, 17, 19, 26, 27, 32, 33}, {0, 3, 32, 40, 45}, 0},
      {{9, 15, 16, 22, 23, 25, 28, 29, 31, 40, 75}, {1, 21}, 1},
      {{10, 11, 12, 18}, {2, 49}, 2},
      {{30}, {}, 19},
      {lte, {47, 48}, 29},
      {{90, 91, 92}, {42, 43}, 42},
  };
  KRAL_ConfigureTimeOut(handle(), 14, 0);
  std::vector<bool> grouped(300);
  for (const Group& group : groups) {
    const std::vector<uint16_t>& kept = group.kept;
    for (const uint16_t mode : group.modes) {
      grouped[mode] = true;
      // The kept ids, and some of other technologies.
      for (const uint16_t id : std::array<uint16_t, 16>{0, 1, 2, 3, 19, 21, 29, 32, 37, 40, 42, 43, 45, 47, 48, 49}) {
        const uint16_t expected = std::ranges::find(kept, id) != kept.end() ? id : group.otherwise;
        KRAL_FTM_SET_MODE_ID(handle(), id);
        ASSERT_EQ(KRAL_FTM_SET_MODE(handle(), mode), 1);
        ASSERT_EQ(LastRequest(), "4B 0B " + Hex16(expected) + " 07 00 " + Hex16(mode)) << "from mode id " << id;
        ASSERT_EQ(ModeId(), expected);
        handset().ClearTrace();
      }
    }
  }
  KRAL_FTM_SET_MODE_ID(handle(), 2);
  for (uint16_t mode = 0; mode < grouped.size(); ++mode) {
    if (!grouped[mode]) {
      EXPECT_EQ(KRAL_FTM_SET_MODE(handle(), mode), 0) << mode;
    }
  }
  EXPECT_EQ(Traffic(), 0u);
  EXPECT_EQ(ModeId(), 2);
  // The refused mode is stored all the same.
  EXPECT_EQ(Kral_ResourceManager::GetPhone(handle())->state<ftm::Settings>().last_rf_mode, 299);
}

TEST_F(FtmTest, GsmModesWaitForTheTransceiver) {
  KRAL_ConfigureTimeOut(handle(), 14, 1);
  EXPECT_EQ(KRAL_FTM_SET_MODE(handle(), 10), 1);
  EXPECT_TRUE(Logged("4 KRAL_FTM_SET_MODE() -- GSM RF Mode set  delay is 1ms."));
  KRAL_ConfigureTimeOut(handle(), 14, 0);
  EXPECT_EQ(KRAL_FTM_SET_MODE(handle(), 18), 1);
  EXPECT_TRUE(Logged("4 KRAL_FTM_SET_MODE() -- GSM RF Mode set delay is zero."));
}

TEST_F(FtmTest, ReadingsFollowWhatWasSet) {
  const auto read = [this](auto function) {
    std::array<uint8_t, 4> response{};
    uint16_t size = response.size();
    EXPECT_EQ(function(handle(), nullptr, 0, response.data(), &size), 1);
    return static_cast<int16_t>(response[0] | response[1] << 8);
  };
  const auto set_power = [this](int16_t power) {
    const std::array<uint8_t, 2> payload{static_cast<uint8_t>(power), static_cast<uint8_t>(power >> 8)};
    std::array<uint8_t, 4> response{};
    uint16_t size = response.size();
    EXPECT_EQ(KRAL_FTM_SET_TX_POWER_DBM(handle(), payload.data(), 2, response.data(), &size), 1);
  };
  const int16_t idle = read(KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL);
  EXPECT_EQ(KRAL_FTM_SET_TX_ON(handle()), 1);
  set_power(0);
  const int16_t low = read(KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL);
  set_power(2000);
  EXPECT_GT(read(KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL), low);
  EXPECT_GT(low, idle);
  EXPECT_EQ(KRAL_FTM_SET_TX_OFF(handle()), 1);
  EXPECT_EQ(read(KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL), idle);

  handset().ftm().SetInputLevel(1, -8000);
  const int16_t agc = read(KRAL_FTM_GET_RX_AGC);
  handset().ftm().SetInputLevel(1, -5000);
  EXPECT_LT(read(KRAL_FTM_GET_RX_AGC), agc);
  EXPECT_EQ(static_cast<int8_t>(read(KRAL_FTM_GET_RSSI)), -50);
}

TEST_F(FtmTest, CommandsAreRefusedOutsideFactoryTestMode) {
  handset().mode().SetState(handset::ModeState::kOnline);
  EXPECT_EQ(KRAL_FTM_SET_CHAN(handle(), 1), 0);
  EXPECT_TRUE(Logged("16 ERROR:\tDIAG_BAD_MODE_F (24) received, command is invalid for the current mode"));
}

}  // namespace
}  // namespace kral
