// The loader stage: requests byte for byte, and loading a flash programmer with all that can go wrong.
#include "download/kova/kova.h"
#include "tests/support/download_fixture.h"
#include "tests/support/failures.h"
#include "tests/support/hex_files.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using test::DownloadTest;

// 32 bytes from 0x00020000 on, started there.
constexpr char kProgrammer[] =
    ":020000040002F8\n"
    ":10000000000102030405060708090A0B0C0D0E0F78\n"
    ":10001000101112131415161718191A1B1C1D1E1F68\n"
    ":0400000500020000F5\n"
    ":00000001FF\n";

class Kova : public DownloadTest {
 protected:
  uint32_t Load(const std::string& file, uint32_t maximum_packet = 32) {
    uint32_t result = UINT32_MAX;
    const uint8_t loaded = KRAL_KOVA_LoadFlashProgrammer(handle(), file.c_str(), maximum_packet, &result);
    EXPECT_EQ(loaded, result == KRAL_KOVA_LOADED ? 1 : 0);
    return result;
  }

  test::TempFolder folder_;
};

TEST_F(Kova, RequestsByteForByte) {
  struct Row {
    const char* request;
    const char* reply;
    std::function<uint8_t()> call;
    const char* line;
  };
  uint8_t version = 0;
  const Row rows[] = {
      {"06", "02", [this] { return KRAL_KOVA_NOP(handle()); }, "Sending Download NOP command"},
      {"0A", "02", [this] { return KRAL_KOVA_RESET(handle()); },
       "Sending the Reset command based on the KOVA Download Protocol"},
      {"0C", "0D 5A", [this, &version] { return KRAL_KOVA_SW_VERSION(handle(), &version); },
       "Sending the request for Software Version"},
  };
  for (const Row& row : rows) {
    handset().Expect(row.request).Reply(row.reply);
    EXPECT_EQ(row.call(), 1) << row.line;
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, row.line));
    handset().Expect(row.request).Reply("03");
    EXPECT_EQ(row.call(), 0) << row.line;
  }
  EXPECT_EQ(version, 0x5A);

  handset().Expect("0F 00 02 00 00 00 10 00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F").Reply("02");
  handset().Expect("0F 00 02 00 10 00 10 10 11 12 13 14 15 16 17 18 19 1A 1B 1C 1D 1E 1F").Reply("02");
  handset().Expect("05 00 02 00 00").Reply("02");
  EXPECT_EQ(Load(folder_.Add("p.hex", kProgrammer)), KRAL_KOVA_LOADED) << LogText();
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "Flash programmer " + folder_.Path("p.hex") + " loaded, sending GO"));
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "GO succeeded"));
}

TEST_F(Kova, FromDiagnosticModeToTheFlashProgrammer) {
  StartLoader();
  uint8_t version = 0;
  EXPECT_EQ(KRAL_KOVA_SW_VERSION(handle(), &version), 1);
  EXPECT_EQ(version, 0x21);
  EXPECT_EQ(Load(folder_.Add("p.hex", kProgrammer)), KRAL_KOVA_LOADED) << LogText();
  EXPECT_EQ(handset().loader().started_at(), 0x20000u);
  EXPECT_EQ(handset().memory().Load(0x2001E, 2), (handset::Bytes{0x1E, 0x1F}));
  EXPECT_EQ(KRAL_STREAM_HELLO(handle(), 1, &block_size_, &window_), 1) << LogText();
}

TEST_F(Kova, ResetLeadsBackToDiagnosticMode) {
  StartLoader();
  EXPECT_EQ(KRAL_KOVA_RESET(handle()), 1);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle()), 1);
}

