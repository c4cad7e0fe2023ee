// snapshot PORT FILE: backs a handset up into a PKV file, compares the two, and tells who it was; with kral.hpp.
// Exit codes: 0 done, 2 usage, else the code of the failure (KRAL_ERROR_...).
#include <cstdio>
#include <cstdlib>
#include <vector>

#include "kral/kral.hpp"

namespace {

std::uint8_t KRAL_CALL ShowRefused(const KRAL_PKV_ITEM *item, const char *path, std::uint32_t, std::uint32_t,
                                   KRAL_HANDLE) {
  if (item->result == KRAL_PKV_REFUSED) std::fprintf(stderr, "refused: %s\n", path ? path : "an NV item");
  return 1;
}

void Snapshot(const kral::Connection &phone, const char *file) {
  std::uint32_t serial = 0, status = 0;
  std::vector<char> software(KRAL_BUILD_ID_TEXT_SIZE), model(KRAL_BUILD_ID_TEXT_SIZE);
  phone.Call(KRAL_DIAG_READ_ESN_F, &serial);
  phone.Call(KRAL_DIAG_EXT_BUILD_ID_F, nullptr, nullptr, software.data(), model.data());
  phone.Call(KRAL_PKV_ConfigureBackup, 0, 999, 1);
  phone.Call(KRAL_PKV_ConfigureCallBack, ShowRefused);
  phone.Call(KRAL_BackupNVFromMobileToPKV, file, &status);
  phone.Call(KRAL_PKV_Verify, file, &status);
  KRAL_PKV_COUNTS counts = {};
  phone.Call(KRAL_PKV_GetCounts, &counts);
  std::printf("%s %08X with %s: %u items, equal\n", model.data(), static_cast<unsigned>(serial), software.data(),
              static_cast<unsigned>(counts.done));
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: snapshot PORT FILE\n");
    return 2;
  }
  try {
    Snapshot(kral::Connection(static_cast<std::uint32_t>(std::strtoul(argv[1], nullptr, 10))), argv[2]);
    return 0;
  } catch (const kral::Error &failure) {
    std::fprintf(stderr, "%s: %s\n", failure.record().function, failure.what());
    return static_cast<int>(failure.code());
  }
}
