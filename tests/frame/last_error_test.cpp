// Why a call failed: every way to fail leaves a record that is right.
#include <thread>

#include "base/time_outs.h"
#include "frame/resource_manager.h"
#include "handset/line/faults.h"
#include "kral/kral.h"
#include "tests/support/handset_connection.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using handset::When;

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
  const struct {
    const char* what;
    std::function<void()> setup;
    std::function<uint32_t()> call;  // 0 is a failure
    const char* function;
    uint32_t code;
    uint32_t status_kind;
    uint32_t status;
    const char* text;  // part of the sentence
  } kRows[] = {
      {"silence", [&] { handset().faults().Add(handset::Ignore(), When::Always()); }, [&] { return ReadSwitches(h); },
       "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_NO_ANSWER, 0, 0, "no answer to command 47 within 40 ms"},
      {"unknown command", [&] { handset().faults().Add(handset::Refuse(19), When::Always()); },
       [&] { return ReadSwitches(h); }, "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL, 19,
       "refused command 47 with 19"},
      {"parameter", [&] { handset().faults().Add(handset::Refuse(20), When::Always()); },
       [&] { return KRAL_FTM_SET_TX_ON(h); }, "KRAL_FTM_SET_TX_ON", KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL, 20,
       "refused command 75/11/1 with 20"},
      {"length", [&] { handset().faults().Add(handset::Refuse(21), When::Always()); }, [&] { return ReadSwitches(h); },
       "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL, 21, "with 21"},
      {"mode", [&] { handset().faults().Add(handset::Refuse(24), When::Always()); },
       [&] { return KRAL_DIAG_READ_ESN_F(h, &serial); }, "KRAL_DIAG_READ_ESN_F", KRAL_ERROR_REFUSED,
       KRAL_ERROR_STATUS_REFUSAL, 24, "operating mode"},
      {"another reply", [&] { handset().faults().Add(handset::WrongCode(77), When::Always()); },
       [&] { return ReadSwitches(h); }, "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_LINK, KRAL_ERROR_STATUS_REPLY, 77,
       "answered with a reply of 77"},
      {"a damaged reply", [&] { handset().faults().Add(handset::Corrupt(), When::Always()); },
       [&] { return ReadSwitches(h); }, "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_LINK, 0, 0, "wrong check"},
      {"a short reply", [&] { handset().Expect("2F").Reply("2F 00"); }, [&] { return ReadSwitches(h); },
       "KRAL_DIAG_GET_DIPSW_F", KRAL_ERROR_LINK, 0, 0, "switch word"},
      {"status of an NV item", [&] { handset().Expect("26 01 00 07").Reply("26 01 00 07 00 00 05 00"); },
       [&] { return KRAL_DIAG_NV_READ_ARRAY_F(h, 1, 7, data_.data(), 2, &status_); }, "KRAL_DIAG_NV_READ_ARRAY_F",
       KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_NV, 5, "NV item 1"},
      {"liveness", [&] { handset().faults().Add(handset::Ignore(), When::Always()); },
       [&] { return KRAL_IsPhoneConnected(h); }, "KRAL_IsPhoneConnected", KRAL_ERROR_NO_ANSWER, 0, 0, "command 123"},
      {"no buffer",
       {},
       [&] { return KRAL_DIAG_MEMORY_PEEK_F(h, 0, 4, nullptr); },
       "KRAL_DIAG_MEMORY_PEEK_F",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "buffer"},
      {"no request",
       {},
       [&] { return KRAL_SendSync(h, 0, nullptr, &size, data_.data(), 10); },
       "KRAL_SendSync",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "request"},
      {"packet mode",
       {},
       [&] { return KRAL_SetPacketMode(h, 4); },
       "KRAL_SetPacketMode",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "packet mode 4"},
      {"RF mode",
       {},
       [&] { return KRAL_FTM_SET_MODE(h, 9999); },
       "KRAL_FTM_SET_MODE",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "9999"},
      {"command code",
       {},
       [&] { return KRAL_FTM_SET_COMMAND_CODE(h, 60); },
       "KRAL_FTM_SET_COMMAND_CODE",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "60"},
      {"time-out id",
       {},
       [&] { return KRAL_ConfigureTimeOut(h, 21, 1); },
       "KRAL_ConfigureTimeOut",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "21"},
      {"empty queue",
       {},
       [&] { return KRAL_DIAG_GetNextEvent(h, &event); },
       "KRAL_DIAG_GetNextEvent",
       KRAL_ERROR_NO_ANSWER,
       0,
       0,
       "no event"},
      {"a function without request",
       {},
       [&] { return KRAL_DIAG_GSM_STATUS_F(h); },
       "KRAL_DIAG_GSM_STATUS_F",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "KRAL_DIAG_GSM_STATUS_F"},
      {"a phone server's",
       {},
       [&] { return KRAL_EfsRmTree(h, "/x"); },
       "KRAL_EfsRmTree",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "phone server"},
      {"NV tool's code",
       {},
       [&] { return KRAL_NV_LoadNVDefinitionFile(h, "no-such.xml") == 0 ? 1u : 0u; },
       "KRAL_NV_LoadNVDefinitionFile",
       KRAL_ERROR_BAD_FILE,
       KRAL_ERROR_STATUS_RESULT,
       KRAL_NV_ERROR_CANNOT_LOAD_DEFINITION,
       "no-such.xml"},
      {"a command with a payload", [&] { handset().faults().Add(handset::Refuse(19), When::Always()); },
       [&] { return KRAL_FTM_GET_SYNTH_STATE(h, nullptr, 0, data_.data(), &size); }, "KRAL_FTM_GET_SYNTH_STATE",
       KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL, 19, "75/11/1"},
      {"target", [&] { handset().faults().Add(handset::Ignore(), When::Always()); },
       [&] { return KRAL_IsFTM_Mode(h, &flag); }, "KRAL_IsFTM_Mode", KRAL_ERROR_NO_ANSWER, 0, 0, "75/15/0"},
      {"a mode that is refused", [&] { handset().faults().Add(handset::Refuse(24), When::Always().Of("29")); },
       [&] { return KRAL_DIAG_CONTROL_F(h, 3); }, "KRAL_DIAG_CONTROL_F", KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL,
       24, "command 41"},
      {"a boot mode that is refused",
       [&] {
         handset().faults().Add(handset::Refuse(20), When::Always().Of("27"));
         handset().faults().Add(handset::Ignore(), When::From(2).Of("29"));
       },
       [&] { return KRAL_ChangeFTM_BootMode(h, 1, 1); }, "KRAL_ChangeFTM_BootMode", KRAL_ERROR_REFUSED,
       KRAL_ERROR_STATUS_REFUSAL, 20, "command 39"},
      {"a packet mode that is refused", [&] { handset().faults().Add(handset::Refuse(19), When::Always()); },
       [&] { return KRAL_SetPacketMode(h, 1); }, "KRAL_SetPacketMode", KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL,
       19, "command 68"},
      {"another reply to an EFS2 request", [&] { handset().faults().Add(handset::WrongCode(77), When::Always()); },
       [&] { return KRAL_EfsMkDir(h, "/x", nullptr); }, "KRAL_EfsMkDir", KRAL_ERROR_LINK, KRAL_ERROR_STATUS_REPLY, 77,
       "75/19"},
      {"no capture",
       {},
       [&] { return KRAL_StopCapture(h); },
       "KRAL_StopCapture",
       KRAL_ERROR_ARGUMENT,
       0,
       0,
       "no capture is running"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.what);
    handset().faults().Clear();
    KRAL_ConfigureTimeOut(h, 0, 40);
    KRAL_ConfigureTimeOut(h, kTimeOutModeReadBack, 40);
    if (row.setup) row.setup();
    EXPECT_EQ(row.call(), 0u);
    const KRAL_ERROR error = Record(h);
    EXPECT_STREQ(error.function, row.function);
    EXPECT_EQ(error.code, row.code) << error.text;
    EXPECT_EQ(error.status_kind, row.status_kind) << error.text;
    EXPECT_EQ(error.status, row.status);
    EXPECT_NE(std::string_view(error.text).find(row.text), std::string_view::npos) << error.text;
  }
  // Functions without a handle, and connects.
  EXPECT_EQ(KRAL_Band_Helper_GetBandName(60000, name.data(), 8), 0);
  EXPECT_STREQ(Record(0).function, "KRAL_Band_Helper_GetBandName");
  EXPECT_EQ(KRAL_FTM_GetCommandInfo(0, nullptr, name.data(), 1), 0);
  EXPECT_STREQ(Record(0).function, "KRAL_FTM_GetCommandInfo");
  EXPECT_EQ(KRAL_ConnectServer_LogicalPort(4711), 0u);
  EXPECT_EQ(Record(0).code, uint32_t{KRAL_ERROR_ARGUMENT});
  EXPECT_STREQ(Record(0).text, "there is no alias for the logical port 4711");
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
