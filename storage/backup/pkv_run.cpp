// Runs a backup, restore or comparison as one piece of work: never two of a handset at once, and with one judgement.
#include "base/at_exit.h"
#include "base/failure.h"
#include "base/outputs.h"
#include "storage/backup/pkv_jobs.h"

namespace kral::backup {
namespace {

// What a job as a whole came to. What was noted before may be something that it got over.
Failure Judgement(uint32_t status, const char* file, const KRAL_PKV_COUNTS& counts) {
  switch (status) {
    case KRAL_PKV_STATUS_INCOMPLETE:
      return Failure(KRAL_ERROR_REFUSED, "%s lacks %u of %u items and files, which the handset refused", file,
                     counts.refused, counts.total);
    case KRAL_PKV_STATUS_NOTHING_READ:
      return Failure(KRAL_ERROR_REFUSED, "the handset gave nothing for %s: %u of %u items and files were refused", file,
                     counts.refused, counts.total);
    case KRAL_PKV_STATUS_NOT_WRITTEN:
      return Failure(counts.refused != 0 ? KRAL_ERROR_REFUSED : KRAL_ERROR_MISMATCH,
                     "of %s the handset refused %u of %u items and files, and %u read back otherwise", file,
                     counts.refused, counts.total, counts.different + counts.not_read_back);
    case KRAL_PKV_STATUS_DIFFERENT:
      return Failure(KRAL_ERROR_MISMATCH, "%u of %u items and files of %s differ on the handset, and %u were refused",
                     counts.different, counts.total, file, counts.refused);
    case KRAL_PKV_STATUS_LOST:
      return Failure(KRAL_ERROR_LOST, "the handset stopped answering with %u of %u items and files not reached",
                     counts.not_reached, counts.total);
    case KRAL_PKV_STATUS_STOPPED:
      return Failure(KRAL_ERROR_ABORTED, "stopped by the caller with %u of %u items and files not reached",
                     counts.not_reached, counts.total);
    default:
      return Failure(KRAL_ERROR_BAD_FILE, "%s is damaged, or no PKV file", file);
  }
}

// Whether what was noted says more: of what fails at the file, whether or not the handset has answered, and of a
// handset that was not reached at all.
bool IsToldByWhatWasNoted(uint32_t status, const KRAL_PKV_COUNTS& counts) {
  return status == KRAL_PKV_STATUS_CANNOT_OPEN || status == KRAL_PKV_STATUS_NO_STORAGE ||
         status == KRAL_PKV_STATUS_BAD_ITEM || (status == KRAL_PKV_STATUS_NOTHING_READ && counts.done > 0) ||
         (status == KRAL_PKV_STATUS_LOST && counts.not_reached + counts.skipped == counts.total);
}

}  // namespace

bool Run(Diag_FTM& phone, const std::string& file, const std::function<uint32_t()>& job, uint32_t* status) {
  Put(status, uint32_t{KRAL_PKV_STATUS_UNEXPECTED});
  Settings& settings = phone.state<Settings>();
  if (settings.running) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "a backup, restore or comparison is under way")
                    .Status(KRAL_ERROR_STATUS_RESULT, KRAL_PKV_STATUS_UNEXPECTED));
  }
  settings.running = true;
  const AtExit ended([&settings] { settings.running = false; });
  const uint32_t result = job();
  Put(status, result);
  if (result == KRAL_PKV_STATUS_DONE) return true;
  if (NotedFailure() != KRAL_ERROR_NONE && IsToldByWhatWasNoted(result, settings.counts)) return false;
  return Fail(Judgement(result, file.c_str(), settings.counts).Status(KRAL_ERROR_STATUS_RESULT, result));
}

}  // namespace kral::backup
