// Exports of the boot transfer and of the whole way of a download.
#include "kral/kivrat.h"

#include <algorithm>
#include <exception>
#include <span>

#include "base/failure.h"
#include "base/text_argument.h"
#include "download/boot/kivrat.h"
#include "download/flash_all.h"
#include "download/link/download_connection.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"

namespace {

namespace kivrat = kral::kivrat;
using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::TextOrEmpty;

bool Configure(Diag_FTM& phone, uint32_t hello_retries, uint32_t retry_delay_ms, uint32_t pre_done_delay_ms) {
  kivrat::Settings& settings = phone.state<kivrat::Settings>();
  settings.hello_retries = hello_retries;
  settings.retry_delay_ms = retry_delay_ms;
  settings.pre_done_delay_ms = pre_done_delay_ms;
  return true;
}

bool Connect(Diag_FTM& phone, uint32_t* version, uint32_t* chip_identity) {
  kral::download::DownloadConnection connection(phone);
  connection.BeginWork();
  uint32_t told_version = 0;
  std::optional<uint32_t> identity;
  const bool connected = kivrat::Connect(phone, told_version, chip_identity == nullptr ? nullptr : &identity,
                                         [&connection] { return connection.aborted(); });
  if (!connected) return false;
  if (version != nullptr) *version = told_version;
  if (identity) *chip_identity = *identity;
  return true;
}

bool DownloadFlashProgrammer(Diag_FTM& phone, const char* file) {
  return kral::download::ServeFlashProgrammer(phone, TextOrEmpty(file));
}

bool End(Diag_FTM& phone) {
  phone.GiveBackPort();
  return true;
}

bool FlashAll(Diag_FTM& phone, const char* programmer, const char* const* images, const uint8_t* types, uint32_t count,
              uint32_t* result, uint32_t* failed_image) {
  kral::download::FlashOutcome outcome{KRAL_STREAM_BAD_ARGUMENT};
  if (programmer == nullptr || images == nullptr || count == 0) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no flash programmer, or there are no images"));
  } else {
    const std::span all(images, count);
    const auto missing = std::ranges::find(all, nullptr);
    if (missing != all.end()) {
      outcome.image = static_cast<uint32_t>(missing - all.begin());
      Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no name of image %u", outcome.image));
    } else {
      try {
        outcome = kral::download::FlashAll(phone, programmer, all, types);
      } catch (const std::exception&) {  // no memory
        Fail(Failure(KRAL_ERROR_INTERNAL, "there is no memory for the download"));
        phone.GiveBackPort();
        outcome = {KRAL_STREAM_WRITE_FAILED};
      }
    }
  }
  if (result != nullptr) *result = outcome.result;
  if (failed_image != nullptr) *failed_image = outcome.image;
  return outcome.result == KRAL_STREAM_WRITTEN;
}

Failure NotInDirectMode() {
  return Failure(KRAL_ERROR_ARGUMENT, "direct mode has no hello behavior: it is a phone server's");
}

bool SetHelloBehavior(Diag_FTM& phone, uint16_t behavior) {
  const auto server = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  if (!server) return Fail(NotInDirectMode());
  server->SetKivratHelloBehavior(behavior);
  return true;
}

bool GetHelloBehavior(Diag_FTM& phone, uint16_t* behavior) {
  const auto server = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  if (!server) return Fail(NotInDirectMode());
  if (behavior == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no room for the number"));
  *behavior = server->kivrat_hello_behavior();
  return true;
}

}  // namespace

extern "C" {

KRAL_HANDLE KRAL_CALL KRAL_Kivrat_ConnectServer(uint32_t port) {
  const KRAL_HANDLE handle =
      ExportCall(__func__)
          .Require(port <= kral::Kral_ResourceManager::kAnyPort, "the port number has more than 16 bits")
          .Connecting([=] { return kral::Kral_ResourceManager::CreateContext(static_cast<uint16_t>(port)); });
  if (handle != 0) ExportCall(handle, __func__).RunAtOnce([](Diag_FTM&) { return true; });
  return handle;
}

uint8_t KRAL_CALL KRAL_Kivrat_Configure(KRAL_HANDLE handle, uint32_t hello_retries, uint32_t retry_delay_ms,
                                        uint32_t pre_done_delay_ms) {
  return ExportCall(handle, __func__).RunAtOnce(Configure, hello_retries, retry_delay_ms, pre_done_delay_ms);
}

uint8_t KRAL_CALL KRAL_Kivrat_Connect(KRAL_HANDLE handle, uint32_t* version, uint32_t* chip_identity) {
  return ExportCall(handle, __func__).Run(Connect, version, chip_identity);
}

uint8_t KRAL_CALL KRAL_Kivrat_DownloadFlashProgrammer(KRAL_HANDLE handle, const char* programmer_file) {
  return ExportCall(handle, __func__)
      .Logged("( sFile = %s )", TextOrEmpty(programmer_file))
      .Run(DownloadFlashProgrammer, programmer_file);
}

uint8_t KRAL_CALL KRAL_Kivrat_End(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(End);
}

uint8_t KRAL_CALL KRAL_Kivrat_FlashAll(KRAL_HANDLE handle, const char* programmer_file, const char* const* image_files,
                                       const uint8_t* image_types, uint32_t image_count, uint32_t* result,
                                       uint32_t* failed_image) {
  return ExportCall(handle, __func__)
      .Logged("( sFile = %s, iImages = %u )", TextOrEmpty(programmer_file), image_count)
      .Run(FlashAll, programmer_file, image_files, image_types, image_count, result, failed_image);
}

uint8_t KRAL_CALL KRAL_SetKivratHelloBehavior(KRAL_HANDLE handle, uint16_t behavior) {
  return ExportCall(handle, __func__).Run(SetHelloBehavior, behavior);
}

uint8_t KRAL_CALL KRAL_GetKivratHelloBehavior(KRAL_HANDLE handle, uint16_t* behavior) {
  return ExportCall(handle, __func__).Run(GetHelloBehavior, behavior);
}

}  // extern "C"
