// The failures that more than one step of a download can end with.
#include "download/link/download_failure.h"

#include "kral/download.h"
#include "platform/file_util.h"

namespace kral::download {

uint32_t Aborted() {
  Fail(Failure(KRAL_ERROR_ABORTED, "the download was aborted"));
  return KRAL_DOWNLOAD_ABORTED;
}

uint32_t BadArgument(uint32_t result, const char* what) {
  Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", what));
  return result;
}

// Whoever wanted it read or mapped it in a way of its own; here is only asked what the system says of it.
Failure NotOpened(const std::string& file) {
  FileReader reader;
  if (const auto error = reader.Open(file)) return FileFailure(file, "cannot be opened").System(error);
  return FileFailure(file, reader.size() == 0 ? "is empty" : "cannot be read");
}

}  // namespace kral::download
