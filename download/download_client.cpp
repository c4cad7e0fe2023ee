// The operations behind the exports: arguments to images and commands, outcomes to result codes.
#include "download/download_client.h"

#include <exception>
#include <optional>
#include <vector>

#include "download/images/image_file.h"
#include "download/kova/kova.h"
#include "download/link/download_connection.h"
#include "download/link/download_failure.h"
#include "download/stream/image_set_up.h"
#include "download/stream/stream_format.h"
#include "download/stream/stream_hello.h"
#include "download/stream/write_image.h"
#include "frame/export_call.h"

namespace kral::download {
namespace {

bool Give(uint32_t value, uint32_t* result) {
  if (result != nullptr) *result = value;
  return value == KRAL_STREAM_WRITTEN;
}

uint32_t ResultOf(stream::WriteOutcome outcome) {
  switch (outcome) {
    case stream::WriteOutcome::kDone:
      return KRAL_STREAM_WRITTEN;
    case stream::WriteOutcome::kNotOpened:
      return KRAL_STREAM_OPEN_FAILED;
    case stream::WriteOutcome::kNoThread:
    case stream::WriteOutcome::kThreadNotStarted:
      return KRAL_STREAM_NO_THREAD;
    case stream::WriteOutcome::kNotWritten:
      return KRAL_STREAM_WRITE_FAILED;
    case stream::WriteOutcome::kNotCompleted:
      return KRAL_STREAM_NOT_COMPLETED;
    case stream::WriteOutcome::kThreadNotStopped:
      return KRAL_STREAM_THREAD_STUCK;
    case stream::WriteOutcome::kNotClosed:
      return KRAL_STREAM_CLOSE_FAILED;
    case stream::WriteOutcome::kAborted:
      return KRAL_DOWNLOAD_ABORTED;
  }
  return KRAL_STREAM_WRITE_FAILED;
}

uint32_t Write(DownloadConnection& connection, const images::PhoneImage& image, const images::PhoneImage* header,
               const WriteArguments& arguments) {
  // Before anything is erased for it.
  if (arguments.block_size == 0) return BadArgument(KRAL_STREAM_BAD_ARGUMENT, "blocks of 0 bytes cannot be written");
  const stream::WriteLimits requested{arguments.block_size, stream::WriterWindow(arguments.window)};
  try {
    switch (arguments.method) {
      case KRAL_STREAM_MULTI_IMAGE:
        return ResultOf(stream::CWriteImageFramed(connection).Write(image, arguments.image_type, header, requested));
      case KRAL_STREAM_NOR:
        return ResultOf(stream::CWriteNORImageFramed(connection).Write(image, arguments.image_type, header, requested));
      default:
        Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no method %d of writing an image", arguments.method));
        return KRAL_STREAM_BAD_ARGUMENT;
    }
  } catch (const images::PhoneImageException& exception) {
    connection.log().WriteLine(kLogErr, "%s at 0x%08X, size 0x%X", exception.what(), exception.address(),
                               exception.count());
    const bool reading = exception.kind() == images::PhoneImageException::Kind::kRead;
    Fail(Failure(reading ? KRAL_ERROR_BAD_FILE : KRAL_ERROR_INTERNAL,
                 "%u bytes at 0x%08X of the image could not be read: its file became shorter meanwhile",
                 exception.count(), exception.address())
             .Offset(exception.address()));
    return reading ? KRAL_STREAM_FILE_NOT_READ : KRAL_STREAM_WRITE_FAILED;
  }
}

// Whatever ends an operation, its caller learns a result: no exception passes the output by.
template <class Operation>
bool GiveResultOf(Diag_FTM& phone, uint32_t result_of_exceptions, uint32_t* result, Operation&& operation) {
  uint32_t value = result_of_exceptions;
  try {
    value = operation();
  } catch (const std::exception& exception) {
    phone.log().WriteLine(kLogErr, "download : %s", exception.what());
    Fail(Failure(KRAL_ERROR_INTERNAL, "no memory for the download: %s", exception.what()));
  }
  return Give(value, result);
}

// Through a phone server there is no framer to talk to.
bool IsRefused(Diag_FTM& phone, const char* name) {
  if (!phone.server_mode()) return false;
  phone.log().WriteLine(kLogErr, "%s() : FAIL in ORBT mode", name);
  Fail(Failure(KRAL_ERROR_ARGUMENT, "%s needs direct mode: a phone server downloads by itself", name));
  return true;
}

bool IsNull(const CallersBytes& bytes) {
  return bytes.data == nullptr && bytes.size != 0;
}

}  // namespace

bool SetCallback(Diag_FTM& phone, KRAL_DOWNLOAD_PROGRESS_CALLBACK callback, uintptr_t value) {
  Settings& settings = phone.state<Settings>();
  settings.callback_value = value;
  settings.progress_callback = callback;
  return true;
}

bool Abort(Diag_FTM& phone) {
  phone.state<Settings>().abort = true;
  return true;
}

bool ConfigureHello(Diag_FTM& phone, uint32_t tries, uint32_t delay_ms) {
  Settings& settings = phone.state<Settings>();
  settings.hello_tries = tries;
  settings.hello_retry_delay_ms = delay_ms;
  return true;
}

bool LoadFlashProgrammer(Diag_FTM& phone, const char* file, uint32_t maximum_packet, uint32_t* result) {
  if (IsRefused(phone, "KRAL_KOVA_LoadFlashProgrammer")) return Give(KRAL_KOVA_WRITE_FAILED, result);
  DownloadConnection connection(phone);
  connection.BeginWork();
  if (file == nullptr) return Give(BadArgument(KRAL_KOVA_FILE_NOT_OPENED, kNoFileName), result);
  // What throws is the image, for which there is no address space.
  return GiveResultOf(phone, KRAL_KOVA_FILE_NOT_DECODED, result, [&] {
    kova::ProgrammerFile programmer;
    const uint32_t opened = programmer.Open(file);
    if (opened == KRAL_KOVA_DATA_LOST) images::LogLoss(connection.log(), file, programmer.loss());
    return opened != KRAL_KOVA_LOADED ? opened : kova::LoadFlashProgrammer(connection, programmer, maximum_packet);
  });
}

bool LoadProgrammer(Diag_FTM& phone, const kova::ProgrammerFile& programmer, uint32_t maximum_packet,
                    uint32_t* result) {
  if (IsRefused(phone, "a flash programmer")) return Give(KRAL_KOVA_WRITE_FAILED, result);
  DownloadConnection connection(phone);
  connection.BeginWork();
  return GiveResultOf(phone, KRAL_KOVA_WRITE_FAILED, result,
                      [&] { return kova::LoadFlashProgrammer(connection, programmer, maximum_packet); });
}

bool KovaNop(Diag_FTM& phone) {
  if (IsRefused(phone, "KRAL_KOVA_NOP")) return false;
  DownloadConnection connection(phone);
  return kova::Nop(connection);
}

bool KovaReset(Diag_FTM& phone) {
  if (IsRefused(phone, "KRAL_KOVA_RESET")) return false;
  DownloadConnection connection(phone);
  return kova::Reset(connection);
}

bool KovaSoftwareVersion(Diag_FTM& phone, uint8_t* version) {
  if (IsRefused(phone, "KRAL_KOVA_SW_VERSION")) return false;
  DownloadConnection connection(phone);
  uint8_t value = 0;
  if (!kova::SoftwareVersion(connection, value)) return false;
  if (version != nullptr) *version = value;
  return true;
}

bool StreamHello(Diag_FTM& phone, uint32_t variant, uint32_t* block_size, uint16_t* window) {
  if (IsRefused(phone, "KRAL_STREAM_HELLO")) return false;
  DownloadConnection connection(phone);
  connection.BeginWork();
  const auto answer = stream::Hello(connection, phone.state<Settings>(), variant);
  if (!answer) return false;
  if (block_size != nullptr) *block_size = answer->block_size;
  if (window != nullptr) *window = answer->window;
  return true;
}

bool SecurityMode(Diag_FTM& phone, uint8_t mode) {
  if (IsRefused(phone, "KRAL_STREAM_SECURITY_MODE")) return false;
  DownloadConnection connection(phone);
  return stream::CImageSecMode(connection, connection.time_out_ms()).Send(mode);
}

bool PartitionTable(Diag_FTM& phone, const char* file, uint8_t override_table, uint8_t* status) {
  if (IsRefused(phone, "KRAL_STREAM_PARTITION_TABLE")) return false;
  if (file == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, kNoFileName));
  std::vector<uint8_t> table;
  if (!stream::ReadPartitionTable(phone.log(), file, table)) return false;
  return SendPartitionTable(phone, table, override_table, status);
}

