// A download from cold: boot transfer, flash programmer, images, as one piece of work with one progress.
#ifndef KRAL_DOWNLOAD_FLASH_ALL_H
#define KRAL_DOWNLOAD_FLASH_ALL_H

#include <cstdint>
#include <span>

#include "download/boot/kivrat.h"
#include "frame/diag_ftm.h"
#include "kral/download.h"
#include "kral/kivrat.h"

namespace kral::download {

struct FlashOutcome {
  uint32_t result = KRAL_STREAM_WRITTEN;  // a number of <kral/kivrat.h> or <kral/download.h>
  uint32_t image = KRAL_FLASH_NO_IMAGE;   // the one that it speaks of
};

// `types` has one for each image, or is null.
FlashOutcome FlashAll(Diag_FTM& phone, const char* programmer, std::span<const char* const> images,
                      const uint8_t* types);

// The boot transfer's part of it, with the caller's progress and abort.
bool ServeFlashProgrammer(Diag_FTM& phone, const char* file);
bool ServeFlashProgrammer(Diag_FTM& phone, const kivrat::Programmer& programmer);

}  // namespace kral::download

#endif
