// The text log itself: which lines go where, how they look in the file and in the callback's record.
#include <regex>

#include "base/hex_dump.h"
#include "base/text_log.h"
#include "base/text_log_format.h"
#include "tests/support/fake_clock.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "tests/support/text_lines.h"

namespace kral {
namespace {

using Record = std::array<uint8_t, 1008>;

class TextLog : public testing::Test {
 protected:
  TextLog() {
    current_ = this;
    log_.SetCallback(&TextLog::OnLine, 77);
  }
  ~TextLog() override { current_ = nullptr; }

  static void OnLine(uint32_t size, const void* record, uint32_t handle) {
    EXPECT_EQ(size, 1008u);
    EXPECT_EQ(handle, 77u);
    std::memcpy(current_->records_.emplace_back().data(), record, size);
  }

  std::string Text(size_t index) const { return reinterpret_cast<const char*>(records_.at(index).data() + 8); }

  // The line without its time stamp and the comma behind that.
  static std::string Body(const std::string& line) { return line.substr(line.find('\t') + 2); }

  std::vector<std::string> FileLines(const std::string& name) const { return test::TextLines(folder_.Content(name)); }

  static inline TextLog* current_ = nullptr;
  test::FakeClock clock_;
  test::TempFolder folder_;
  DataLogFileHandler log_{clock_};
  std::vector<Record> records_;
};

// A single bit gives its own name; a combination that of its lowest bit, and no indentation.
TEST_F(TextLog, LinesShowTheNameOfTheLowestBitAndTheIndentationOfTheWholeFlag) {
  std::vector<std::pair<uint32_t, std::string>> categories = {
      {0x80000000, "INVALID LOG LEVEL,x"}, {0x6, "LOG_FN,x"}, {0x60, "LOG_IO_AHDLC,x"}, {0xC00, "LOG_IO_DEV,x"}};
  uint32_t bit = 1;
  for (const char* line :
       {"LOG_IO,x", "LOG_FN,x", "LOG_RET,x", "LOG_ASYNC,x", "LOG_ERR,x", "LOG_IO_AHDLC,  x", "LOG_FN_AHDLC,  x",
        "LOG_RET_AHDLC,  x", "LOG_INF_AHDLC,  x", "LOG_C_HIGH_LEVEL_START,x", "LOG_IO_DEV,    x", "LOG_FN_DEV,    x",
        "LOG_RET_DEV,    x", "LOG_INF_DEV,    x", "LOG_C_HIGH_LEVEL_STOP,x", "LOG_NV_MANAGER_DEBUG,x",
        "INVALID LOG LEVEL,x", "INVALID LOG LEVEL,x"}) {
    categories.emplace_back(std::exchange(bit, bit << 1), line);
  }
  EXPECT_EQ(CategoryName(0), "LOG_IO");
  log_.SetFlags(0xFFFFFFFF);
  log_.Start(folder_.Path("log.txt").c_str());
  for (const auto& [flag, line] : categories) log_.WriteLine(flag, "x");
  const auto lines = FileLines("log.txt");
  ASSERT_EQ(lines.size(), categories.size());
  for (size_t i = 0; i < lines.size(); ++i) EXPECT_EQ(Body(lines[i]), categories[i].second);
}

TEST_F(TextLog, NothingIsWrittenBeforeAMaskIsSet) {
  for (uint32_t bit = 0; bit < 32; ++bit) log_.WriteLine(1u << bit, "x");
  EXPECT_TRUE(records_.empty());
  EXPECT_FALSE(log_.Wants(0xFFFFFFFF));
}

TEST_F(TextLog, StartActivatesTheStoredMask) {
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogIoAhdlc, "not in the default mask");
  log_.WriteLine(kLogIoAhdlc | kLogErr, "either bit will do");
  log_.SetFlags(kLogIoAhdlc);  // its own line is still under the old mask
  log_.WriteLine(kLogIoAhdlc, "now it is");
  log_.WriteLine(kLogErr, "and this is not");
  log_.Stop();
  log_.Start(folder_.Path("log2.txt").c_str());
  log_.WriteLine(kLogIoAhdlc, "later starts keep it");

