// A download to several handsets: a job of the library, shown as any work on several handsets is.
#ifndef KRAL_TOOLS_FLASH_FLASH_MANY_H
#define KRAL_TOOLS_FLASH_FLASH_MANY_H

#include <string>
#include <vector>

#include "tools/kral/flash/flash_target.h"

namespace kral::tool {

struct FlashPlan {
  std::string programmer;      // for boot loaders; empty: one is running
  bool enter = false;          // from diagnostics into the boot loader first
  std::uint32_t return_s = 0;  // how long a port may take to come back; 0: as the library has it
  std::uint32_t pre_done_delay_ms = 0;
  std::string partition_table;
  bool override_table = false;
  std::vector<std::string> images;  // as FILE or TYPE:FILE
  WriteOptions options;
  bool reset = false;
};

// Each file is read once, by the job, whatever the number of handsets.
void FlashMany(Context& context, const FlashPlan& plan);

}  // namespace kral::tool

#endif
