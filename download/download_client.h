// What a caller can have downloaded. Null outputs are not wanted; results are the numbers of <kral/download.h>.
#ifndef KRAL_DOWNLOAD_DOWNLOAD_CLIENT_H
#define KRAL_DOWNLOAD_DOWNLOAD_CLIENT_H

#include <cstdint>

#include "frame/diag_ftm.h"
#include "kral/download.h"

namespace kral::download {

// --- Settings; without the request lock -----------------------------------------------------------------------------
bool SetCallback(Diag_FTM& phone, KRAL_DOWNLOAD_PROGRESS_CALLBACK callback, uintptr_t value);
bool Abort(Diag_FTM& phone);
bool ConfigureHello(Diag_FTM& phone, uint32_t tries, uint32_t delay_ms);

// --- KOVA -----------------------------------------------------------------------------------------------------------
bool LoadFlashProgrammer(Diag_FTM& phone, const char* file, uint32_t maximum_packet, uint32_t* result);
bool KovaNop(Diag_FTM& phone);
bool KovaReset(Diag_FTM& phone);
bool KovaSoftwareVersion(Diag_FTM& phone, uint8_t* version);

// --- Streaming ------------------------------------------------------------------------------------------------------
bool StreamHello(Diag_FTM& phone, uint32_t variant, uint32_t* block_size, uint16_t* window);
bool SecurityMode(Diag_FTM& phone, uint8_t mode);
bool PartitionTable(Diag_FTM& phone, const char* file, uint8_t override_table, uint8_t* status);

struct WriteArguments {
  uint8_t image_type;
  uint8_t method;
  uint32_t block_size;
  uint16_t window;  // as announced
};
bool WriteImageFile(Diag_FTM& phone, const char* file, uint32_t format, const char* header_file,
                    const WriteArguments& arguments, uint32_t* result);
struct CallersBytes {
  const uint8_t* data;
  uint32_t size;
};
bool WriteImageMem(Diag_FTM& phone, const CallersBytes& image, uint32_t address, const CallersBytes& header,
                   const WriteArguments& arguments, uint32_t* result);

}  // namespace kral::download

#endif
