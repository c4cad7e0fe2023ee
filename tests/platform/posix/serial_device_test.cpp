// A tty as a COM port, with a pseudo terminal as the wire.
#include "platform/serial_device.h"

#include <sys/wait.h>
#include <unistd.h>

#include <numeric>

#include "platform/environment.h"
#include "platform/pseudo_terminal.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "transport/line/serial_port.h"

namespace kral {
namespace {

using handset::Bytes;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr int kNumber = 201;
constexpr const char* kVariable = "KRAL_COM201";
constexpr uint32_t kLong = 5000;

template <class Operation>
milliseconds TimeOf(Operation operation) {
  const auto start = steady_clock::now();
  operation();
  return std::chrono::duration_cast<milliseconds>(steady_clock::now() - start);
}

class SerialDeviceTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string error;
    far_ = OpenPseudoTerminal(error);
    ASSERT_TRUE(far_) << error;
    SetEnvironmentValue(kVariable, far_->device_path());
    near_ = Open();
    ASSERT_TRUE(near_);
  }
  void TearDown() override { SetEnvironmentValue(kVariable, std::nullopt); }

  std::unique_ptr<SerialDevice> Open() {
    DeviceResult result;
    auto device = OpenComPort(kNumber, result);
    opened_ = result.error;
    return device;
  }

  // Reads until `count` bytes are there or the wire stays silent.
  template <class End>
  static Bytes ReadAll(End& end, size_t count) {
    Bytes bytes;
    Bytes buffer(4096);
    while (bytes.size() < count && end.WaitReadable(kLong)) {
      const size_t received = end.Read(buffer);
      bytes.insert(bytes.end(), buffer.begin(), buffer.begin() + static_cast<ptrdiff_t>(received));
    }
    return bytes;
  }

  std::unique_ptr<PseudoTerminal> far_;
  std::unique_ptr<SerialDevice> near_;
  DeviceError opened_ = DeviceError::kNone;
};

TEST_F(SerialDeviceTest, EveryByteValuePassesUnchangedBothWays) {
  Bytes all(256);
  std::iota(all.begin(), all.end(), uint8_t{0});
  EXPECT_EQ(near_->Write(all, kLong), all.size());
  EXPECT_EQ(ReadAll(*far_, all.size()), all);
  EXPECT_EQ(far_->Write(all), all.size());
  EXPECT_EQ(ReadAll(*near_, all.size()), all);
}

TEST_F(SerialDeviceTest, ReadsReturnAtOnceWithWhatIsThere) {
  Bytes buffer(16);
  EXPECT_EQ(near_->Read(buffer), 0u);
  EXPECT_FALSE(near_->gone());
  far_->Write(Bytes{1, 2, 3});
  ASSERT_TRUE(near_->WaitReadable(kLong));
  EXPECT_EQ(near_->InputWaiting(), 3u);
  EXPECT_EQ(near_->Read(std::span(buffer).first(2)), 2u);
  EXPECT_EQ(near_->Read(buffer), 1u);
  EXPECT_EQ(near_->InputWaiting(), 0u);
}

TEST_F(SerialDeviceTest, ASecondOpenerIsBusyUntilTheFirstCloses) {
  EXPECT_FALSE(Open());
  EXPECT_EQ(opened_, DeviceError::kBusy);
  near_.reset();
  EXPECT_TRUE(Open());
  EXPECT_EQ(opened_, DeviceError::kNone);
}

TEST_F(SerialDeviceTest, AChildOfAForkDoesNotKeepThePortBusy) {
  std::array<int, 2> pipe{};
  ASSERT_EQ(::pipe(pipe.data()), 0);
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    ::close(pipe[1]);
    char byte = 0;
    [[maybe_unused]] const auto end = ::read(pipe[0], &byte, 1);  // until the parent has closed its end
    ::_exit(0);
  }
  ::close(pipe[0]);
  near_.reset();
  EXPECT_TRUE(Open()) << "the child still has its copy of the descriptor";
  ::close(pipe[1]);
  ::waitpid(child, nullptr, 0);
}

TEST_F(SerialDeviceTest, AChildOfAForkThatClosesDoesNotFreeTheParentsPort) {
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    near_.reset();
    ::_exit(0);
  }
  ASSERT_EQ(::waitpid(child, nullptr, 0), child);
  EXPECT_FALSE(Open());
  EXPECT_EQ(opened_, DeviceError::kBusy);
}

