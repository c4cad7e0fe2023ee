// The whole way of a download through the exports: from a handset that has nothing but its boot loader, and from one
// that is sent there, to a handset that tells the version of what was downloaded.
#include "download/boot/kivrat.h"
#include "download/link/download_settings.h"
#include "frame/diag_ftm.h"
#include "handset/loaders/software_image.h"
#include "kral/kral.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/failures.h"
#include "tests/support/handset_ports.h"
#include "tests/support/hex_files.h"
#include "tests/support/phone_log.h"
#include "tests/support/scripted_server.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

class FlashAll : public testing::Test {
 protected:
  void SetUp() override {
    handset_.boot_loader()->Set({.piece_size = 1000});
    Use(KRAL_Kivrat_ConnectServer(7));
  }

  void Use(KRAL_HANDLE handle) {
    handle_ = handle;
    KRAL_SetReceiveMode(handle_, 1);
    phone_ = Kral_ResourceManager::GetPhone(handle_);
    phone_->state<kivrat::Settings>().settle_ms = 0;
    phone_->state<kivrat::Settings>().read_time_out_ms = 200;
    phone_->state<download::Settings>().handshake_limit_ms = 100;
    KRAL_STREAM_ConfigureHello(handle_, 1, 0);
    KRAL_ConfigureDownloadCallBack(handle_, &FlashAll::OnProgress, reinterpret_cast<uintptr_t>(this));
  }

  // An open connection would read the hello.
  void StartInBootLoader() {
    phone_->ClosePort();
    handset_.SetStartMode(handset_.boot_loader());
    handset_.Restart();
  }

  uint8_t Flash(std::vector<const char*> images) {
    static constexpr uint8_t kTypes[] = {3, 4};
    figures_.clear();
    return KRAL_Kivrat_FlashAll(handle_, programmer_.c_str(), images.data(), kTypes,
                                static_cast<uint32_t>(images.size()), &result_, &failed_image_);
  }

  std::string Revision() {
    uint32_t hardware = 0;
    uint32_t model = 0;
    char revision[128] = {};
    char name[128] = {};
    KRAL_DIAG_EXT_BUILD_ID_F(handle_, &hardware, &model, revision, name);
    return revision;
  }

  static void KRAL_CALL OnProgress(KRAL_HANDLE handle, uint32_t done, uint32_t total, uintptr_t value) {
    auto& self = *reinterpret_cast<FlashAll*>(value);
    self.figures_.emplace_back(done, total);
    KRAL_ConfigureDownloadCallBack(handle, &FlashAll::OnProgress, value);  // at any time: the whole stays one
    if (done >= self.abort_at_) KRAL_AbortDownload(handle);
    if (done >= self.replug_at_) self.Replug();
  }

  // So quickly that nobody but the thread that waits for bytes has noticed.
  void Replug() {
    replug_at_ = UINT32_MAX;
    handset_.HangUp();
    EXPECT_TRUE(test::Eventually([&] { return !phone_->transport().connected(); }));
    handset_.PlugIn();
  }

  static std::string Text(const Bytes& bytes) { return {bytes.begin(), bytes.end()}; }

  test::HandsetPorts ports_;
  handset::VirtualHandset& handset_ = ports_.Add(7);
  test::TempFolder folder_;
  const Bytes software_ = handset::MakeSoftware("VHS-2.0.1", 5000);
  const std::string programmer_ = folder_.Add("programmer", Text(handset::MakeProgrammer(2500)));
  const std::string image_ = folder_.Add("software.bin", Text(software_));
  const std::string hex_ =
      folder_.Add("table.hex", ":020000040004F6\n:0400000001020304F2\n:00000001FF\n");  // four bytes at 0x40000
  KRAL_HANDLE handle_ = 0;
  std::shared_ptr<Diag_FTM> phone_;
  uint32_t result_ = 77;
  uint32_t failed_image_ = 77;
  uint32_t abort_at_ = UINT32_MAX;
  uint32_t replug_at_ = UINT32_MAX;
  std::vector<std::pair<uint32_t, uint32_t>> figures_;
};

