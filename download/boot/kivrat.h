// The boot transfer: a handset in its primary boot loader says hello, tells its chip identity when it is asked, and
// fetches the file of a flash programmer piece by piece. The target leads; the host answers.
#ifndef KRAL_DOWNLOAD_BOOT_KIVRAT_H
#define KRAL_DOWNLOAD_BOOT_KIVRAT_H

#include <atomic>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <system_error>

#include "frame/diag_ftm.h"

namespace kral::kivrat {

// The atomic ones are set from any thread; what has begun goes on with the former values.
struct Settings {
  std::atomic<uint32_t> hello_retries{0};
  std::atomic<uint32_t> retry_delay_ms{500};
  std::atomic<uint32_t> pre_done_delay_ms{0};
  uint32_t read_time_out_ms = 5000;  // these two are shorter in tests only
  uint32_t settle_ms = 500;
};

// Told after every piece: bytes served, bytes of the file. False gives the transfer up.
using Progress = std::function<bool(uint64_t done, uint64_t total)>;
// Asked now and then while nothing comes: true gives the exchange up.
using Stop = std::function<bool()>;

// The hello exchange, in front of which the chip identity is read when there is room for one. Borrows the port of the
// phone object and keeps it on success, because the target asks for its image at once. A target without an identity
// ends the exchange with success, an empty identity, and itself still in command mode.
bool Connect(Diag_FTM& phone, uint32_t& version, std::optional<uint32_t>* identity, const Stop& stop = {});

// What a flash programmer is made of, wherever it comes from.
struct Programmer {
  uint64_t size = 0;
  // The bytes from there on: as many as there is room for, fewer only at the end.
  std::function<std::error_code(uint64_t offset, std::span<uint8_t> room, size_t& count)> read;
};

// Serves it to a target that Connect has left waiting, and gives the port back.
bool DownloadFlashProgrammer(Diag_FTM& phone, const Programmer& programmer, const Progress& progress = {},
                             const Stop& stop = {});
// The same with a file. When that cannot be opened the port stays borrowed: nothing has happened yet.
bool DownloadFlashProgrammer(Diag_FTM& phone, const std::string& file_name, const Progress& progress = {},
                             const Stop& stop = {});

}  // namespace kral::kivrat

#endif