TEST_F(SerialDeviceTest, WhatIsNoSerialDeviceIsNoSuchPort) {
  const test::TempFolder folder;
  for (const auto& path : {folder.Add("file", "text"), folder.Path("missing"), std::string("/dev/null")}) {
    SetEnvironmentValue(kVariable, path);
    EXPECT_FALSE(Open()) << path;
    EXPECT_EQ(opened_, DeviceError::kNoSuchPort) << path;
  }
}

TEST_F(SerialDeviceTest, AWaitEndsWithBytesAWakeOrItsTime) {
  EXPECT_FALSE(near_->WaitReadable(0));
  EXPECT_GE(TimeOf([this] { EXPECT_FALSE(near_->WaitReadable(20)); }), milliseconds(19));
  // One that comes before the wait is not lost, and ends one wait only.
  near_->Wake();
  near_->Wake();
  EXPECT_LT(TimeOf([this] { EXPECT_FALSE(near_->WaitReadable(kLong)); }), milliseconds(kLong));
  EXPECT_GE(TimeOf([this] { EXPECT_FALSE(near_->WaitReadable(20)); }), milliseconds(19));

  std::thread waker([this] { near_->Wake(); });
  EXPECT_LT(TimeOf([this] { EXPECT_FALSE(near_->WaitReadable(kLong)); }), milliseconds(kLong));
  waker.join();
  std::thread writer([this] { far_->Write(Bytes{1}); });
  EXPECT_TRUE(near_->WaitReadable(kLong));
  writer.join();
}

TEST_F(SerialDeviceTest, AVanishedWireIsNoticedAndDoesNotSpin) {
  far_->Write(Bytes{1, 2});
  ASSERT_TRUE(near_->WaitReadable(kLong));
  far_.reset();
  Bytes buffer(16);
  while (!near_->gone() && near_->WaitReadable(kLong)) near_->Read(buffer);
  EXPECT_TRUE(near_->gone());
  EXPECT_EQ(near_->Read(buffer), 0u);
  EXPECT_EQ(near_->Write(buffer, kLong), 0u);
  EXPECT_GE(TimeOf([this] { EXPECT_FALSE(near_->WaitReadable(20)); }), milliseconds(19));
}

TEST_F(SerialDeviceTest, AWriteThatNobodyTakesEndsInItsTime) {
  const Bytes piece(200);
  size_t taken = piece.size();
  milliseconds last{};
  for (int i = 0; i < 1000 && taken == piece.size(); ++i) {
    last = TimeOf([&] { taken = near_->Write(piece, kLong); });
  }
  EXPECT_LT(taken, piece.size());
  EXPECT_GE(last, milliseconds(249));
}

TEST_F(SerialDeviceTest, ARequestThatNobodyReadsIsOverWithItsTimeOut) {
  near_.reset();
  CSerialPort port;
  ASSERT_EQ(port.Open(kNumber), 1u);
  port.SetWriteTimeout(100);
  const Bytes request(16000);
  EXPECT_LT(TimeOf([&] {
              EXPECT_LT(port.Send(request.data(), 16000), 16000u);
              port.Close();
            }),
            milliseconds(2000))
      << "not the 4 s that a piece of it may need";
}

TEST_F(SerialDeviceTest, PurgingDropsWhatHasBeenReceived) {
  far_->Write(Bytes{1, 2, 3});
  ASSERT_TRUE(near_->WaitReadable(kLong));
  near_->PurgeInput();
  EXPECT_FALSE(near_->WaitReadable(0));
}

TEST_F(SerialDeviceTest, RatesAreThoseOfTheKernel) {
  EXPECT_EQ(near_->BaudRate(), 115200u);
  for (const uint32_t rate : {300u, 9600u, 460800u, 4000000u}) {
    EXPECT_EQ(near_->SetBaudRate(rate).error, DeviceError::kNone);
    EXPECT_EQ(near_->BaudRate(), rate);
  }
  for (const uint32_t rate : {0u, 12345u, 0xFFFFFFFFu}) {
    EXPECT_EQ(near_->SetBaudRate(rate).error, DeviceError::kOther);
    EXPECT_EQ(near_->BaudRate(), 4000000u);
  }
}

TEST_F(SerialDeviceTest, AWireWithoutModemLinesSaysSo) {
  EXPECT_EQ(near_->SetDtr(true).error, DeviceError::kOther);
  EXPECT_EQ(near_->SetRts(false).error, DeviceError::kOther);
}

}  // namespace
}  // namespace kral
