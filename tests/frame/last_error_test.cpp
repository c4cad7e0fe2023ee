// Why a call failed: every way to fail leaves a record that is right.
#include "base/time_outs.h"
#include "frame/resource_manager.h"
#include "handset/line/faults.h"
#include "kral/kral.h"
#include "tests/support/failures.h"
#include "tests/support/handset_connection.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class LastError : public HandsetTest {
 protected:
  KRAL_ERROR Record(KRAL_HANDLE handle) {
    KRAL_ERROR error{};
    EXPECT_EQ(KRAL_GetLastError(handle, &error), 1);
    return error;
  }
  uint8_t ReadSwitches(KRAL_HANDLE handle) {
    uint16_t switches = 0;
    return KRAL_DIAG_GET_DIPSW_F(handle, &switches);
  }

  std::array<uint8_t, 128> data_{};
  uint16_t status_ = 0;
};

TEST_F(LastError, NamesWhatWasWrong) {
  const KRAL_HANDLE h = handle();
  uint16_t size = 4;
  uint32_t serial = 0;
  uint8_t flag = 0;
  KRAL_EVENT event;
  std::array<char, 8> name{};
  const auto on = [&](handset::Fault fault, const char* prefix = "") {
    handset().faults().Add(fault, When::Always().Of(prefix));
  };
  const auto switches_with = [&](handset::Fault fault) { return [&, fault] { return on(fault), ReadSwitches(h); }; };
  const auto expect = [&](const char* request, const char* reply) { handset().Expect(request).Reply(reply); };
  const auto refuse_boot = [&] {
    on(handset::Refuse(20), "27");
    handset().faults().Add(handset::Ignore(), When::From(2).Of("29"));
  };
  const std::string kSwitches = "KRAL_DIAG_GET_DIPSW_F";
  const auto prepare = [&] {
    handset().faults().Clear();
    KRAL_ConfigureTimeOut(h, 0, 150);
    KRAL_ConfigureTimeOut(h, kTimeOutModeReadBack, 150);
  };
  const std::vector<test::FailureRow> rows = {
      {kSwitches + " NO_ANSWER", "no answer to command 47 within 150 ms", switches_with(handset::Ignore())},
      {kSwitches + " REFUSED REFUSAL 19", "refused command 47 with 19", switches_with(handset::Refuse(19))},
      {"KRAL_FTM_SET_TX_ON REFUSED REFUSAL 20", "refused command 75/11/1 with 20",
       [&] { return on(handset::Refuse(20)), KRAL_FTM_SET_TX_ON(h); }},
      {kSwitches + " REFUSED REFUSAL 21", "with 21", switches_with(handset::Refuse(21))},
      {"KRAL_DIAG_READ_ESN_F REFUSED REFUSAL 24", "operating mode",
       [&] { return on(handset::Refuse(24)), KRAL_DIAG_READ_ESN_F(h, &serial); }},
      {kSwitches + " LINK REPLY 77", "answered with a reply of 77", switches_with(handset::WrongCode(77))},
      {kSwitches + " LINK", "wrong check", switches_with(handset::Corrupt())},
      {kSwitches + " LINK", "switch word", [&] { return expect("2F", "2F 00"), ReadSwitches(h); }},
      {"KRAL_DIAG_NV_READ_ARRAY_F REFUSED NV 5", "NV item 1",
       [&] {
         expect("26 01 00 07", "26 01 00 07 00 00 05 00");
         return KRAL_DIAG_NV_READ_ARRAY_F(h, 1, 7, data_.data(), 2, &status_);
       }},
      {"KRAL_IsPhoneConnected NO_ANSWER", "command 123",
       [&] { return on(handset::Ignore()), KRAL_IsPhoneConnected(h); }},
      {"KRAL_DIAG_MEMORY_PEEK_F ARGUMENT", "buffer", [&] { return KRAL_DIAG_MEMORY_PEEK_F(h, 0, 4, nullptr); }},
      {"KRAL_SendSync ARGUMENT", "request", [&] { return KRAL_SendSync(h, 0, nullptr, &size, data_.data(), 10); }},
      {"KRAL_SetPacketMode ARGUMENT", "packet mode 4", [&] { return KRAL_SetPacketMode(h, 4); }},
      {"KRAL_FTM_SET_MODE ARGUMENT", "9999", [&] { return KRAL_FTM_SET_MODE(h, 9999); }},
      {"KRAL_FTM_SET_COMMAND_CODE ARGUMENT", "60", [&] { return KRAL_FTM_SET_COMMAND_CODE(h, 60); }},
      {"KRAL_ConfigureTimeOut ARGUMENT", "21", [&] { return KRAL_ConfigureTimeOut(h, 21, 1); }},
      {"KRAL_DIAG_GetNextEvent NO_ANSWER", "no event", [&] { return KRAL_DIAG_GetNextEvent(h, &event); }},
      {"KRAL_DIAG_GSM_STATUS_F ARGUMENT", "KRAL_DIAG_GSM_STATUS_F", [&] { return KRAL_DIAG_GSM_STATUS_F(h); }},
      {"KRAL_EfsRmTree ARGUMENT", "phone server", [&] { return KRAL_EfsRmTree(h, "/x"); }},
      {"KRAL_NV_LoadNVDefinitionFile BAD_FILE RESULT 4", "no-such.xml",
       [&] { return KRAL_NV_LoadNVDefinitionFile(h, "no-such.xml") == 0; }},
      {"KRAL_FTM_GET_SYNTH_STATE REFUSED REFUSAL 19", "75/11/1",
       [&] { return on(handset::Refuse(19)), KRAL_FTM_GET_SYNTH_STATE(h, nullptr, 0, data_.data(), &size); }},
      {"KRAL_IsFTM_Mode NO_ANSWER", "75/15/0", [&] { return on(handset::Ignore()), KRAL_IsFTM_Mode(h, &flag); }},
      {"KRAL_DIAG_CONTROL_F REFUSED REFUSAL 24", "command 41",
       [&] { return on(handset::Refuse(24), "29"), KRAL_DIAG_CONTROL_F(h, 3); }},
      {"KRAL_ChangeFTM_BootMode REFUSED REFUSAL 20", "command 39",
       [&] { return refuse_boot(), KRAL_ChangeFTM_BootMode(h, 1, 1); }},
      {"KRAL_SetPacketMode REFUSED REFUSAL 19", "command 68",
       [&] { return on(handset::Refuse(19)), KRAL_SetPacketMode(h, 1); }},
      {"KRAL_EfsMkDir LINK REPLY 77", "75/19",
       [&] { return on(handset::WrongCode(77)), KRAL_EfsMkDir(h, "/x", nullptr); }},
      {"KRAL_StopCapture ARGUMENT", "no capture is running", [&] { return KRAL_StopCapture(h); }},
  };
  test::ExpectFailures(h, rows, prepare);
  // Functions without a handle, and connects.
  test::ExpectFailures(
      0, {{"KRAL_Band_Helper_GetBandName ARGUMENT", "",
           [&] { return KRAL_Band_Helper_GetBandName(60000, name.data(), 8); }},
          {"KRAL_FTM_GetCommandInfo ARGUMENT", "", [&] { return KRAL_FTM_GetCommandInfo(0, nullptr, name.data(), 1); }},
          {"KRAL_ConnectServer_LogicalPort ARGUMENT", "there is no alias for the logical port 4711",
           [] { return KRAL_ConnectServer_LogicalPort(4711); }}});
}

