// The EFS settings of a phone object, and what its transfers leave behind.
#ifndef KRAL_STORAGE_EFS_EFS_SETTINGS_H
#define KRAL_STORAGE_EFS_EFS_SETTINGS_H

#include <atomic>
#include <cstdint>
#include <optional>
#include <vector>

#include "kral/efs.h"

namespace kral::efs {

// Files or directories that the handset keeps open for this library.
struct OpenHandles {
  std::optional<uint32_t> in_use;
  uint32_t unanswered = 0;       // opening requests whose answers may still come, and tell of further handles
  std::vector<uint32_t> strays;  // opened by such requests, to be closed
};

// What is known of the largest packet in one direction: the size by its place in the list of those that are tried, and
// whether one has passed.
struct FoundPacketSize {
  uint8_t step = 0;
  bool passed = false;
};

// The atomic ones are set from any thread, also while a transfer runs; the others belong to whoever holds the request
// lock.
struct Settings {
  std::atomic<uint16_t> read_packet_size{536};
  std::atomic<uint16_t> write_packet_size{524};
  std::atomic<bool> automatic_packet_size{false};
  FoundPacketSize found_read;  // since somebody has connected for the n-th time
  FoundPacketSize found_write;
  uint32_t found_on = 0;
  std::atomic<bool> abort{false};
  std::atomic<bool> job_abort{false};  // set with it, and cleared by what is made of many transfers only
  std::atomic<uint32_t> aborts{0};     // how often they were set
  bool in_job = false;                 // an AbortableJob lives, or
  bool in_transfer = false;            // a Transfer: an abort ends what they do
  bool gave_up = false;                // an abort has ended the wait for an answer that did not come

  // What ends the requests under way; null: nothing does.
  const std::atomic<bool>* heeded_abort() const { return in_job ? &job_abort : in_transfer ? &abort : nullptr; }
  std::atomic<KRAL_EFS_TRANSFER_CALLBACK> transfer_callback{nullptr};
  std::atomic<KRAL_EFS_DIRECTORY_CALLBACK> directory_callback{nullptr};
  std::atomic<KRAL_HANDLE> callback_context{0};
  uint32_t packet_time_out_ms = 2000;  // of writes, listings and mkdir; shorter in tests only
  OpenHandles files;
  OpenHandles directories;
};

}  // namespace kral::efs

#endif
