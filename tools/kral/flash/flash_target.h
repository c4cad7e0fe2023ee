// A handset that is being downloaded to: how far it is, and what is done to it, with progress and Ctrl-C.
#ifndef KRAL_TOOLS_FLASH_FLASH_TARGET_H
#define KRAL_TOOLS_FLASH_FLASH_TARGET_H

#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

#include "tools/kral/flash/flash_images.h"
#include "tools/kral/progress.h"
#include "tools/kral/session.h"
#include "tools/kral/verbs.h"

namespace kral::tool {

// Passes Ctrl-C on to the library for as long as it lives.
class AbortWatch {
 public:
  explicit AbortWatch(KRAL_HANDLE handle);
  ~AbortWatch();
  AbortWatch(const AbortWatch&) = delete;
  AbortWatch& operator=(const AbortWatch&) = delete;

 private:
  void Run(KRAL_HANDLE handle);

  std::mutex mutex_;
  std::condition_variable changed_;
  bool stop_ = false;
  std::thread thread_;
};

struct ProgrammerLimits {
  std::uint32_t block_size = 0;
  std::uint16_t window = 0;
};

struct WriteOptions {
  std::uint8_t type = 0;  // of images that do not name their own
  std::string header;
  bool nor = false;
  std::uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT;
  std::uint32_t block_size = 0;  // at most this; 0: as the handset says
};

// Why an image could not be written, right behind the call; `result` as KRAL_STREAM_WriteImageFile gave it.
ToolError ExplainWrite(const Session& session, const std::string& file, std::uint32_t result);

// Where a flash programmer should have the line.
ToolError InDiagnosticMode(std::uint16_t port);

class FlashTarget {
 public:
  explicit FlashTarget(const Context& context);
  ~FlashTarget();
  FlashTarget(const FlashTarget&) = delete;
  FlashTarget& operator=(const FlashTarget&) = delete;

  Session& session() { return session_; }

  // Null-like answers mean that something else has the line.
  std::optional<std::uint8_t> LoaderVersion();
  std::optional<ProgrammerLimits> TryHello(std::uint32_t tries);
  ProgrammerLimits Hello();  // ToolError when no programmer answers

  void EnterLoader();  // from diagnostic mode; nothing for a handset that does not speak it
  void Reset();
  void Load(const FlashImage& programmer, std::uint32_t maximum_packet);
  void SetSecurityMode(std::uint8_t mode);
  void SendPartitionTable(const std::string& file, bool override_table);
  // `done_before` of `total` bytes went with earlier images.
  void Write(const FlashImage& image, const WriteOptions& options, const ProgrammerLimits& limits,
             std::uint64_t done_before, Progress& progress);

 private:
  static void KRAL_CALL OnProgress(KRAL_HANDLE handle, std::uint32_t done, std::uint32_t total, std::uintptr_t value);

  const Context& context_;
  Session session_;
  AbortWatch watch_;
  Progress* progress_ = nullptr;
  std::uint64_t done_before_ = 0;
};

}  // namespace kral::tool

#endif