TEST_F(LastError, SilentServiceOfAnApplicationProcessorIsNoMode) {
  Connect([] { KRAL_SetTargetType(1); });
  handset().faults().Add(handset::Ignore(), When::Always());
  uint8_t is_ftm = 7;
  EXPECT_EQ(KRAL_IsFTM_Mode(handle(), &is_ftm), 0);
  EXPECT_EQ(Record(handle()).code, uint32_t{KRAL_ERROR_NO_ANSWER});
  EXPECT_EQ(is_ftm, 7);
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 0), 0);
}

TEST_F(LastError, PortThatDoesNotOpenIsToldByTheHandleOfTheConnect) {
  Kral_ResourceManager::SetDeviceOpener([](int, DeviceResult& result) {
    result = {DeviceError::kBusy, 16, "busy"};
    return std::unique_ptr<SerialDevice>();
  });
  const KRAL_HANDLE busy = KRAL_ConnectServer(9);
  const KRAL_ERROR connect = Record(busy);
  EXPECT_STREQ(connect.function, "KRAL_ConnectServer");
  EXPECT_EQ(connect.code, uint32_t{KRAL_ERROR_PORT_IN_USE});
  EXPECT_EQ(connect.system_error, 16u);
  EXPECT_EQ(ReadSwitches(busy), 0);
  EXPECT_STREQ(Record(busy).text, "COM9 is in use by another program");
  EXPECT_EQ(KRAL_ConnectServerWithVerify(9), 0u);
  EXPECT_STREQ(Record(0).function, "KRAL_ConnectServerWithVerify");
  EXPECT_EQ(KRAL_ConnectServerWithWait(10, 1), 0u);
  EXPECT_EQ(Record(0).code, uint32_t{KRAL_ERROR_PORT_IN_USE}) << "and nothing of what the clean-up met with";
  KRAL_DisconnectServer(busy);
  KRAL_DisconnectServer(busy);
  Kral_ResourceManager::SetDeviceOpener({});

  EXPECT_EQ(ReadSwitches(busy), 0);
  EXPECT_NE(std::string(Record(busy).text).find("not one of a connection"), std::string::npos);

  const KRAL_HANDLE null_port = KRAL_ConnectServer(65534);
  EXPECT_EQ(ReadSwitches(null_port), 0);
  EXPECT_EQ(Record(null_port).code, uint32_t{KRAL_ERROR_NO_PORT});
  KRAL_DisconnectServer(null_port);
}

