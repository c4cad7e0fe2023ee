// The port over a device that records what is asked of it, and over a caller's functions that misbehave.
#include "transport/line/serial_port.h"

#include "tests/support/fake_clock.h"
#include "tests/support/fake_device.h"
#include "tests/support/log_lines.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;
using Lines = LogLines::Lines;

// What the device shall do and what was done to it; outlives the device.
struct Script {
  uint32_t write_takes_ms = 0;
  size_t takes_at_most = SIZE_MAX;
  std::deque<size_t> rooms;  // answers of OutputRoom; 4,096 when used up
  std::deque<Bytes> chunks;  // what the reads bring
  DeviceResult setting;
  bool gone = false;
  bool throws = false;

  Bytes written;
  std::vector<size_t> pieces;
  std::vector<uint32_t> times;  // that each piece was given
  std::vector<std::string> calls;
  int alive = 0;
};

class ScriptedDevice : public test::FakeDevice {
 public:
  ScriptedDevice(Script& script, FakeClock& clock) : script_(script), clock_(clock) { ++script_.alive; }
  ~ScriptedDevice() override { --script_.alive; }

  size_t Write(std::span<const uint8_t> bytes, uint32_t longest_ms) override {
    if (script_.throws) throw std::runtime_error("write");
    script_.pieces.push_back(bytes.size());
    script_.times.push_back(longest_ms);
    const size_t taken = std::min(bytes.size(), script_.takes_at_most);
    script_.written.insert(script_.written.end(), bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(taken));
    clock_.Advance(script_.write_takes_ms);
    return taken;
  }
  size_t OutputRoom() override {
    if (script_.rooms.empty()) return 4096;
    const size_t room = script_.rooms.front();
    script_.rooms.pop_front();
    return room;
  }
  size_t Read(std::span<uint8_t> buffer) override {
    if (script_.throws) throw std::runtime_error("read");
    if (script_.chunks.empty()) return 0;
    Bytes& chunk = script_.chunks.front();
    const size_t count = std::min(buffer.size(), chunk.size());
    std::copy_n(chunk.begin(), count, buffer.begin());
    chunk.erase(chunk.begin(), chunk.begin() + static_cast<ptrdiff_t>(count));
    if (chunk.empty()) script_.chunks.pop_front();
    return count;
  }
  size_t InputWaiting() override { return script_.chunks.empty() ? 0 : script_.chunks.front().size(); }
  bool gone() const override { return script_.gone; }
  bool WaitReadable(uint32_t) override { return !script_.chunks.empty(); }
  void Wake() override { script_.calls.push_back("wake"); }
  DeviceResult SetBaudRate(uint32_t rate) override { return Setting("baud " + std::to_string(rate)); }
  DeviceResult SetDtr(bool high) override { return Setting(high ? "dtr on" : "dtr off"); }
  DeviceResult SetRts(bool high) override { return Setting(high ? "rts on" : "rts off"); }
  void PurgeInput() override { script_.calls.push_back("purge input"); }
  void PurgeBoth() override { script_.calls.push_back("purge both"); }

 private:
  DeviceResult Setting(std::string call) {
    script_.calls.push_back(std::move(call));
    return script_.setting;
  }

  Script& script_;
  FakeClock& clock_;
};

class SerialPortTest : public testing::Test {
 protected:
  SerialPortTest() { port_.SetLog(lines_.log()); }

  void OpenQuietly() {
    ASSERT_EQ(port_.Open(5), 1u);
    script_.calls.clear();
    lines_.Take();
  }

  LogLines lines_;
  FakeClock clock_;
  Script script_;
  DeviceResult open_failure_;
  std::vector<int> opened_;
  CSerialPort port_{clock_, [this](int number, DeviceResult& result) -> std::unique_ptr<SerialDevice> {
                      opened_.push_back(number);
                      result = open_failure_;
                      if (result.error != DeviceError::kNone) return nullptr;
                      return std::make_unique<ScriptedDevice>(script_, clock_);
                    }};
};

