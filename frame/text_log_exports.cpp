// Exports of the text log.
#include <cstdio>
#include <span>
#include <string>

#include "base/hex_dump.h"
#include "frame/export_call.h"
#include "frame/version.h"
#include "kral/text_log.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;
using kral::kNoFileName;

bool StartLog(Diag_FTM& phone, const char* file_name) {
  phone.log().Start(file_name);
  phone.log().WriteLine(kral::kLogFn, "VARN DLL Version: %s", kral::LibraryVersion().c_str());
  return true;
}

bool AddMessage(Diag_FTM& phone, uint32_t flag, const char* text, bool echo) {
  if (echo) {
    std::fputs(text, stdout);
    std::fflush(stdout);
  }
  phone.log().WriteText(flag, text);
  return true;
}

// What the first byte of an asynchronous packet says it is.
const char* AsynchronousKind(uint8_t code) {
  switch (code) {
    case 16:
      return "log packet";
    case 31:
      return "message";
    case 96:
      return "event report";
    case 121:
      return "extended message";
    default:
      return "asynchronous packet";
  }
}

bool AddAsynchronous(Diag_FTM& phone, uint32_t flag, std::span<const uint8_t> message, bool with_code,
                     bool with_bytes) {
  if (!phone.log().Wants(flag)) return true;
  const std::string code = with_code ? std::to_string(message[0]).insert(0, 1, ' ') : "";
  const std::string bytes = with_bytes ? kral::HexDump(message).insert(0, ": ") : "";
  phone.log().WriteLine(flag, "%s%s (%d bytes)%s", AsynchronousKind(message[0]), code.c_str(),
                        static_cast<int>(message.size()), bytes.c_str());
  return true;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_StartLogging(KRAL_HANDLE handle, const char* file_name) {
  return ExportCall(handle, __func__).Require(file_name != nullptr, kNoFileName).RunAtOnce(StartLog, file_name);
}

uint8_t KRAL_CALL KRAL_StopLogging(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) {
    phone.log().Stop();
    return true;
  });
}

uint8_t KRAL_CALL KRAL_IsLoggingStarted(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Answering().RunAtOnce([](Diag_FTM& phone) {
    return phone.log().started_result();
  });
}

uint8_t KRAL_CALL KRAL_SetLogFlags(KRAL_HANDLE handle, uint32_t mask) {
  return ExportCall(handle, __func__).Logged("( uiLogFlags = 0x%X )", mask).RunAtOnce([mask](Diag_FTM& phone) {
    phone.log().SetFlags(mask);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_AddUserMessageToTextLog(KRAL_HANDLE handle, uint32_t flag, const char* text, uint8_t echo) {
  return ExportCall(handle, __func__)
      .Unlogged()
      .Require(text != nullptr, "there is no text")
      .RunAtOnce(AddMessage, flag, text, echo == 1);
}

uint8_t KRAL_CALL KRAL_AddUserAsyncLogMessageToTextLog(KRAL_HANDLE handle, uint32_t flag, const uint8_t* message,
                                                       uint16_t size, uint8_t with_code, uint8_t with_bytes) {
  const size_t length = message == nullptr ? 0 : size;
  return ExportCall(handle, __func__)
      .Unlogged()
      .Require(length != 0, "there is no message")
      .RunAtOnce(AddAsynchronous, flag, std::span(message, length), with_code == 1, with_bytes == 1);
}

void KRAL_CALL KRAL_ConfigureLibraryTextLogCallBack(KRAL_HANDLE handle, KRAL_TEXT_LOG_CALLBACK callback) {
  ExportCall(handle, __func__).RunAtOnce([=](Diag_FTM& phone) {
    phone.log().SetCallback(callback, handle);
    return true;
  });
}

}  // extern "C"
