// The packets of the streaming download as they go over the wire, and what is made of every kind of answer to them.
#include "download/stream/stream_hello.h"
#include "handset/line/bytes.h"
#include "tests/support/download_fixture.h"
#include "tests/support/failures.h"
#include "tests/support/scripted_server.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using test::DownloadTest;

std::string HexOf(std::string_view text) {
  return HexText(handset::Bytes(text.begin(), text.end())) + " ";
}

const std::string kHelloRequest = "01 " + HexOf("VRMO fast download protocol host") + "02 02 01";
const std::string kTarget = "02 " + HexOf("VRMO fast download protocol targ");

class StreamWire : public DownloadTest {
 protected:
  void ExpectNops() {
    for (int i = 0; i < 3; ++i) handset().Expect("09 4E 4F 50 00").Reply("0A");
  }
  uint8_t Hello(uint32_t variant = 1) { return KRAL_STREAM_HELLO(handle(), variant, &block_size_, &window_); }

  test::TempFolder folder_;
};

TEST_F(StreamWire, HelloTellsTheLimitsAndEveryFrameBeginsWithAFlag) {
  ExpectNops();
  handset().Expect(kHelloRequest).Reply(kTarget + "02 02 00 10 00 00 00 00 00 08 02 AA BB 20 00");
  handset().ClearTrace();
  EXPECT_EQ(Hello(), 1) << LogText();
  EXPECT_EQ(block_size_, 0x1000u);
  EXPECT_EQ(window_, 0x20);
  for (const char* line :
       {"Sending NOP to flash programmer, 1", "Sending NOP to flash programmer, 3",
        "Sending HELLO to flash programmer, 1", "HELLO command succeeded, block size 4096, window size 32"}) {
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, line)) << line;
  }
  const auto bytes = handset().received();
  EXPECT_EQ(bytes[0], 0x7E);
  EXPECT_EQ(std::ranges::count(bytes, 0x7E), 8) << "a flag in front of and behind each of four frames";
  EXPECT_EQ(Kral_ResourceManager::GetPhone(handle())->transport().framer().SetStartFlag(0), 0) << "left on";
}

TEST(StreamHelloReply, IsCheckedToItsLastField) {
  struct Row {
    const char* what;
    std::string tail;  // behind the version bytes
    int window;        // -1: refused
  };
  const std::string limits = "02 02 00 10 00 00 00 00 00 08 ";
  const Row rows[] = {
      {"the shortest", limits + "02 AA BB 20 00", 0x20},
      {"47 bytes", limits + "01 AA 20 00", -1},
      {"no id and something behind", limits + "00 05 00 EE EE", 5},
      {"a long id", limits + "04 AA AA AA AA FF FF", 0xFFFF},
      {"an id up to the end", limits + "04 AA AA AA AA", -1},
      {"an id far behind the end", limits + "FF AA AA AA AA AA", -1},
      {"blocks of nothing", "02 02 00 00 00 00 00 00 00 08 02 AA BB 20 00", -1},
      {"half a window", limits + "03 AA AA AA 20", -1},
  };
  for (const Row& row : rows) {
    const auto reply = stream::ParseHelloReply(FromHex(kTarget + row.tail));
    EXPECT_EQ(reply ? reply->window : -1, row.window) << row.what;
  }
  auto wrong_magic = FromHex(kTarget + rows[0].tail);
  wrong_magic[32] ^= 1;
  EXPECT_FALSE(stream::ParseHelloReply(wrong_magic));
  EXPECT_EQ(stream::WriterWindow(32), 31u);
  EXPECT_EQ(stream::WriterWindow(0), 65535u) << "sixteen bits wrap around";
}

TEST_F(StreamWire, HelloIsRepeatedAndThenGivenUp) {
  ExpectNops();
  handset().Expect(kHelloRequest).Reply("02 00");
  handset().Expect(kHelloRequest).Reply("13 01");
  EXPECT_EQ(Hello(), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "Sending HELLO to flash programmer, 2"));
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "HELLO command failed, block size 0, window size 0"));
  // Silence to everything costs bounded time, and the other variants ask for nothing.
  settings().handshake_limit_ms = 10;
  handset().faults().Add(handset::Ignore(), handset::When::Always());
  EXPECT_EQ(Hello(), 0);
  handset().faults().Clear();
  settings().handshake_limit_ms = 1000;
  for (const uint32_t variant : {0u, 2u, 3u}) {
    ExpectNops();
    EXPECT_EQ(Hello(variant), 0) << variant;
  }
  EXPECT_EQ(block_size_, 0u) << "outputs are for successes";
}