  const auto lines = FileLines("log.txt");
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_EQ(Body(lines[0]), "LOG_ERR,either bit will do");
  EXPECT_EQ(Body(lines[1]), "LOG_FN,KRAL_SetLogFlags(uiLogFlags=0x0020)");
  EXPECT_EQ(Body(lines[2]), "LOG_IO_AHDLC,  now it is");
  EXPECT_EQ(FileLines("log2.txt").size(), 1u);
}

TEST_F(TextLog, ClockStampIsMinutesSecondsAndMillisecondsAndATab) {
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogFn, "text");
  const std::string line = FileLines("log.txt").at(0);
  EXPECT_TRUE(std::regex_match(line, std::regex("[0-5]\\d:[0-5]\\d:\\d{3}\\t,LOG_FN,text"))) << line;
}

TEST_F(TextLog, RelativeStampCountsFromTheLastStop) {
  log_.SetRelativeTimeStamps(true);
  clock_.Advance(500);
  log_.Stop();
  clock_.Advance(42);
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogFn, "text");
  EXPECT_EQ(FileLines("log.txt").at(0), "42\t,LOG_FN,text");
}

TEST_F(TextLog, RecordHoldsFlagMillisecondsAndText) {
  log_.SetFlags(0xFFFFFFFF);
  clock_.Advance(0x01020304);
  log_.WriteLine(0x18000, "%s %d", "text", 7);
  Record expected{};
  expected[1] = 0x80;  // the low half of the flag
  expected[4] = 4;
  expected[5] = 3;
  expected[6] = 2;
  expected[7] = 1;
  std::memcpy(expected.data() + 8, "text 7", 6);
  ASSERT_EQ(records_.size(), 1u);
  EXPECT_EQ(records_[0], expected);
}

TEST_F(TextLog, LongMessageReachesTheFileWholeAndTheCallbackCut) {
  const std::string message(2000, 'm');
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogFn, "%s", message.c_str());
  EXPECT_EQ(Body(FileLines("log.txt").at(0)), "LOG_FN," + message);
  EXPECT_EQ(Text(0), message.substr(0, 999));
  EXPECT_EQ(records_[0][1007], 0);
  log_.SetFlags(kLogIoDev);
  log_.WriteLine(kLogIoDev, "%s", std::string(20000, 'm').c_str());
  EXPECT_EQ(Body(FileLines("log.txt").back()), "LOG_IO_DEV,    " + std::string(12295 - 4, 'm')) << "beyond the buffer";
}

TEST_F(TextLog, SecondStartFinishesTheOldFileAndTruncatesTheNewOne) {
  const std::string second = folder_.Path("second.txt");
  folder_.Add("second.txt", "what was there\n");
  log_.Start(folder_.Path("first.txt").c_str());
  log_.WriteLine(kLogFn, "one");
  log_.Start(second.c_str());
  EXPECT_EQ(FileLines("second.txt").at(0), "what was there") << "until the first line";
  log_.WriteLine(kLogFn, "two");

  const auto first = FileLines("first.txt");
  ASSERT_EQ(first.size(), 3u);
  EXPECT_EQ(Body(first[1]), "LOG_FN,KRAL_StartLogging( sLogFile = " + second + ")");
  EXPECT_EQ(Body(first[2]).size(), std::strlen("LOG_FN,2024-05-31, 23:59:01"));
  ASSERT_EQ(FileLines("second.txt").size(), 1u);
  EXPECT_EQ(Body(FileLines("second.txt")[0]), "LOG_FN,two");

  log_.Start(second.c_str());
  log_.WriteLine(kLogFn, "three");
  ASSERT_EQ(FileLines("second.txt").size(), 1u) << "the same name is truncated too";
  EXPECT_EQ(Body(FileLines("second.txt")[0]), "LOG_FN,three");
}