bool SendPartitionTable(Diag_FTM& phone, std::span<const uint8_t> table, uint8_t override_table, uint8_t* status) {
  if (IsRefused(phone, "a partition table")) return false;
  DownloadConnection connection(phone);
  std::optional<uint8_t> answer;
  const bool accepted =
      stream::CImagePartition(connection, connection.time_out_ms()).Send(table, override_table != 0, answer);
  if (answer && status != nullptr) *status = *answer;
  return accepted;
}

uint32_t OpenImage(const char* file, uint32_t format, const char* header_file, images::ImageFile& image,
                   images::ImageFile& header) {
  uint32_t opened = image.Open(file, format);
  if (opened == KRAL_STREAM_WRITTEN && header_file != nullptr)
    opened = header.Open(header_file, KRAL_IMAGE_FORMAT_BINARY);
  return opened != KRAL_STREAM_WRITTEN ? opened : image.RefuseSecondRegion(file);
}

bool WriteImageFile(Diag_FTM& phone, const char* file, uint32_t format, const char* header_file,
                    const WriteArguments& arguments, uint32_t* result) {
  if (IsRefused(phone, "KRAL_STREAM_WriteImageFile")) return Give(KRAL_STREAM_WRITE_FAILED, result);
  DownloadConnection connection(phone);
  connection.BeginWork();
  if (file == nullptr) return Give(BadArgument(KRAL_STREAM_BAD_ARGUMENT, kNoFileName), result);
  return GiveResultOf(phone, KRAL_STREAM_WRITE_FAILED, result, [&]() -> uint32_t {
    images::ImageFile image;
    images::ImageFile header;
    const uint32_t opened = OpenImage(file, format, header_file, image, header);
    if (opened == KRAL_STREAM_DATA_LOST) images::LogLoss(connection.log(), file, image.loss());
    if (opened != KRAL_STREAM_WRITTEN) return opened;
    return Write(connection, image.image(), header_file == nullptr ? nullptr : &header.image(), arguments);
  });
}

