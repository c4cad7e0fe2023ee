// Exports of software download: name line, handle, operation.
#include <algorithm>
#include <exception>

#include "base/text_argument.h"
#include "download/download_client.h"
#include "download/images/image_file.h"
#include "download/link/download_failure.h"
#include "frame/export_call.h"

namespace download = kral::download;
using kral::ExportCall;
using kral::TextOrEmpty;

namespace {

// For the functions that have no handset: the result of download.h is handed out, and decides.
template <class Operation>
uint8_t WithoutPhone(const char* function, uint32_t* result, Operation&& operation) {
  return ExportCall(function).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    uint32_t value = KRAL_STREAM_FILE_NOT_DECODED;
    try {
      value = operation();
    } catch (const std::exception& exception) {
      kral::Fail(kral::Failure(KRAL_ERROR_INTERNAL, "%s", exception.what()));
    }
    if (result != nullptr) *result = value;
    return value == KRAL_STREAM_WRITTEN ? 1 : 0;
  });
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_ConfigureDownloadCallBack(KRAL_HANDLE handle, KRAL_DOWNLOAD_PROGRESS_CALLBACK callback,
                                                 uintptr_t value) {
  return ExportCall(handle, __func__).RunAtOnce(download::SetCallback, callback, value);
}

uint8_t KRAL_CALL KRAL_AbortDownload(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce(download::Abort);
}

uint8_t KRAL_CALL KRAL_KOVA_LoadFlashProgrammer(KRAL_HANDLE handle, const char* programmer_file,
                                                uint32_t maximum_packet, uint32_t* result) {
  return ExportCall(handle, __func__)
      .Logged("( sFlashProgrammer = %s, iMaxPacket = %u )", TextOrEmpty(programmer_file), maximum_packet)
      .Run(download::LoadFlashProgrammer, programmer_file, maximum_packet, result);
}

uint8_t KRAL_CALL KRAL_KOVA_NOP(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(download::KovaNop);
}

uint8_t KRAL_CALL KRAL_KOVA_RESET(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(download::KovaReset);
}

uint8_t KRAL_CALL KRAL_KOVA_SW_VERSION(KRAL_HANDLE handle, uint8_t* version) {
  return ExportCall(handle, __func__).Run(download::KovaSoftwareVersion, version);
}

uint8_t KRAL_CALL KRAL_STREAM_HELLO(KRAL_HANDLE handle, uint32_t variant, uint32_t* block_size, uint16_t* window) {
  return ExportCall(handle, __func__)
      .Logged("( iVariant = %u )", variant)
      .Run(download::StreamHello, variant, block_size, window);
}

uint8_t KRAL_CALL KRAL_STREAM_ConfigureHello(KRAL_HANDLE handle, uint32_t tries, uint32_t delay_ms) {
  return ExportCall(handle, __func__)
      .Logged("( iTries = %u, iDelay_ms = %u )", tries, delay_ms)
      .RunAtOnce(download::ConfigureHello, tries, delay_ms);
}

uint8_t KRAL_CALL KRAL_STREAM_SECURITY_MODE(KRAL_HANDLE handle, uint8_t mode) {
  return ExportCall(handle, __func__).Logged("( iMode = %d )", mode).Run(download::SecurityMode, mode);
}

uint8_t KRAL_CALL KRAL_STREAM_PARTITION_TABLE(KRAL_HANDLE handle, const char* table_file, uint8_t override_table,
                                              uint8_t* status) {
  return ExportCall(handle, __func__)
      .Logged("( sTable = %s, bOverride = %d )", TextOrEmpty(table_file), override_table)
      .Run(download::PartitionTable, table_file, override_table, status);
}

uint8_t KRAL_CALL KRAL_STREAM_WriteImageFile(KRAL_HANDLE handle, const char* image_file, uint32_t format,
                                             uint8_t image_type, const char* header_file, uint8_t method,
                                             uint32_t block_size, uint16_t window, uint32_t* result) {
  return ExportCall(handle, __func__)
      .Logged("( sImage = %s, iType = %d, sHeader = %s )", TextOrEmpty(image_file), image_type,
              TextOrEmpty(header_file))
      .Run(download::WriteImageFile, image_file, format, header_file,
           download::WriteArguments{image_type, method, block_size, window}, result);
}

uint8_t KRAL_CALL KRAL_STREAM_WriteImageMem(KRAL_HANDLE handle, const uint8_t* data, uint32_t size, uint32_t address,
                                            uint8_t image_type, const uint8_t* header, uint32_t header_size,
                                            uint8_t method, uint32_t block_size, uint16_t window, uint32_t* result) {
  return ExportCall(handle, __func__)
      .Logged("( iSize = %u, iAddress = 0x%08X, iType = %d )", size, address, image_type)
      .Run(download::WriteImageMem, download::CallersBytes{data, size}, address,
           download::CallersBytes{header, header_size},
           download::WriteArguments{image_type, method, block_size, window}, result);
}

uint8_t KRAL_CALL KRAL_IMAGE_GetInfo(const char* image_file, uint32_t format, KRAL_IMAGE_INFO* info, uint32_t* result) {
  return WithoutPhone(__func__, result, [=] {
    if (image_file == nullptr || info == nullptr) {
      return download::BadArgument(KRAL_STREAM_BAD_ARGUMENT, "there is no image file, or no room for what is in it");
    }
    return kral::images::GetImageInfo(image_file, format, *info);
  });
}

uint8_t KRAL_CALL KRAL_HEX_FindLoss(const char* hex_file, uint32_t* line, uint64_t* bytes, uint32_t* result) {
  return WithoutPhone(__func__, result, [=] {
    if (hex_file == nullptr || line == nullptr) {
      return download::BadArgument(KRAL_STREAM_BAD_ARGUMENT, "there is no HEX file, or no room for the line");
    }
    kral::images::HexLoss loss;
    const uint32_t value = kral::images::FindHexLoss(hex_file, loss);
    if (value != KRAL_STREAM_WRITTEN) return value;
    *line = static_cast<uint32_t>(std::min<uint64_t>(loss.line, UINT32_MAX));
    if (bytes != nullptr) *bytes = loss.bytes;
    return value;
  });
}

uint8_t KRAL_CALL KRAL_HEX_Convert(const char* input, const char* output, uint32_t direction, uint32_t* base_address,
                                   uint32_t* result) {
  return WithoutPhone(__func__, result, [=] {
    uint32_t base = base_address == nullptr ? 0 : *base_address;
    if (input == nullptr || output == nullptr || direction > KRAL_HEX_FROM_BINARY) {
      return download::BadArgument(KRAL_STREAM_BAD_ARGUMENT, "there is no file to read or write, or no such direction");
    }
    const uint32_t value = direction == KRAL_HEX_FROM_BINARY ? kral::images::BinaryToHex(input, output, base)
                                                             : kral::images::HexToBinary(input, output, base);
    if (value == KRAL_STREAM_WRITTEN && base_address != nullptr) *base_address = base;
    return value;
  });
}

}  // extern "C"