TEST_F(SerialPortTest, NumbersOutsideTheRangeDoNotTouchTheSystem) {
  for (const int32_t number : {0, 256, -1, 65534, INT32_MIN}) EXPECT_EQ(port_.Open(number), 0u) << number;
  EXPECT_TRUE(opened_.empty());
  for (const int32_t number : {1, 255}) EXPECT_EQ(port_.Open(number), 1u) << number;
  EXPECT_EQ(opened_, (std::vector<int>{1, 255}));
}

TEST_F(SerialPortTest, OpeningRaisesRtsClearsDtrAndPurges) {
  ASSERT_EQ(port_.Open(5), 1u);
  EXPECT_EQ(script_.calls, (std::vector<std::string>{"rts on", "dtr off", "purge both"}));
  EXPECT_TRUE(script_.written.empty());
  uint32_t rate = 0;
  EXPECT_EQ(port_.GetBaudRate(rate), 1u);
  EXPECT_EQ(rate, 115200u);
  script_.setting = {DeviceError::kOther, 25, "no lines"};
  EXPECT_EQ(port_.Open(5), 1u) << "lines that cannot be set do not fail the opening";
  EXPECT_EQ(port_.last_error(), 0);
}

TEST_F(SerialPortTest, OpenFlagsKeepTheBuffersAndSendTheLoopbackTwice) {
  port_.SetKeepBuffersAtOpen(true);
  port_.SetSendLoopbackAtOpen(true);
  ASSERT_EQ(port_.Open(5), 1u);
  EXPECT_EQ(script_.calls, (std::vector<std::string>{"rts on", "dtr off"}));
  const Bytes frame = {0x7B, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 0x9D, 0x5F, 0x7E};
  Bytes twice = frame;
  twice.insert(twice.end(), frame.begin(), frame.end());
  EXPECT_EQ(script_.written, twice);
}

TEST_F(SerialPortTest, FailedOpeningsHaveTheirCodesAndLogTheReason) {
  const std::vector<std::pair<DeviceError, int32_t>> cases = {
      {DeviceError::kNoSuchPort, -194}, {DeviceError::kBusy, -194},    {DeviceError::kNotPermitted, -194},
      {DeviceError::kNoMemory, -194},   {DeviceError::kBuffers, -193}, {DeviceError::kLineSettings, -191},
      {DeviceError::kOther, -194}};
  for (const auto& [error, code] : cases) {
    open_failure_ = {error, 16, "held by another program"};
    EXPECT_EQ(port_.Open(9), 0u);
    EXPECT_EQ(port_.last_error(), code);
    EXPECT_EQ(port_.open_result().error, error);
    EXPECT_EQ(port_.IsOpen(), 0u);
    EXPECT_EQ(lines_.Take(), Lines{"16 CSerialPort::Open(COM9) failed: held by another program (16)"});
  }
  open_failure_ = {};
  EXPECT_EQ(port_.Open(9), 1u);
  EXPECT_EQ(port_.last_error(), 0);
}

TEST_F(SerialPortTest, ReopeningClosesTheDeviceBeforeItOpensTheNext) {
  ASSERT_EQ(port_.Open(5), 1u);
  ASSERT_EQ(port_.Open(6), 1u);
  EXPECT_EQ(script_.alive, 1);
  EXPECT_EQ(port_.Close(), 1u);
  EXPECT_EQ(script_.alive, 0);
  EXPECT_EQ(port_.Close(), 1u);
}

// What the device does while one request is written, and what comes of it. 0 leaves a limit as it stands; the first
// rows have the limits that a new port has.
struct WriteCase {
  const char* name;
  uint32_t count;
  struct {
    uint32_t size_limit, time_out;
  } limits;
  Script device;
  uint32_t sent;
  std::vector<size_t> pieces;
  std::vector<uint32_t> times;  // that each piece is given; empty: not looked at
};

Script Device(uint32_t write_takes_ms, size_t takes_at_most = SIZE_MAX, std::deque<size_t> rooms = {}) {
  Script script;
  script.write_takes_ms = write_takes_ms;
  script.takes_at_most = takes_at_most;
  script.rooms = std::move(rooms);
  return script;
}

