// The settings of a phone object for its downloads.
#ifndef KRAL_DOWNLOAD_LINK_DOWNLOAD_SETTINGS_H
#define KRAL_DOWNLOAD_LINK_DOWNLOAD_SETTINGS_H

#include <atomic>
#include <cstdint>

#include "kral/download.h"

namespace kral::download {

// Set from any thread, also while a download runs.
struct Settings {
  std::atomic<bool> abort{false};
  bool keep_abort = false;  // while several downloads are one piece of work: an abort in between counts
  std::atomic<KRAL_DOWNLOAD_PROGRESS_CALLBACK> progress_callback{nullptr};
  std::atomic<uintptr_t> callback_value{0};
  // Of work that downloads are parts of: told in the caller's place, whatever a caller configures meanwhile.
  std::atomic<KRAL_DOWNLOAD_PROGRESS_CALLBACK> part_callback{nullptr};
  std::atomic<uintptr_t> part_value{0};
  std::atomic<uint32_t> hello_tries{5};
  std::atomic<uint32_t> hello_retry_delay_ms{500};
  // Bounds of single waits in the handshakes and for acknowledgements; set in tests only.
  uint32_t handshake_limit_ms = UINT32_MAX;
  uint32_t acknowledge_limit_ms = UINT32_MAX;
};

}  // namespace kral::download

#endif
