// The EFS settings of a phone object, its callbacks and its aborts. A transfer reads them as it goes, so that setting
// them never waits for one.
#include "storage/efs/efs_client.h"

#include "base/guarded_call.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {

bool SetPacketSizes(Diag_FTM& phone, uint16_t read_size, uint16_t write_size) {
  // Not tested here: a size that cannot work fails the transfer that uses it.
  Settings& settings = phone.state<Settings>();
  settings.read_packet_size = read_size;
  settings.write_packet_size = write_size;
  return true;
}

bool SetAutomaticPacketSizes(Diag_FTM& phone, bool on) {
  phone.state<Settings>().automatic_packet_size = on;
  return true;
}

bool SetCallbacks(Diag_FTM& phone, KRAL_HANDLE context, KRAL_EFS_TRANSFER_CALLBACK transfer,
                  KRAL_EFS_DIRECTORY_CALLBACK directory) {
  Settings& settings = phone.state<Settings>();
  settings.callback_context = context;
  settings.transfer_callback = transfer;
  settings.directory_callback = directory;
  return true;
}

Progress CallersProgress(Diag_FTM& phone, const void* source, const void* destination) {
  return [&settings = phone.state<Settings>(), from = reinterpret_cast<uintptr_t>(source),
          to = reinterpret_cast<uintptr_t>(destination)](u32 operation, u32 done, u32 total) {
    if (const auto callback = settings.transfer_callback.load()) {
      const KRAL_HANDLE context = settings.callback_context;
      CallGuarded([&] { callback(from, to, operation, 0, done, total, context); });
    }
  };
}

void TellCaller(Diag_FTM& phone, const KRAL_EFS_ENTRY& entry) {
  const Settings& settings = phone.state<Settings>();
  if (const auto callback = settings.directory_callback.load()) {
    CallGuarded([&] { callback(&entry, settings.callback_context); });
  }
}

// A phone server has the wait in its own hands.
AbortableJob::AbortableJob(Diag_FTM& phone) : AbortWatch(phone), phone_(phone) {
  Settings& settings = phone.state<Settings>();
  settings.job_abort = false;
  settings.in_job = true;
  if (!phone.server_mode()) former_ = phone.transport().SetAbort(&settings.job_abort);
}

AbortableJob::~AbortableJob() {
  phone_.state<Settings>().in_job = false;
  if (!phone_.server_mode()) phone_.transport().SetAbort(former_);
}

bool Abort(Diag_FTM& phone) {
  Settings& settings = phone.state<Settings>();
  ++settings.aborts;
  settings.abort = true;
  settings.job_abort = true;
  phone.transport().WakeWaiter();
  return true;
}

}  // namespace kral::efs