TEST_F(LastError, IsEachThreadsOwnAndOutlivesSuccess) {
  KRAL_ERROR error{};
  EXPECT_EQ(KRAL_SetPacketMode(handle(), 5), 0);
  EXPECT_EQ(ReadSwitches(handle()), 1);
  EXPECT_NE(std::string(Record(handle()).text).find('5'), std::string::npos) << "success does not clear it";
  std::thread([&] {
    EXPECT_NE(std::string(Record(handle()).text).find('5'), std::string::npos) << "none of its own: the latest";
    EXPECT_EQ(KRAL_SetPacketMode(handle(), 6), 0);
    EXPECT_NE(std::string(Record(handle()).text).find('6'), std::string::npos);
    EXPECT_EQ(KRAL_GetLastError(0, &error), 0) << "a connect of another thread is none of this one's business";
  }).join();
  EXPECT_NE(std::string(Record(handle()).text).find('5'), std::string::npos);
  EXPECT_EQ(KRAL_GetLastError(handle(), nullptr), 0);
  EXPECT_EQ(KRAL_IsLoggingStarted(handle()), 0);
  EXPECT_STREQ(Record(handle()).function, "KRAL_SetPacketMode") << "an answer of 0 is no failure";
}

TEST_F(LastError, TextsAreUtf8WithoutControls) {
  KRAL_NV_ConfigureCallBack(handle(), nullptr);
  const std::string long_name = std::string("a\x1b[2Jb\xC2\x85\xFF") + std::string(400, 'x') + "\xC3\xBC";
  EXPECT_NE(KRAL_NV_WriteNVsToPKV(handle(), long_name.c_str()), 0u);
  const KRAL_ERROR error = Record(handle());
  for (const uint8_t byte : std::string(error.text)) EXPECT_GE(byte, 0x20) << error.text;

  std::array<char, 64> phrase{};
  for (const uint32_t code : {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 130}) {
    EXPECT_EQ(KRAL_GetErrorText(code, phrase.data(), phrase.size()), 1) << code;
  }
  EXPECT_EQ(KRAL_GetErrorText(12, phrase.data(), phrase.size()), 0);
  EXPECT_EQ(KRAL_GetErrorText(5, phrase.data(), 5), 0);
}

}  // namespace
}  // namespace kral