TEST_F(SerialPortTest, WritesAreMadeInPiecesUntilTheDeadline) {
  const WriteCase cases[] = {
      {"more than the limit", 10000, {}, {}, 10000, {4099, 4099, 1802}, {300, 300, 300}},
      {"the limit", 4099, {}, {}, 4099, {4099}, {}},
      {"a byte more", 4100, {}, {}, 4100, {4099, 1}, {}},
      {"nothing", 0, {}, {}, 0, {0}, {}},
      {"late, though all of it was written", 10, {}, Device(301), 0, {10}, {}},
      {"in time by a hair", 10, {}, Device(300), 10, {10}, {}},
      {"the driver goes on taking", 10, {}, Device(0, 4), 10, {10, 6, 2}, {}},
      {"until it has no room", 10, {}, Device(0, 4, {1, 0}), 8, {10, 6}, {}},
      {"a piece has what is left of the time-out", 12, {4, 0}, Device(150), 0, {4, 4, 4}, {300, 150, 1}},
      {"another limit", 7, {3, 0}, {}, 7, {3, 3, 1}, {}},
      {"another time-out", 10, {4099, 900}, Device(301), 10, {10}, {}},
      {"without an end", 10, {0, 0xFFFFFFFF}, Device(5), 10, {10}, {}},
  };
  for (const WriteCase& c : cases) {
    SCOPED_TRACE(c.name);
    OpenQuietly();
    const int alive = script_.alive;
    script_ = c.device;
    script_.alive = alive;
    if (c.limits.size_limit != 0) port_.SetWriteSizeLimit(c.limits.size_limit);
    if (c.limits.time_out != 0) port_.SetWriteTimeout(c.limits.time_out);
    Bytes bytes(c.count);
    for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<uint8_t>(i * 7);
    EXPECT_EQ(port_.Send(bytes.data(), c.count), c.sent);
    EXPECT_EQ(script_.pieces, c.pieces);
    if (!c.times.empty()) {
      EXPECT_EQ(script_.times, c.times);
    }
    if (c.device.takes_at_most == SIZE_MAX) {
      EXPECT_EQ(script_.written, bytes);
    }
    EXPECT_EQ(lines_.Take().front(), "2048 CSerialPort::Send(nbyte=" + std::to_string(c.count) + ")");
  }
  port_.SetWriteSizeLimit(0);
  const uint8_t byte = 0;
  EXPECT_EQ(port_.Send(&byte, 1), 0u);
  EXPECT_EQ(lines_.Take().back(), "4096 CSerialPort::Send(bytes_sent=0) ... OK");
}

TEST_F(SerialPortTest, ADriverThatTakesNothingEndsWithTheDeadlineOrTheDevice) {
  const Bytes bytes(10);
  OpenQuietly();
  script_.takes_at_most = 0;
  const uint32_t start = clock_.TickMs();
  EXPECT_EQ(port_.Send(bytes.data(), 10), 0u);
  EXPECT_EQ(clock_.TickMs() - start, 301u);
  script_.gone = true;
  script_.pieces.clear();
  EXPECT_EQ(port_.Send(bytes.data(), 10), 0u);
  EXPECT_EQ(script_.pieces.size(), 1u);
  EXPECT_TRUE(port_.gone());
}

TEST_F(SerialPortTest, AVanishedDeviceIsLetGoAndStaysGoneUntilThePortIsThereAgain) {
  struct Case {
    DeviceError next_open;
    bool gone;
  };
  for (const Case& c : {Case{DeviceError::kNoSuchPort, true}, Case{DeviceError::kBusy, false},
                        Case{DeviceError::kBuffers, true}, Case{DeviceError::kLineSettings, true},
                        Case{DeviceError::kNotPermitted, false}, Case{DeviceError::kNone, false}}) {
    open_failure_ = {};
    OpenQuietly();
    EXPECT_FALSE(port_.CloseIfGone());
    script_.gone = true;
    EXPECT_TRUE(port_.CloseIfGone());
    EXPECT_FALSE(port_.CloseIfGone()) << "once";
    EXPECT_EQ(script_.alive, 0);
    EXPECT_EQ(port_.IsOpen(), 0u);
    script_.gone = false;
    EXPECT_TRUE(port_.gone());
    open_failure_.error = c.next_open;
    port_.Open(5);
    EXPECT_EQ(port_.gone(), c.gone);
  }
}