TEST_F(StreamWire, SecurityModeAndPartitionTable) {
  handset().Expect("17 01").Reply("18");
  EXPECT_EQ(KRAL_STREAM_SECURITY_MODE(handle(), 1), 1);
  handset().Expect("17 02").Reply("13 17 02");
  EXPECT_EQ(KRAL_STREAM_SECURITY_MODE(handle(), 2), 0);

  struct Row {
    const char* reply;
    uint8_t accepted;
    int status;  // -1: untouched
    const char* line;
  };
  const Row rows[] = {
      {"1A 00", 1, 0, ""},
      {"1A 01", 0, 1, "partition : error use override"},
      {"1A 02", 0, 2, "partition : error bad format"},
      {"1A 03", 0, 3, "partition : error erase fail"},
      {"1A C8", 0, 0xC8, "partition : invalid status 200"},
      {"1A", 0, -1, ""},
      {"1A 00 00", 0, -1, ""},
  };
  const auto table = folder_.Add("table", "ABC");
  const std::string request = "19 01 41 42 43 " + HexOf(std::string(509, '\0'));
  for (const Row& row : rows) {
    ClearLog();
    handset().Expect(request).Reply(row.reply);
    uint8_t status = 0xEE;
    EXPECT_EQ(KRAL_STREAM_PARTITION_TABLE(handle(), table.c_str(), 1, &status), row.accepted) << row.reply;
    EXPECT_EQ(status, row.status < 0 ? 0xEE : row.status) << row.reply;
    EXPECT_EQ(ErrorText(), *row.line == 0 ? "" : "16 " + std::string(row.line) + "\n");
  }
  handset().ClearTrace();
  const auto missing = folder_.Path("missing");
  EXPECT_EQ(KRAL_STREAM_PARTITION_TABLE(handle(), missing.c_str(), 0, nullptr), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "partition : failed to open file " + missing));
  const auto long_table = folder_.Add("long", std::string(513, 'A'));
  EXPECT_EQ(KRAL_STREAM_PARTITION_TABLE(handle(), long_table.c_str(), 0, nullptr), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "partition : file exceeds 512 bytes"));
  EXPECT_EQ(KRAL_STREAM_PARTITION_TABLE(handle(), nullptr, 0, nullptr), 0);
  EXPECT_TRUE(handset().requests().empty());
}

TEST_F(StreamWire, OneImageByteForByte) {
  block_size_ = 4;
  window_ = 2;
  handset().Expect("1B 07 48 49").Reply("1C 00");
  handset().Expect("07 00 00 02 00 01 02 03 04").Reply("08 00 00 02 00");
  handset().Expect("07 04 00 02 00 05 06").Reply("08 04 00 02 00");
  handset().Expect("15").Reply("16");
  EXPECT_EQ(WriteMem({1, 2, 3, 4, 5, 6}, 0x20000, KRAL_STREAM_MULTI_IMAGE, {'H', 'I'}), KRAL_STREAM_WRITTEN)
      << LogText();
  for (const char* line :
       {"Enqueued address 0x00020000, size 0x6, device 0\n", "Streaming start max write 4, window size 1\n",
        "Reply address 0x00020004 size 0x2\n", "Sent 2 Acknowledged 2\n"}) {
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, line)) << line << LogText();
  }
  // Without opening and closing packets.
  handset().Expect("07 00 00 00 00 AB").Reply("08 00 00 00 00");
  EXPECT_EQ(WriteMem({0xAB}, 0, KRAL_STREAM_NOR), KRAL_STREAM_WRITTEN) << LogText();
  // Nothing is opened and closed.
  handset().Expect("1B 07").Reply("1C 00");
  handset().Expect("15").Reply("16");
  EXPECT_EQ(WriteMem({}), KRAL_STREAM_WRITTEN) << LogText();
}

void KRAL_CALL AbortAtTheEnd(KRAL_HANDLE handle, uint32_t done, uint32_t total, uintptr_t) {
  if (done == total) KRAL_AbortDownload(handle);
}

TEST_F(StreamWire, AbortsAreSeenInEveryStep) {
  block_size_ = 8;
  window_ = 5;
  KRAL_ConfigureDownloadCallBack(handle(), AbortAtTheEnd, 0);
  handset().Expect("1B 07").Reply("1C 00");
  handset().Expect("07 00 00 00 00 55").Reply("08 00 00 00 00");
  handset().ClearTrace();
  EXPECT_EQ(WriteMem({0x55}), KRAL_DOWNLOAD_ABORTED);
  EXPECT_EQ(handset().requests().size(), 2u) << "the image was not closed";

  KRAL_STREAM_ConfigureHello(handle(), 2, UINT32_MAX);
  settings().handshake_limit_ms = 10;
  handset().faults().Add(handset::Ignore(), handset::When::Always());
  std::atomic<bool> over{false};
  std::thread caller([&] {
    for (; !over; std::this_thread::sleep_for(std::chrono::milliseconds(5))) {
      if (HasLine(KRAL_LOG_RET, "Sending HELLO to flash programmer, 1")) KRAL_AbortDownload(handle());
    }
  });
  EXPECT_EQ(Hello(), 0);
  over = true;
  caller.join();
  EXPECT_FALSE(HasLine(KRAL_LOG_RET, "Sending HELLO to flash programmer, 2"));
}

