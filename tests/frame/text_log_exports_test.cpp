// The exported text log functions over a connected handset.
#include "frame/export_call.h"
#include "kral/connection.h"
#include "kral/text_log.h"
#include "tests/support/handset_ports.h"
#include "tests/support/phone_log.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "tests/support/text_lines.h"
#include "tests/support/version_numbers.h"

namespace kral {
namespace {

using Lines = std::vector<std::string>;

class TextLogExports : public testing::Test {
 protected:
  static std::string Body(const std::string& line) { return line.substr(line.find('\t') + 2); }
  Lines Bodies(const std::string& name) const {
    Lines lines = test::TextLines(folder_.Content(name));
    for (auto& line : lines) line = Body(line);
    return lines;
  }

  test::HandsetPorts ports_;
  test::TempFolder folder_;
  const KRAL_HANDLE handle_ = KRAL_ConnectServer(3);
};

TEST_F(TextLogExports, StartStopAndWhatStandsBetween) {
  EXPECT_EQ(KRAL_IsLoggingStarted(handle_), 0);
  EXPECT_EQ(KRAL_StartLogging(handle_, nullptr), 0);
  EXPECT_EQ(KRAL_AddUserMessageToTextLog(handle_, 1, nullptr, 0), 0);
  EXPECT_EQ(KRAL_AddUserAsyncLogMessageToTextLog(handle_, 1, nullptr, 10, 1, 1), 0);
  EXPECT_EQ(KRAL_StartLogging(handle_, folder_.Path("log.txt").c_str()), 1);
  EXPECT_EQ(KRAL_IsLoggingStarted(handle_), 1);
  EXPECT_EQ(KRAL_AddUserMessageToTextLog(handle_, KRAL_LOG_ERR, "100%s", 0), 1);
  EXPECT_EQ(KRAL_SetLogFlags(handle_, 0x212), 1);
  EXPECT_EQ(KRAL_StopLogging(handle_), 1);
  EXPECT_EQ(KRAL_IsLoggingStarted(handle_), 0);
  EXPECT_EQ(Bodies("log.txt"), (Lines{"LOG_FN,VARN DLL Version: KRAL V" + test::VersionNumbers() + ",VENTRIMS",
                                      "LOG_C_HIGH_LEVEL_START,KRAL_IsLoggingStarted", "LOG_ERR,100%s",
                                      "LOG_C_HIGH_LEVEL_START,KRAL_SetLogFlags( uiLogFlags = 0x212 )",
                                      "LOG_FN,KRAL_SetLogFlags(uiLogFlags=0x0212)",
                                      "LOG_C_HIGH_LEVEL_START,KRAL_StopLogging", "LOG_FN,KRAL_StopLogging()"}));
}

TEST_F(TextLogExports, FormattedLinesNeedAStartedLogAndPlainOnesOnlyTheMask) {
  test::PhoneLog log(handle_);
  log.Take();
  ExportCall(handle_, "plain").RunAtOnce([](Diag_FTM&) { return true; });
  ExportCall(handle_, "formatted").Logged(" %d", 1);
  EXPECT_EQ(log.Take(), Lines{"512 plain"});
  KRAL_StartLogging(handle_, folder_.Path("log.txt").c_str());
  KRAL_StopLogging(handle_);
  log.Take();
  ExportCall(handle_, "formatted").Logged(" %d", 2);
  EXPECT_EQ(log.Take(), Lines{"512 formatted 2"}) << "the switch stays set after a stop";
}

TEST_F(TextLogExports, LongFormattedLineIsCut) {
  KRAL_StartLogging(handle_, folder_.Path("log.txt").c_str());
  ExportCall(handle_, "").Logged("%s", std::string(20000, 'm').c_str());
  EXPECT_EQ(Bodies("log.txt").back(), "LOG_C_HIGH_LEVEL_START," + std::string(8015, 'm'));
}

TEST_F(TextLogExports, DisconnectStopsTheLog) {
  KRAL_ConnectServer(3);
  KRAL_StartLogging(handle_, folder_.Path("log.txt").c_str());
  KRAL_DisconnectServer(handle_);
  EXPECT_EQ(KRAL_IsLoggingStarted(handle_), 0);
  const auto lines = Bodies("log.txt");
  ASSERT_GE(lines.size(), 2u);
  EXPECT_EQ(lines.back(), "LOG_FN,KRAL_StopLogging()");
  EXPECT_EQ(lines[1], "LOG_C_HIGH_LEVEL_START,KRAL_DisconnectServer()");
}

TEST_F(TextLogExports, EchoAlsoPrintsTheText) {
  testing::internal::CaptureStdout();
  KRAL_AddUserMessageToTextLog(handle_, 1, "loud %d", 1);
  KRAL_AddUserMessageToTextLog(handle_, 1, "quiet", 0);
  KRAL_AddUserMessageToTextLog(handle_, 1, "two is not one", 2);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "loud %d");
}

struct Asynchronous {
  std::vector<uint8_t> message;
  uint8_t with_code;
  uint8_t with_bytes;
  const char* line;
};

const Asynchronous kAsynchronous[] = {
    {{16, 1, 2}, 0, 0, "8 log packet (3 bytes)"},           {{31, 1}, 1, 0, "8 message 31 (2 bytes)"},
    {{96, 0xAB}, 0, 1, "8 event report (2 bytes): 60 AB "}, {{121}, 1, 1, "8 extended message 121 (1 bytes): 79 "},
    {{146}, 2, 2, "8 asynchronous packet (1 bytes)"},
};

TEST_F(TextLogExports, AsynchronousMessagesAreNamedByTheirFirstByte) {
  test::PhoneLog log(handle_);
  for (const auto& row : kAsynchronous) {
    log.Take();
    EXPECT_EQ(
        KRAL_AddUserAsyncLogMessageToTextLog(handle_, KRAL_LOG_ASYNC, row.message.data(),
                                             static_cast<uint16_t>(row.message.size()), row.with_code, row.with_bytes),
        1);
    EXPECT_EQ(log.Take(), Lines{row.line});
  }
}

TEST_F(TextLogExports, EveryHandsetHasALogOfItsOwn) {
  const KRAL_HANDLE other = KRAL_ConnectServer(4);
  test::PhoneLog log(handle_);
  test::PhoneLog other_log(other);
  log.Take();
  other_log.Take();
  KRAL_AddUserMessageToTextLog(other, 1, "other", 0);
  EXPECT_EQ(log.Take(), Lines{});
  EXPECT_EQ(other_log.Take(), Lines{"1 other"});
}

}  // namespace
}  // namespace kral