TEST_F(FlashAll, GoesFromColdToTheNewSoftware) {
  StartInBootLoader();
  ASSERT_EQ(Flash({image_.c_str(), hex_.c_str()}), 1) << result_;
  EXPECT_EQ(result_, KRAL_STREAM_WRITTEN);
  EXPECT_EQ(failed_image_, KRAL_FLASH_NO_IMAGE);
  EXPECT_EQ(handset_.flash().Load(0, software_.size()), software_);
  EXPECT_EQ(handset_.flash().Load(0x40000, 5), handset::FromHex("01 02 03 04 FF"));
  const auto images = handset_.programmer().images();
  ASSERT_EQ(images.size(), 2u);
  EXPECT_EQ(images[0].type, 3);
  EXPECT_TRUE(images[1].closed);

  ASSERT_FALSE(figures_.empty());
  EXPECT_TRUE(std::ranges::is_sorted(figures_));
  EXPECT_EQ(figures_.front(), std::pair(0u, 7504u));
  EXPECT_EQ(figures_.back(), std::pair(7504u, 7504u)) << "2500 of the programmer, 5000 and 4 of the images";

  EXPECT_EQ(KRAL_KOVA_RESET(handle_), 1);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 1);
  EXPECT_EQ(Revision(), "VHS-2.0.1");
}

TEST_F(FlashAll, FollowsAHandsetThatComesBackAsAnotherDevice) {
  handset_.mode().SetLoader(std::make_shared<handset::Reappearance>(handset_.boot_loader(), 250, 40));
  Use(KRAL_ConnectServer(7));
  EXPECT_EQ(Revision(), "VHS-1.0.105-R2");
  ASSERT_EQ(KRAL_DIAG_DLOAD_F(handle_), 1);
  KRAL_Kivrat_Configure(handle_, 100, 5, 0);
  EXPECT_EQ(Flash({image_.c_str()}), 1) << result_;
  EXPECT_EQ(handset_.appearances(), 2u);
  handset_.Restart();
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 1);
  EXPECT_EQ(Revision(), "VHS-2.0.1");
}

TEST_F(FlashAll, LooksAtEveryFileBeforeTheFirstPacket) {
  const std::string missing = folder_.Path("missing");
  const std::string broken = folder_.Add("broken.hex", test::kBrokenHex);
  const std::string dropped = folder_.Add("dropped.hex", test::kDroppedHex);
  const std::string second_region = folder_.Add("second.hex", test::kTwoRegionsHex);
  const auto flash = [&](std::vector<const char*> images, uint32_t result, uint32_t failed = KRAL_FLASH_NO_IMAGE) {
    return [=, this] {
      const uint8_t flashed = Flash(images);
      EXPECT_EQ(std::pair(result_, failed_image_), std::pair(result, failed));
      return flashed;
    };
  };
  const std::string name = "KRAL_Kivrat_FlashAll";
  const char* const image = image_.c_str();
  test::ExpectFailures(
      handle_,
      {{name + " ARGUMENT", "no images", flash({}, KRAL_STREAM_BAD_ARGUMENT)},
       {name + " ARGUMENT", "", flash({image, nullptr}, KRAL_STREAM_BAD_ARGUMENT, 1)},
       {name + " BAD_FILE", "missing cannot be opened", flash({missing.c_str()}, KRAL_STREAM_FILE_NOT_OPENED, 0)},
       {name + " BAD_FILE line 2", "", flash({image, broken.c_str()}, KRAL_STREAM_FILE_NOT_DECODED, 1)},
       {name + " BAD_FILE line 1", "", flash({image, dropped.c_str()}, KRAL_STREAM_DATA_LOST, 1)},
       {name + " BAD_FILE", "second region", flash({second_region.c_str()}, KRAL_STREAM_BAD_IMAGE, 0)}});
  folder_.Add("programmer", "");
  test::ExpectFailures(handle_, {{name + " BAD_FILE", "", flash({image}, KRAL_STREAM_FILE_NOT_OPENED)}});
  EXPECT_EQ(ports_.opens().size(), 0u);
}

TEST_F(FlashAll, TellsTheStepThatFailedAndLeavesThePortUsable) {
  test::ExpectFailures(handle_, {{"KRAL_Kivrat_FlashAll NO_ANSWER", "hello", [&] { return Flash({image_.c_str()}); }}});
  EXPECT_EQ(result_, KRAL_FLASH_CONNECT_FAILED);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 1);
  handset_.boot_loader()->SetProgrammer(nullptr);
  StartInBootLoader();
  EXPECT_EQ(Flash({image_.c_str()}), 0);
  EXPECT_EQ(result_, KRAL_FLASH_HELLO_FAILED);
  folder_.Add("programmer", Text(handset::MakeProgrammer(2500)).substr(0, 1200));
  StartInBootLoader();
  EXPECT_EQ(Flash({image_.c_str()}), 0);
  EXPECT_EQ(result_, KRAL_FLASH_PROGRAMMER_FAILED);
  EXPECT_TRUE(ports_.open().empty());
}

