// Numbers of ports that lead to other devices meanwhile, or to the same one: handsets on pseudo terminals.
#include "handset/pty_cable.h"
#include "handset/virtual_handset.h"
#include "kral/kral.h"
#include "platform/environment.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

constexpr uint16_t kNamedPort = 241;
constexpr const char* kNameInFront = "KRAL_COM241";  // of the link
constexpr uint16_t kSecondNumber = 242;

class PortNames : public testing::Test {
 protected:
  PortNames() { SetEnvironmentValue("KRAL_PORT_DIR", folder_.Path("")); }
  ~PortNames() override {
    KRAL_DisconnectAllServers();
    SetEnvironmentValue(kNameInFront, std::nullopt);
    SetEnvironmentValue("KRAL_PORT_DIR", before_);
  }

  std::unique_ptr<handset::PtyCable> Attach(handset::VirtualHandset& handset, uint32_t serial,
                                            const std::string& link = "") {
    handset.nv().Set(handset::kSerialNumberItem, handset::ByteWriter().U32(serial).Take());
    std::string error;
    auto cable = handset::PtyCable::Attach(handset, link, error);
    EXPECT_TRUE(cable) << error;
    return cable;
  }
  static uint32_t SerialNumber(KRAL_HANDLE handle) {
    uint32_t serial = 0;
    KRAL_DIAG_READ_ESN_F(handle, &serial);
    return serial;
  }
  static KRAL_ERROR Error(KRAL_HANDLE handle) {
    KRAL_ERROR error{};
    KRAL_GetLastError(handle, &error);
    return error;
  }

  test::TempFolder folder_;
  const std::optional<std::string> before_ = EnvironmentValue("KRAL_PORT_DIR");
};

TEST_F(PortNames, ALostPortIsOpenedAgainByTheNameThatItHadAndByNoneBehindIt) {
  handset::VirtualHandset first;
  handset::VirtualHandset second;
  const auto cable = Attach(first, 1);
  const auto other_cable = Attach(second, 2, folder_.Path("com241"));
  ASSERT_TRUE(cable && other_cable);
  SetEnvironmentValue(kNameInFront, cable->device_path());
  const KRAL_HANDLE handle = KRAL_ConnectServer(kNamedPort);
  ASSERT_EQ(SerialNumber(handle), 1u);

  first.HangUp();
  SetEnvironmentValue(kNameInFront, std::nullopt);
  EXPECT_EQ(SerialNumber(handle), 0u) << "the link was not what was connected";
  EXPECT_EQ(SerialNumber(handle), 0u);
  EXPECT_EQ(Error(handle).code, uint32_t{KRAL_ERROR_LOST}) << Error(handle).text;

  first.PlugIn();
  ASSERT_TRUE(test::Eventually([&] { return !cable->device_path().empty(); }));
  SetEnvironmentValue(kNameInFront, cable->device_path());
  EXPECT_EQ(SerialNumber(handle), 1u) << "under its name again, which leads to another device";

  SetEnvironmentValue(kNameInFront, std::nullopt);
  EXPECT_EQ(KRAL_ConnectServer(kNamedPort), handle);
  EXPECT_EQ(SerialNumber(handle), 2u) << "a connect chooses anew";
}

TEST_F(PortNames, ASecondNumberOfADeviceIsNoOtherProgram) {
  handset::VirtualHandset handset;
  const auto cable = Attach(handset, 1, folder_.Path("com241"));
  ASSERT_TRUE(cable);
  std::filesystem::create_symlink(cable->device_path(), folder_.Path("com242"));
  const KRAL_HANDLE handle = KRAL_ConnectServer(kNamedPort);
  ASSERT_EQ(SerialNumber(handle), 1u);
  KRAL_PORT_INFO info{};
  EXPECT_EQ(KRAL_GetPortInfo(kSecondNumber, 1, &info), 1);
  EXPECT_EQ(info.state, uint32_t{KRAL_PORT_OPEN});
  EXPECT_EQ(info.answers, uint32_t{KRAL_ANSWERS_NOT_ASKED});
  const KRAL_HANDLE second = KRAL_ConnectServer(kSecondNumber);
  EXPECT_EQ(SerialNumber(second), 0u);
  EXPECT_EQ(Error(second).code, uint32_t{KRAL_ERROR_PORT_IN_USE});
  EXPECT_STREQ(Error(second).text, "the device of COM242 is open in this program already");
}

}  // namespace
}  // namespace kral
