// A handset in its primary boot loader: asked who it is, given a flash programmer, flashed from cold.
#ifndef KRAL_TOOLS_FLASH_BOOT_TARGET_H
#define KRAL_TOOLS_FLASH_BOOT_TARGET_H

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tools/kral/flash/flash_images.h"
#include "tools/kral/flash/flash_target.h"
#include "tools/kral/session.h"
#include "tools/kral/verbs.h"

namespace kral::tool {

struct BootOptions {
  bool enter = false;         // the handset is in diagnostic mode: send it into its boot loader first
  std::uint32_t wait_s = 10;  // for the port to come (back)
  std::uint32_t pre_done_delay_ms = 0;
};

struct BootIdentity {
  std::uint32_t version = 0;
  std::optional<std::uint32_t> chip;  // nothing for a target that has none
};

// What to do where a boot loader is concerned; empty for what concerns none.
std::string BootHint(std::uint32_t code);

class BootTarget {
 public:
  BootTarget(const Context& context, const BootOptions& options);
  ~BootTarget();
  BootTarget(const BootTarget&) = delete;
  BootTarget& operator=(const BootTarget&) = delete;

  Session& session() { return session_; }

  BootIdentity Connect(bool ask_identity);
  void Load(const std::string& programmer);  // behind a Connect
  // Everything at once, the connect included.
  void FlashAll(const std::string& programmer, const std::vector<FlashImage>& images);
  void Reset();  // of a handset that runs its flash programmer

 private:
  static void KRAL_CALL OnProgress(KRAL_HANDLE handle, std::uint32_t done, std::uint32_t total, std::uintptr_t value);
  // Again and again until it succeeds, as long as all that is wrong is a port that is not there yet.
  void AwaitPort(const std::function<bool()>& attempt);
  bool IsPortMissing() const;
  ToolError Explain() const;

  const Context& context_;
  const BootOptions options_;
  Session session_;
  AbortWatch watch_;
  Progress* progress_ = nullptr;
};

}  // namespace kral::tool

#endif
