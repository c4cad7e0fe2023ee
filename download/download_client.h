// What a caller can have downloaded. Null outputs are not wanted; results are the numbers of <kral/download.h>.
#ifndef KRAL_DOWNLOAD_DOWNLOAD_CLIENT_H
#define KRAL_DOWNLOAD_DOWNLOAD_CLIENT_H

#include <cstdint>
#include <span>

#include "download/images/image_file.h"
#include "download/kova/kova.h"
#include "frame/diag_ftm.h"
#include "kral/download.h"

namespace kral::download {

// --- Settings; without the request lock -----------------------------------------------------------------------------
bool SetCallback(Diag_FTM& phone, KRAL_DOWNLOAD_PROGRESS_CALLBACK callback, uintptr_t value);
bool Abort(Diag_FTM& phone);
bool ConfigureHello(Diag_FTM& phone, uint32_t tries, uint32_t delay_ms);

// --- KOVA -----------------------------------------------------------------------------------------------------------
bool LoadFlashProgrammer(Diag_FTM& phone, const char* file, uint32_t maximum_packet, uint32_t* result);
// The same with a file that is open already, for this handset and others at the same time.
bool LoadProgrammer(Diag_FTM& phone, const kova::ProgrammerFile& programmer, uint32_t maximum_packet, uint32_t* result);
bool KovaNop(Diag_FTM& phone);
bool KovaReset(Diag_FTM& phone);
bool KovaSoftwareVersion(Diag_FTM& phone, uint8_t* version);

// --- Streaming ------------------------------------------------------------------------------------------------------
bool StreamHello(Diag_FTM& phone, uint32_t variant, uint32_t* block_size, uint16_t* window);
bool SecurityMode(Diag_FTM& phone, uint8_t mode);
bool PartitionTable(Diag_FTM& phone, const char* file, uint8_t override_table, uint8_t* status);
bool SendPartitionTable(Diag_FTM& phone, std::span<const uint8_t> table, uint8_t override_table, uint8_t* status);

struct WriteArguments {
  uint8_t image_type;
  uint8_t method;
  uint32_t block_size;
  uint16_t window;  // as announced
};
bool WriteImageFile(Diag_FTM& phone, const char* file, uint32_t format, const char* header_file,
                    const WriteArguments& arguments, uint32_t* result);
// An image that is open already, for this handset and others at the same time. `header` may be null.
bool WriteImage(Diag_FTM& phone, const images::PhoneImage& image, const images::PhoneImage* header,
                const WriteArguments& arguments, uint32_t* result);
// Opens both for such a write. The header's name may be null. Gives KRAL_STREAM_... or 0, with the failure noted.
uint32_t OpenImage(const char* file, uint32_t format, const char* header_file, images::ImageFile& image,
                   images::ImageFile& header);
struct CallersBytes {
  const uint8_t* data;
  uint32_t size;
};
bool WriteImageMem(Diag_FTM& phone, const CallersBytes& image, uint32_t address, const CallersBytes& header,
                   const WriteArguments& arguments, uint32_t* result);

}  // namespace kral::download

#endif