bool WriteImage(Diag_FTM& phone, const images::PhoneImage& image, const images::PhoneImage* header,
                const WriteArguments& arguments, uint32_t* result) {
  if (IsRefused(phone, "an image")) return Give(KRAL_STREAM_WRITE_FAILED, result);
  DownloadConnection connection(phone);
  connection.BeginWork();
  return GiveResultOf(phone, KRAL_STREAM_WRITE_FAILED, result,
                      [&] { return Write(connection, image, header, arguments); });
}

bool WriteImageMem(Diag_FTM& phone, const CallersBytes& image, uint32_t address, const CallersBytes& header,
                   const WriteArguments& arguments, uint32_t* result) {
  if (IsRefused(phone, "KRAL_STREAM_WriteImageMem")) return Give(KRAL_STREAM_WRITE_FAILED, result);
  DownloadConnection connection(phone);
  connection.BeginWork();
  if (IsNull(image) || IsNull(header)) {
    return Give(BadArgument(KRAL_STREAM_BAD_ARGUMENT, "there are no bytes of the image or its header"), result);
  }
  return GiveResultOf(phone, KRAL_STREAM_WRITE_FAILED, result, [&]() -> uint32_t {
    if (images::PassesTheEnd(address, image.size)) {
      Fail(Failure(KRAL_ERROR_ARGUMENT, "%u bytes from 0x%08X on go past address 0xFFFFFFFF", image.size, address));
      return KRAL_STREAM_PAST_END;
    }
    const auto whole = images::MakeMemoryImage({image.data, image.size}, address);
    if (whole == nullptr) return KRAL_STREAM_WRITE_FAILED;
    if (header.size > stream::kLongestHeader) {
      Fail(stream::HeaderTooLong(header.size));
      connection.log().WriteLine(kLogErr, "multi-image open failed\n");
      return KRAL_STREAM_OPEN_FAILED;
    }
    std::unique_ptr<images::PhoneImage> opening;
    if (header.data != nullptr) opening = images::MakeMemoryImage({header.data, header.size}, 0);
    if (header.data != nullptr && opening == nullptr) return KRAL_STREAM_WRITE_FAILED;
    return Write(connection, *whole, opening.get(), arguments);
  });
}

}  // namespace kral::download
