// Settings that live as long as a phone object and are kept across its connects.
#ifndef KRAL_FRAME_PHONE_SETTINGS_H
#define KRAL_FRAME_PHONE_SETTINGS_H

#include <atomic>
#include <cstdint>
#include <deque>
#include <optional>
#include <vector>

#include "kral/connection.h"
#include "kral/download.h"
#include "kral/efs.h"
#include "kral/pkv.h"

namespace kral {

inline constexpr uint8_t kTargetModem = KRAL_TARGET_MODEM;              // the diagnostic service runs on the modem chip
inline constexpr uint8_t kTargetApplication = KRAL_TARGET_APPLICATION;  // ... on an application processor

class FtmSequencer;

struct FtmSettings {
  uint32_t command_code = 75;  // 75 or 59
  uint8_t subsystem = 11;
  uint32_t mode_id = 1;
  int32_t last_rf_mode = 9;
  uint32_t queue_mode = 0;            // 1: requests are collected by the sequencer instead of being sent
  uint16_t sequence_id = 0;           // given to the request collected last
  FtmSequencer* sequencer = nullptr;  // not owned; none: every request goes out at once
};

// Of the boot transfer. The atomic ones are set from any thread; what has begun goes on with the former values.
struct KivratSettings {
  std::atomic<uint32_t> hello_retries{0};
  std::atomic<uint32_t> retry_delay_ms{500};
  std::atomic<uint32_t> pre_done_delay_ms{0};
  uint32_t read_time_out_ms = 5000;  // these two are shorter in tests only
  uint32_t settle_ms = 500;
};

// Files or directories that the handset keeps open for this library.
struct EfsOpenHandles {
  std::optional<uint32_t> in_use;
  uint32_t unanswered = 0;       // opening requests whose answers may still come, and tell of further handles
  std::vector<uint32_t> strays;  // opened by such requests, to be closed
};

// The atomic ones are set from any thread, also while a transfer runs; the others belong to whoever holds the request
// lock.
struct EfsSettings {
  std::atomic<uint16_t> read_packet_size{536};
  std::atomic<uint16_t> write_packet_size{524};
  std::atomic<bool> abort{false};
  std::atomic<uint32_t> aborts{0};  // how often that was set
  bool gave_up = false;             // an abort has ended the wait for an answer that did not come
  std::atomic<KRAL_EFS_TRANSFER_CALLBACK> transfer_callback{nullptr};
  std::atomic<KRAL_EFS_DIRECTORY_CALLBACK> directory_callback{nullptr};
  std::atomic<KRAL_HANDLE> callback_context{0};
  uint32_t packet_time_out_ms = 2000;  // of writes, listings and mkdir; shorter in tests only
  EfsOpenHandles files;
  EfsOpenHandles directories;
};

struct NvQueueItem {
  uint16_t item;
  std::vector<uint8_t> data;  // at most 128 bytes
};

// NV writes collected for few packets; commands/nv_batch.h.
struct NvBatch {
  bool on = false;
  std::deque<NvQueueItem> queue;
  std::vector<uint16_t> read_only;  // items whose refusal as read-only is no error
};

// What backups read, and what became of the last one's items.
struct PkvSettings {
  std::atomic<KRAL_PKV_CALLBACK> callback{nullptr};  // set from any thread
  uint16_t first_item = 0;
  uint16_t last_item = 9999;
  uint16_t subscriptions = 1;
  KRAL_PKV_COUNTS counts{};
  bool running = false;  // a backup, restore or comparison: its callback must not begin another one
};

// Set from any thread, also while a download runs.
struct DownloadSettings {
  std::atomic<bool> abort{false};
  bool keep_abort = false;  // while several downloads are one piece of work: an abort in between counts
  std::atomic<KRAL_DOWNLOAD_PROGRESS_CALLBACK> progress_callback{nullptr};
  std::atomic<uintptr_t> callback_value{0};
  std::atomic<uint32_t> hello_tries{5};
  std::atomic<uint32_t> hello_retry_delay_ms{500};
  // Bounds of single waits in the handshakes and for acknowledgements; set in tests only.
  uint32_t handshake_limit_ms = UINT32_MAX;
  uint32_t acknowledge_limit_ms = UINT32_MAX;
};

}  // namespace kral

#endif
