// The framer over a scripted port: writes, raw reads, and the switch from data to diagnostic mode.
#include "transport/line/hdlc_framer.h"

#include "tests/support/fake_clock.h"
#include "tests/support/log_lines.h"
#include "tests/support/plain_codec.h"
#include "tests/support/test.h"
#include "transport/line/serial_port.h"

namespace kral {
namespace {

using handset::Bytes;
using Lines = test::LogLines::Lines;
using Steps = std::vector<std::string>;

const std::string kCommand = "AT$XJDMG\r";

// Remembers what is asked of it, and gives its answers piece by piece, one per read.
struct ScriptedPort : CSerialPort {
  uint32_t Send(const uint8_t* bytes, uint32_t count) override {
    sent.assign(bytes, bytes + count);
    steps.push_back(sent == Bytes{0x7E} ? "flag" : std::string(sent.begin(), sent.end()));
    if (answers_from_write > 0 && steps.back() == kCommand) --answers_from_write;
    return std::min(count, accepts);
  }
  uint32_t Receive(uint8_t* buffer, uint32_t count) override {
    largest_read = std::max(largest_read, count);
    if (read_takes_ms != 0) clock->Advance(read_takes_ms);
    if (answers_from_write > 0 || answers.empty()) return 0;
    const std::string answer = std::exchange(answers.front(), {});
    answers.pop_front();
    std::copy_n(answer.begin(), std::min<size_t>(answer.size(), count), buffer);
    return static_cast<uint32_t>(answer.size());
  }
  bool SetBaudRate(uint32_t rate) override {
    steps.push_back(std::to_string(rate));
    return true;
  }
  uint32_t GetBaudRate(uint32_t& rate) const override {
    rate = 57600;
    return 1;
  }
  uint32_t FlushPCBuffer() override {
    steps.push_back("purge");
    return 1;
  }

  test::FakeClock* clock = nullptr;
  uint32_t read_takes_ms = 0;
  uint32_t accepts = 0xFFFFFFFF;
  int answers_from_write = 0;  // silent until the command has been written so often
  std::deque<std::string> answers;
  uint32_t largest_read = 0;
  Bytes sent;
  Steps steps;
};

class HdlcFramer : public testing::Test {
 protected:
  HdlcFramer() {
    port_.clock = &clock_;
    framer_.SetPort(&port_);
    framer_.SetLogger(lines_.log());
  }

  uint32_t Send(const Bytes& payload, uint8_t force_leading_flag = 0) {
    return framer_.Send(payload.data(), static_cast<uint32_t>(payload.size()), 900, force_leading_flag);
  }