TEST_F(FlashAll, DoesNotGoOnWithWhatCameBackOnThePort) {
  const std::string large = folder_.Add("large", std::string(300000, 'x'));
  StartInBootLoader();
  replug_at_ = 20000;
  phone_->state<download::Settings>().acknowledge_limit_ms = 500;
  test::ExpectFailures(handle_, {{"KRAL_Kivrat_FlashAll LOST", "command 7", [&] { return Flash({large.c_str()}); }}});
  EXPECT_EQ(failed_image_, 0u);
}

TEST_F(FlashAll, CanBeAbortedInEveryPart) {
  const std::string data = folder_.Add("data", std::string(5000, 'x'));  // no software, which would run from now on
  for (const uint32_t at : {0u, 1000u, 2500u, 2501u, 5000u}) {
    abort_at_ = at;
    StartInBootLoader();
    EXPECT_EQ(Flash({data.c_str(), data.c_str()}), 0) << at;
    EXPECT_EQ(result_, KRAL_DOWNLOAD_ABORTED) << at;
    EXPECT_LT(figures_.back().first, 12500u);
  }
  abort_at_ = UINT32_MAX;
  StartInBootLoader();
  EXPECT_EQ(Flash({data.c_str(), data.c_str()}), 1) << result_;
}

TEST_F(FlashAll, StepsCanBeTakenOneByOne) {
  StartInBootLoader();
  uint32_t version = 0;
  uint32_t identity = 0;
  EXPECT_EQ(KRAL_Kivrat_Connect(handle_, &version, &identity), 1);
  EXPECT_EQ(version, 2u);
  EXPECT_EQ(identity, 0x008140E1u);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 0) << "the port is not the connection's";
  EXPECT_EQ(KRAL_Kivrat_DownloadFlashProgrammer(handle_, programmer_.c_str()), 1);
  EXPECT_EQ(figures_.back(), std::pair(2500u, 2500u));
  EXPECT_EQ(KRAL_Kivrat_DownloadFlashProgrammer(handle_, programmer_.c_str()), 0) << "over";
  uint32_t block_size = 0;
  uint16_t window = 0;
  EXPECT_EQ(KRAL_STREAM_HELLO(handle_, 1, &block_size, &window), 1);

  handset_.boot_loader()->Set({.identity_size = 0});
  StartInBootLoader();
  identity = 77;
  EXPECT_EQ(KRAL_Kivrat_Connect(handle_, nullptr, &identity), 1);
  EXPECT_EQ(identity, 77u);
  EXPECT_EQ(KRAL_Kivrat_End(handle_), 1);
  EXPECT_FALSE(ports_.IsOpen(7));

  StartInBootLoader();
  EXPECT_EQ(KRAL_Kivrat_Connect(handle_, nullptr, nullptr), 1);
  EXPECT_EQ(KRAL_Kivrat_DownloadFlashProgrammer(handle_, nullptr), 0);
  EXPECT_EQ(KRAL_Kivrat_DownloadFlashProgrammer(handle_, programmer_.c_str()), 1) << "the target still waited";
  handset_.faults().Add(handset::Lose(), handset::When::Nth(1));
  StartInBootLoader();
  EXPECT_EQ(KRAL_Kivrat_Connect(handle_, nullptr, nullptr), 0);
  EXPECT_FALSE(ports_.IsOpen(7)) << "any other failure gives the port back";
}

TEST(KivratHelloBehavior, IsForConnectionsThroughTheServerOnly) {
  uint16_t behavior = 77;
  {
    test::ScriptedServer server;
    const KRAL_HANDLE handle = KRAL_ConnectServer(3);
    EXPECT_EQ(KRAL_GetKivratHelloBehavior(handle, &behavior), 1);
    EXPECT_EQ(behavior, 0);
    EXPECT_EQ(KRAL_SetKivratHelloBehavior(handle, 0xABCD), 1);
    EXPECT_EQ(KRAL_GetKivratHelloBehavior(handle, &behavior), 1);
    EXPECT_EQ(behavior, 0xABCD);
    test::ExpectFailures(handle, {{"KRAL_Kivrat_Connect ARGUMENT", "direct mode",
                                   [=] { return KRAL_Kivrat_Connect(handle, nullptr, nullptr); }}});
  }
  test::HandsetPorts ports;
  const KRAL_HANDLE handle = KRAL_Kivrat_ConnectServer(7);
  test::ExpectFailures(handle, {{"KRAL_SetKivratHelloBehavior ARGUMENT", "direct mode",
                                 [=] { return KRAL_SetKivratHelloBehavior(handle, 1); }}});
  EXPECT_EQ(KRAL_GetKivratHelloBehavior(handle, &behavior), 0);
  EXPECT_EQ(behavior, 0xABCD);
}

}  // namespace
}  // namespace kral