TEST_F(SerialPortTest, ReceiveTakesWhatIsThereUpToTheRoom) {
  OpenQuietly();
  Bytes buffer(8);
  EXPECT_EQ(port_.Receive(buffer.data(), 8), 0u);
  EXPECT_TRUE(lines_.Take().empty());
  script_.chunks = {{1, 2, 3}, {4, 5}, {6, 7, 8, 9}};
  EXPECT_EQ(port_.Receive(buffer.data(), 8), 8u);
  EXPECT_EQ(buffer, (Bytes{1, 2, 3, 4, 5, 6, 7, 8}));
  EXPECT_EQ(lines_.Take(), Lines{"4096 CSerialPort::Receive(wRec=8) ... OK"});
  EXPECT_EQ(port_.Receive(buffer.data(), 8), 1u);
  EXPECT_EQ(buffer[0], 9);
}

TEST_F(SerialPortTest, ExceptionsInsideAreLoggedAndLikeAClosedPortGiveZero) {
  Bytes buffer(4);
  for (const bool open : {true, false}) {
    if (open) OpenQuietly();
    script_.throws = open;
    EXPECT_EQ(port_.Send(buffer.data(), 4), 0u);
    EXPECT_EQ(port_.Receive(buffer.data(), 4), 0u);
    if (open) {
      EXPECT_EQ(lines_.Take(),
                (Lines{"2048 CSerialPort::Send(nbyte=4)", "16 CSerialPort::Send(bytes_sent=0)--exception occurred",
                       "16 CSerialPort::Receive(wRec=0, nByte=4)--exception occurred",
                       "16 CSerialPort::Receive() returns=0"}));
      EXPECT_EQ(port_.FlushPCBuffer(), 1u);
      EXPECT_EQ(script_.calls, std::vector<std::string>{"purge input"}) << "the receive buffer only";
      EXPECT_EQ(lines_.Take(), Lines{"2048 CSerialPort::FlushPCBuffer()"});
    }
    port_.Close();
  }
  EXPECT_EQ(port_.FlushPCBuffer(), 0u);
}

TEST_F(SerialPortTest, SettingsRecordTheMappedSystemError) {
  const std::vector<std::pair<DeviceError, int32_t>> cases = {
      {DeviceError::kNone, 0},          {DeviceError::kNoMemory, -195},
      {DeviceError::kNoSuchPort, -198}, {DeviceError::kNotPermitted, -197},
      {DeviceError::kOther, -200},      {DeviceError::kBusy, -200}};
  for (const auto& [error, code] : cases) {
    OpenQuietly();
    script_.setting = {error, 1, ""};
    EXPECT_EQ(port_.SetDTR(1), code);
    EXPECT_EQ(port_.SetRTS(0), code);
    EXPECT_EQ(port_.SetBaudRate(9600), code == 0);
    EXPECT_EQ(port_.last_error(), code);
    uint32_t rate = 0;
    port_.GetBaudRate(rate);
    EXPECT_EQ(rate, code == 0 ? 9600u : 115200u);
    EXPECT_EQ(script_.calls, (std::vector<std::string>{"dtr on", "rts off", "baud 9600"}));
    script_.setting = {};
  }
}

TEST_F(SerialPortTest, AClosedPortSetsNothing) {
  EXPECT_FALSE(port_.SetBaudRate(9600));
  EXPECT_EQ(port_.SetDTR(1), -200);
  EXPECT_FALSE(port_.CanWait());
  EXPECT_FALSE(port_.WaitReadable(0));
  EXPECT_FALSE(port_.gone());
}

// A caller's transport: what the functions shall answer, and what they were given.
struct Caller {
  uint32_t result = 0;
  uint32_t told = 0;
  bool throws = false;
  std::vector<std::string> calls = {};
};

constexpr uintptr_t kHandle = 0x77;

uint32_t UserSend(uintptr_t context, uintptr_t handle, uint32_t count, const uint8_t*, uint32_t* written) {
  auto& caller = *reinterpret_cast<Caller*>(context);
  if (caller.throws) throw 1;
  caller.calls.push_back("send " + std::to_string(handle) + " " + std::to_string(count) + " " +
                         std::to_string(*written));
  if (caller.told != 0) *written = caller.told;
  return caller.result;
}