  test::LogLines lines_;
  test::FakeClock clock_;
  ScriptedPort port_;
  CProtAHDLC framer_{clock_};
};

TEST_F(HdlcFramer, WithoutAPortNothingIsDone) {
  CProtAHDLC alone(clock_);
  uint8_t byte = 0x55;
  uint32_t count = 1;
  EXPECT_EQ(alone.SetPort(nullptr), 0U);
  EXPECT_EQ(alone.Send(&byte, 1, 0, 0), 0U);
  EXPECT_EQ(alone.ReceiveRaw(&byte, count, 0), 0U);
  EXPECT_EQ(alone.FlushPhoneBuffer(), 0U);
  EXPECT_EQ(alone.Data2DM(5), 0U);
  EXPECT_EQ(byte, 0x55);
  EXPECT_EQ(alone.SetStartFlag(1), 0);
  EXPECT_EQ(alone.SetStartFlag(0), 1);
  EXPECT_EQ(alone.SetRawDataFlag(7), 7U);
}

TEST_F(HdlcFramer, RequestGoesOutInOneWriteAndIsLogged) {
  EXPECT_EQ(Send({0x0C}), 1U);
  EXPECT_EQ(port_.sent, PlainFrame({0x0C}));
  EXPECT_EQ(port_.steps.size(), 1U);
  EXPECT_EQ(lines_.Take(),
            (Lines{"64 CProtAHDLC::Send(iSize=1, iTimeout=900)", "128 CProtAHDLC::Send(_iALen=4) ... OK"}));
}

TEST_F(HdlcFramer, ShortWriteFails) {
  port_.accepts = 3;
  EXPECT_EQ(Send({0x0C}), 0U);
  EXPECT_EQ(lines_.Take().back(), "128 CProtAHDLC::Send(_iALen=4) ... FAIL");
}

TEST_F(HdlcFramer, RawDataGoesOutUnchanged) {
  framer_.SetRawDataFlag(2);
  framer_.SetStartFlag(1);
  EXPECT_EQ(Send({0x7E, 0x7D, 0x00}), 1U);
  EXPECT_EQ(port_.sent, (Bytes{0x7E, 0x7D, 0x00}));
  EXPECT_EQ(Send(Bytes(16381, 0x7E)), 1U);
  EXPECT_EQ(port_.sent, Bytes(16381, 0x7E));
}

TEST_F(HdlcFramer, TooLongPayloadsAreRefusedBeforeAnythingIsWritten) {
  const Lines refusal = {"256 Error. String size exceeds maximum buffer size."};
  for (const uint32_t raw : {0U, 1U}) {
    framer_.SetRawDataFlag(raw);
    EXPECT_EQ(Send(Bytes(16382, 0x31)), 0U);
    EXPECT_EQ(framer_.Send(nullptr, 0xFFFFFFFF, 0, 0), 0U);
  }
  framer_.SetRawDataFlag(0);
  EXPECT_EQ(Send(Bytes(16381, 0x7E)), 0U);
  EXPECT_TRUE(port_.steps.empty());
  const Lines lines = lines_.Take();
  EXPECT_EQ(std::ranges::count(lines, refusal[0]), 5);
  EXPECT_EQ(Send(Bytes(16381, 0x31)), 1U);
}

TEST_F(HdlcFramer, RawReadFillsTheBufferAndGivesWhatArrived) {
  Bytes buffer(8, 0x00);
  uint32_t count = 6;
  EXPECT_EQ(framer_.ReceiveRaw(buffer.data(), count, 10), 0U);
  EXPECT_EQ(count, 0U);
  EXPECT_EQ(buffer, (Bytes{0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00}));
  EXPECT_EQ(lines_.Take(), (Lines{"256 Device received 0 bytes"}));

  port_.answers = {"OK"};
  port_.read_takes_ms = 11;
  count = 6;
  EXPECT_EQ(framer_.ReceiveRaw(buffer.data(), count, 10), 1U);
  EXPECT_EQ(count, 2U);
  EXPECT_EQ(buffer, (Bytes{'O', 'K', 0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00}));
  EXPECT_EQ(lines_.Take(), (Lines{"256 Timeout = 10 ms"}));

  port_.answers = {"OK"};
  EXPECT_EQ(framer_.ReceiveRaw(buffer.data(), count, 0), 1U);
  EXPECT_TRUE(lines_.Take().empty());
}

TEST_F(HdlcFramer, SwitchTriesEachRateOfItsMaskTwiceUntilOneAnswers) {
  const Steps back{"57600", "purge", "flag", "purge"};
  const Steps slow{"19200", "purge", "flag", kCommand}, fast{"115200", "purge", "flag", kCommand};
  const Steps again{kCommand};
  const std::deque<std::string> too_much{std::string(19, 'x'), std::string(4000, 'x'), "OK"};
  const struct {
    const char* name;
    uint8_t mask;
    uint32_t raw;
    std::deque<std::string> answers;
    int answers_from_write;
    uint32_t succeeds;
    std::vector<Steps> steps;
    uint32_t slept;  // 200 per attempt that fails, 50 to settle
  } kRows[] = {
      {"at the first rate", 0xFF, 0, {"\r\n", "O", "K\r\n"}, 0, 1, {slow, back}, 50},
      {"never", 0x05, 0, {}, 0, 0, {slow, again, fast, again, back}, 4 * 200},
      {"at the second attempt", 0x04, 0, {"OK"}, 2, 1, {fast, again, back}, 200 + 50},
      {"other bits of the mask", 0xFA, 0, {}, 0, 0, {back}, 0},
      {"raw data, at the rate at which it asked", 0x04, 1, {"OK"}, 0, 1, {fast, {"purge", "flag", "purge"}}, 50},
      {"an area that is full and begins empty again", 0x04, 0, too_much, 0, 1, {fast, again, back}, 50},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.name);
    port_.steps.clear();
    port_.answers = row.answers;
    port_.answers_from_write = row.answers_from_write;
    framer_.SetRawDataFlag(row.raw);
    lines_.Take();
    const uint32_t before = clock_.slept();
    EXPECT_EQ(framer_.Data2DM(row.mask), row.succeeds);
    Steps steps;
    for (const Steps& part : row.steps) steps.insert(steps.end(), part.begin(), part.end());
    EXPECT_EQ(port_.steps, steps);
    EXPECT_EQ(clock_.slept() - before, row.slept);
    EXPECT_EQ(lines_.Take()[0], "64 CProtAHDLC::Data2DM(baudrate_mask=" + std::to_string(row.mask) + ")");
  }
  EXPECT_EQ(port_.largest_read, 20U);
}

}  // namespace
}  // namespace kral