TEST_F(TextLog, StopClosesTheFileButNotTheCallback) {
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogFn, "before");
  EXPECT_TRUE(log_.started_result());
  log_.Stop();
  EXPECT_FALSE(log_.started_result());
  EXPECT_TRUE(log_.logging_started()) << "the switch of the formatting logger deliberately stays set";
  log_.WriteLine(kLogFn, "after");
  EXPECT_EQ(Text(records_.size() - 1), "after");

  const auto lines = FileLines("log.txt");
  ASSERT_EQ(lines.size(), 2u);
  EXPECT_EQ(Body(lines[1]), "LOG_FN,KRAL_StopLogging()");
  std::error_code error;
  EXPECT_TRUE(std::filesystem::remove(folder_.Path("log.txt"), error)) << "the file is still open";
}

TEST_F(TextLog, LinesThatTheCallbackCausesGoToTheFileOnlyAndItsExceptionsStayWithIt) {
  static DataLogFileHandler* log;
  log = &log_;
  static int calls;
  calls = 0;
  log_.Start(folder_.Path("log.txt").c_str());
  log_.SetCallback(
      [](uint32_t, const void*, uint32_t) {
        if (++calls < 100) log->WriteLine(kLogFn, "of the callback");
        throw 1;
      },
      0);
  for (int i = 0; i < 2; ++i) EXPECT_NO_THROW(log_.WriteLine(kLogFn, "text"));
  EXPECT_EQ(calls, 2);
  EXPECT_EQ(FileLines("log.txt").size(), 4u);
  // A file that cannot be opened costs the callback nothing.
  log_.Start(folder_.Path("no/such/folder/log.txt").c_str());
  log_.WriteLine(kLogFn, "text");
  EXPECT_GT(calls, 2);
  EXPECT_TRUE(log_.started_result());
}

// What a handset calls itself must not pass for a line of the library, nor reach a terminal as a command.
TEST_F(TextLog, ControlCharactersOfArgumentsAreEscaped) {
  log_.Start(folder_.Path("log.txt").c_str());
  log_.WriteLine(kLogFn, "model %s",
                 "A\n00:00:000\t,LOG_ERR,forged\r\x1B[2J\x7F\xC2\x9B"
                 "gr\xC3\xBCn");
  log_.WriteLine(kLogErr, "ERROR:\t%s\n", "B\n");
  log_.WriteLine(kLogErr, "%s", (std::string(12280, 'x') + std::string(20, '\x1B')).c_str());

  const std::vector<std::string> expected = {
      "LOG_FN,model A\\x0A00:00:000\t,LOG_ERR,forged\\x0D\\x1B[2J\\x7F\\xC2\\x9Bgr\xC3\xBCn",
      "LOG_ERR,ERROR:\tB\\x0A",
      "",  // the second line's own end
      "LOG_ERR," + std::string(12280, 'x') + "\\x1B\\x1B\\x1B",
  };
  const auto lines = FileLines("log.txt");
  ASSERT_EQ(lines.size(), expected.size());
  for (size_t i = 0; i < lines.size(); ++i) EXPECT_EQ(lines[i].empty() ? "" : Body(lines[i]), expected[i]);
  EXPECT_EQ(Text(0), expected[0].substr(7)) << "the callback is given the same";
}

TEST_F(TextLog, CategoriesAreOffUntilRegisteredAsOn) {
  log_.RegisterCategory("quiet", false);
  log_.RegisterCategory("loud", true);
  EXPECT_FALSE(log_.IsCategoryOn("quiet"));
  EXPECT_TRUE(log_.IsCategoryOn("loud"));
  EXPECT_FALSE(log_.IsCategoryOn("unknown"));
}

TEST(HexDump, IsTwoUpperCaseDigitsAndABlankPerByte) {
  EXPECT_EQ(HexDump(std::array<uint8_t, 3>{0x00, 0x7E, 0xAF}), "00 7E AF ");
  EXPECT_EQ(HexDump({}), "");
}

}  // namespace
}  // namespace kral