uint32_t UserReceive(uintptr_t context, uintptr_t handle, uint32_t* count, uint8_t* buffer) {
  auto& caller = *reinterpret_cast<Caller*>(context);
  if (caller.throws) throw 1;
  caller.calls.push_back("receive " + std::to_string(handle) + " " + std::to_string(*count));
  std::fill_n(buffer, std::min(*count, caller.told), uint8_t{0x5A});
  *count = caller.told;
  return caller.result;
}

uint32_t UserFlush(uintptr_t context, uintptr_t handle) {
  auto& caller = *reinterpret_cast<Caller*>(context);
  if (caller.throws) throw 1;
  caller.calls.push_back("flush " + std::to_string(handle));
  return caller.result;
}

class UserTransportTest : public SerialPortTest {
 protected:
  UserTransportTest() {
    EXPECT_EQ(
        port_.SetUserDefinedTransport(reinterpret_cast<uintptr_t>(&caller_), kHandle, UserSend, UserReceive, UserFlush),
        1u);
  }

  Caller caller_;
  Bytes buffer_ = Bytes(8);
};

TEST_F(UserTransportTest, EveryOperationGoesToTheFunctionsAndWhatIsNotPossibleIsCutAndLogged) {
  const auto bind = [this](bool whole) {
    return port_.SetUserDefinedTransport(reinterpret_cast<uintptr_t>(&caller_), kHandle, whole ? UserSend : nullptr,
                                         whole ? UserReceive : nullptr, whole ? UserFlush : nullptr);
  };
  const struct {
    const char* name;
    Caller caller;
    uint32_t sent, received, flushed;
    std::ptrdiff_t errors;
  } kRows[] = {
      {"nothing told", {}, 8, 0, 0, 0},
      {"fewer", {.told = 3}, 3, 3, 0, 0},
      {"failures", {.result = 1, .told = 8}, 0, 0, 0, 0},
      {"exceptions", {.throws = true}, 0, 0, 0, 4},
      {"more than there is room for", {.told = 9}, 8, 8, 0, 2},
      {"an incomplete set", {}, 1, 1, 1, 0},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.name);
    const bool whole = row.name != std::string_view("an incomplete set");
    EXPECT_EQ(bind(whole), whole ? 1u : 0u);
    EXPECT_EQ(port_.IsOpen(), whole ? 1u : 0u);
    EXPECT_TRUE(port_.user_defined());
    EXPECT_FALSE(port_.CanWait());
    caller_ = row.caller;
    lines_.Take();
    EXPECT_EQ(port_.Send(buffer_.data(), 8), row.sent);
    EXPECT_EQ(port_.Receive(buffer_.data(), 8), row.received);
    EXPECT_EQ(port_.FlushPCBuffer(), row.flushed);
    const Lines lines = lines_.Take();
    EXPECT_EQ(std::ranges::count_if(lines, [](const auto& line) { return line.starts_with("16 "); }), row.errors)
        << testing::PrintToString(lines);
    const std::vector<std::string> all = {"send 119 8 8", "receive 119 8", "flush 119"};
    EXPECT_EQ(caller_.calls, whole && !row.caller.throws ? all : std::vector<std::string>());
  }
  EXPECT_TRUE(opened_.empty());
}

TEST_F(UserTransportTest, LineSettingsAreRefusedEachInItsOwnWay) {
  EXPECT_EQ(port_.SetRTS(1), 1);
  EXPECT_EQ(port_.last_error(), 0);
  EXPECT_EQ(port_.SetDTR(1), 0);
  EXPECT_EQ(port_.last_error(), -99);
  EXPECT_FALSE(port_.SetBaudRate(9600));
  EXPECT_EQ(port_.last_error(), -99);
  uint32_t rate = 1;
  EXPECT_EQ(port_.GetBaudRate(rate), 1u);
  EXPECT_EQ(rate, 0u);
}

TEST_F(UserTransportTest, OpeningANumberGoesBackToTheDevice) {
  ASSERT_EQ(port_.Open(5), 1u);
  EXPECT_FALSE(port_.user_defined());
  EXPECT_EQ(port_.Send(buffer_.data(), 8), 8u);
  EXPECT_EQ(script_.written.size(), 8u);
  EXPECT_TRUE(caller_.calls.empty());
}

}  // namespace
}  // namespace kral
