// The factory of the phone server, and the time-outs of its download jobs.
#include "frame/orbt_server.h"

#include <utility>

#include "base/time_outs.h"
#include "frame/library_state.h"

namespace kral {

bool SoftwareDownload::ConfigureTimeOut(uint32_t id, int32_t milliseconds) {
  if (id < kTimeOutSoftwareDownload) return false;
  const MutexLock lock(mutex_);
  time_outs_[id] = milliseconds;
  return true;
}

int32_t SoftwareDownload::GetTimeOut(uint32_t id) const {
  const MutexLock lock(mutex_);
  const auto found = time_outs_.find(id);
  return found == time_outs_.end() ? 0 : found->second;
}

void SetServerFactory(ServerFactory factory) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.server_factory = std::move(factory);
}

ServerFactory CurrentServerFactory() {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  return library.server_factory;
}

}  // namespace kral