TEST_F(Kova, EveryFailureHasItsResultAndSaysWhy) {
  constexpr uint8_t kOther = 13;  // the code of no reply here
  const auto good = folder_.Add("p.hex", kProgrammer);
  std::string no_start = kProgrammer;
  no_start.erase(no_start.find(":04000005"), 20);
  const auto startless = folder_.Add("startless.hex", no_start);
  const auto broken = folder_.Add("broken.hex", test::kBrokenHex);
  const auto dropped = folder_.Add("dropped.hex", test::kDroppedHex);
  std::string far = test::kTwoRegionsHex;
  far.replace(far.find("0800F2"), 6, "0009F1");  // beyond 500 KiB
  const auto large = folder_.Add("large.hex", far);
  const auto missing = folder_.Path("missing");
  const auto load = [this](const std::string& file, uint32_t result, uint32_t packet = 32) {
    return [=, this] { return Load(file, packet) != result; };
  };
  const auto other_at = [&](uint64_t nth, uint32_t result) {
    return [&, nth, result] { return Struck(handset::WrongCode(kOther), When::Nth(nth), load(good, result)); };
  };
  const auto silent = [this](const std::function<uint8_t()>& call) {
    return [=, this] { return Silent(When::Nth(1), call); };
  };
  const auto nop = [this] { return KRAL_KOVA_NOP(handle()); };
  const auto version = [this] { return KRAL_KOVA_SW_VERSION(handle(), nullptr); };
  const std::string name = "KRAL_KOVA_LoadFlashProgrammer";
  handset().Expect("0C").Reply("0D");
  test::ExpectFailures(handle(), {{"KRAL_KOVA_SW_VERSION LINK", "no version", version}});
  StartLoader();
  test::ExpectFailures(handle(),
                       {{name + " ARGUMENT", "no file name",
                         [this] { return KRAL_KOVA_LoadFlashProgrammer(handle(), nullptr, 32, nullptr); }},
                        {name + " BAD_FILE", "missing cannot be opened", load(missing, KRAL_KOVA_FILE_NOT_OPENED)},
                        {name + " BAD_FILE line 2", "line 2", load(broken, KRAL_KOVA_FILE_NOT_DECODED)},
                        {name + " BAD_FILE line 4", "large.hex", load(large, KRAL_KOVA_FILE_NOT_DECODED)},
                        {name + " BAD_FILE line 1", "line 1", load(dropped, KRAL_KOVA_DATA_LOST)}});
  EXPECT_TRUE(
      HasLine(KRAL_LOG_ERR, dropped + ": line 1 holds data that have no place in the image, 5 bytes are lost in all"));
  EXPECT_EQ(handset().loader().packets().size(), 0u) << "nothing was sent";
  test::ExpectFailures(handle(),
                       {{name + " BAD_FILE", "0xFFFFFFFF", load(startless, KRAL_KOVA_WRITE_FAILED)},
                        {name + " ARGUMENT", "packets", load(good, KRAL_KOVA_WRITE_FAILED, 1)},
                        {name + " ABORTED", "aborted", [&] { return Aborted(load(good, KRAL_DOWNLOAD_ABORTED)); }},
                        {name + " LINK REPLY 13", "command 15", other_at(2, KRAL_KOVA_WRITE_FAILED)},
                        {name + " LINK REPLY 13", "command 5", other_at(3, KRAL_KOVA_GO_FAILED)},
                        {name + " NO_ANSWER", "command 15", silent(load(good, KRAL_KOVA_WRITE_FAILED))},
                        {"KRAL_KOVA_NOP NO_ANSWER", "command 6", silent(nop)},
                        {"KRAL_KOVA_SW_VERSION NO_ANSWER", "command 12", silent(version)}});
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "image load failed"));
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "GO failed"));
}

TEST(KovaChunks, AreHalfAPacketAndNeverMoreThanAWriteHolds) {
  const std::pair<uint32_t, uint32_t> rows[] = {{0, 0},       {1, 0},       {100, 50},
                                                {8177, 4088}, {8178, 4089}, {UINT32_MAX, 4089}};
  for (const auto& [packet, chunk] : rows) EXPECT_EQ(kova::ChunkSize(packet), chunk) << packet;
}

}  // namespace
}  // namespace kral
