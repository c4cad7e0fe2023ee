// The virtual handset at the end of a pseudo terminal, opened on the other side as the library opens a COM port.
#include "handset/pty_cable.h"

#include "platform/environment.h"
#include "platform/serial_device.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/test.h"

namespace kral::handset {
namespace {

using test::Eventually;

constexpr int kPort = 240;

std::unique_ptr<SerialDevice> OpenDevice(const std::string& path) {
  SetEnvironmentValue("KRAL_COM240", path);
  DeviceResult result;
  auto device = OpenComPort(kPort, result);
  SetEnvironmentValue("KRAL_COM240", std::nullopt);
  EXPECT_TRUE(device) << result.text;
  return device;
}

std::string Ask(SerialDevice& device, std::string_view request) {
  device.Write(EncodeFrame(FromHex(request)), 5000);
  FrameDecoder decoder;
  std::optional<Bytes> payload;
  Bytes buffer(4096);
  while (!payload && device.WaitReadable(5'000)) {
    const size_t count = device.Read(buffer);
    if (count == 0) break;
    decoder.Feed(std::span(buffer).first(count), payload);
  }
  return payload ? HexText(*payload) : "";
}

TEST(PtyCable, ServesAHandsetToWhoeverOpensTheTerminal) {
  VirtualHandset handset;
  std::string error;
  const auto cable = PtyCable::Attach(handset, "", error);
  ASSERT_TRUE(cable) << error;
  const auto device = OpenDevice(cable->device_path());
  ASSERT_TRUE(device);
  EXPECT_EQ(Ask(*device, "2F"), "2F 34 12");
  // More than a terminal buffers, in both directions.
  const std::string big = "7B" + HexText(Bytes(16'000, 0x11));
  EXPECT_EQ(Ask(*device, big), HexText(FromHex(big)));
  // What the handset sends by itself leaves at once.
  handset.SendPacket(FromHex("60 00"));
  EXPECT_TRUE(device->WaitReadable(5'000));
}

TEST(PtyCable, DeviceVanishesAndComesBackUnderItsLink) {
  const std::string link =
      (std::filesystem::temp_directory_path() / ("kral_pty_" + std::to_string(std::random_device()()))).string();
  VirtualHandset handset;
  std::string error;
  auto cable = PtyCable::Attach(handset, link, error);
  ASSERT_TRUE(cable) << error;
  EXPECT_EQ(std::filesystem::read_symlink(link), cable->device_path());
  {
    const auto device = OpenDevice(link);
    ASSERT_TRUE(device);
    EXPECT_EQ(Ask(*device, "2F"), "2F 34 12");
    handset.faults().Add(HangUp(), When::Nth(1));
    EXPECT_EQ(Ask(*device, "2F"), "");
    EXPECT_TRUE(Eventually([&] { return cable->device_path().empty(); }));
    Bytes buffer(16);
    EXPECT_TRUE(Eventually([&] { return device->Read(buffer) == 0 && device->gone(); }));
    EXPECT_FALSE(std::filesystem::exists(std::filesystem::symlink_status(link)));
  }
  handset.PlugIn();
  ASSERT_TRUE(Eventually([&] { return !cable->device_path().empty(); }));
  const auto device = OpenDevice(link);
  ASSERT_TRUE(device);
  EXPECT_EQ(Ask(*device, "2F"), "2F 34 12");
  cable.reset();
  EXPECT_FALSE(std::filesystem::exists(std::filesystem::symlink_status(link)));
}

}  // namespace
}  // namespace kral::handset