TEST_F(StreamWire, EveryWrongAnswerHasItsLineAndItsResult) {
  struct Row {
    const char* open;
    const char* write;
    const char* close;
    uint32_t result;
    const char* line;
  };
  const Row rows[] = {
      {"1C 01", nullptr, nullptr, KRAL_STREAM_OPEN_FAILED, "multi-image open failed\n"},
      {"1C", nullptr, nullptr, KRAL_STREAM_OPEN_FAILED, "multi-image open failed\n"},
      {"1C 00 00", nullptr, nullptr, KRAL_STREAM_OPEN_FAILED, "multi-image open failed\n"},
      {"13 1B", nullptr, nullptr, KRAL_STREAM_OPEN_FAILED, "multi-image open failed\n"},
      {"1C 00", "08 00 00 00", nullptr, KRAL_STREAM_WRITE_FAILED, "write error - invalid response length\n"},
      {"1C 00", "08 00 00 00 00 00", nullptr, KRAL_STREAM_WRITE_FAILED, "WriteResponse bad length 6\n"},
      {"1C 00", "0D 00 00 00 00", nullptr, KRAL_STREAM_WRITE_FAILED, "WriteResponse bad command 13\n"},
      {"1C 00", "0D 00 00 00 00", nullptr, KRAL_STREAM_WRITE_FAILED, "write error - invalid response code\n"},
      {"1C 00", "08", nullptr, KRAL_STREAM_WRITE_FAILED, "yes: size too small\n"},
      {"1C 00", "0D 00 00 00 00", nullptr, KRAL_STREAM_WRITE_FAILED, "failed during image write\n"},
      {"1C 00", "08 00 00 00 00", "16 00", KRAL_STREAM_CLOSE_FAILED,
       "error - response to MI close: size 2 expected 1\n"},
      {"1C 00", "08 00 00 00 00", "15", KRAL_STREAM_CLOSE_FAILED, "error - MI close failed: status 2 rsp 15\n"},
  };
  block_size_ = 8;
  window_ = 5;
  for (const Row& row : rows) {
    ClearLog();
    handset().Expect("1B 07").Reply(row.open);
    if (row.write != nullptr) handset().Expect("07 00 00 00 00 55").Reply(row.write);
    if (row.close != nullptr) handset().Expect("15").Reply(row.close);
    EXPECT_EQ(WriteMem({0x55}), row.result) << row.line;
    EXPECT_TRUE(HasLine(KRAL_LOG_ERR, row.line)) << row.line << LogText();
  }
  block_size_ = 0;
  EXPECT_EQ(WriteMem({0x55}, 0, KRAL_STREAM_NOR), KRAL_STREAM_BAD_ARGUMENT) << "and nothing was sent";
}

TEST(DownloadThroughAServer, IsRefusedWithoutTraffic) {
  test::ScriptedServer server;
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  server.TakeCalls();
  uint8_t version = 0;
  uint32_t block_size = 0;
  uint16_t window = 0;
  uint32_t result = 0;
  EXPECT_EQ(KRAL_KOVA_LoadFlashProgrammer(handle, "", 100, &result), 0);
  test::ExpectFailures(handle, {{"KRAL_KOVA_NOP ARGUMENT", "phone server", [=] { return KRAL_KOVA_NOP(handle); }}});
  EXPECT_EQ(KRAL_KOVA_RESET(handle) + KRAL_KOVA_SW_VERSION(handle, &version), 0);
  EXPECT_EQ(KRAL_STREAM_HELLO(handle, 1, &block_size, &window) + KRAL_STREAM_SECURITY_MODE(handle, 1), 0);
  EXPECT_EQ(KRAL_STREAM_PARTITION_TABLE(handle, "", 0, nullptr), 0);
  EXPECT_EQ(KRAL_STREAM_WriteImageFile(handle, "", 0, 0, nullptr, KRAL_STREAM_NOR, 100, 2, &result), 0);
  EXPECT_EQ(KRAL_STREAM_WriteImageMem(handle, &version, 1, 0, 0, nullptr, 0, KRAL_STREAM_NOR, 100, 2, &result), 0);
  EXPECT_EQ(result, KRAL_STREAM_WRITE_FAILED);
  EXPECT_EQ(server.TakeCalls(), std::vector<std::string>{});
  KRAL_DisconnectServer(handle);
}

}  // namespace
}  // namespace kral
