// Takes one handset through the steps of a job, on one thread: attempts, and what lies between two of them.
#ifndef KRAL_STATION_HANDSET_WORKER_H
#define KRAL_STATION_HANDSET_WORKER_H

#include <cstdint>
#include <functional>

#include "base/failure.h"
#include "kral/ventrims.h"
#include "station/job_handset.h"
#include "station/step.h"

namespace kral::station {

class HandsetWorker {
 public:
  // All borrowed.
  HandsetWorker(JobHandset& handset, const Plan& plan, const KRAL_VENTRIMS_OPTIONS& options);

  // To the handset's end, whatever that is.
  void Run();

 private:
  class Attempt;

  bool RunStep(const Step& step);
  // These two under the request lock, inside an Attempt.
  bool Do(const Step& step);
  bool Recover(const Step& step);  // false with the failure noted: what was lost cannot go on
  bool IsThere(const Step& step);  // false with the failure noted: it went away between two steps

  bool ReadIdentity(bool whole);
  bool EnterLoader();
  bool StartProgrammer(const Step& step);
  bool BootTransfer(const Step& step);
  bool Greet(uint32_t within_ms = UINT32_MAX);
  bool GreetFirst();
  bool GreetAgain();
  bool WriteImage(const Step& step);
  bool Restart();
  bool SetMode(uint32_t mode);

  bool AwaitPort();
  bool IsStillInDiagnostics();
  bool IsSameHandset(bool with_new_software = false);
  bool FailAsAnother(uint32_t serial);
  bool MayHaveSerial(uint32_t serial) const;
  bool AwaitDiagnostics(uint32_t within_ms);
  bool AwaitLoader(uint32_t within_ms);
  bool Await(uint32_t within_ms, const std::function<bool()>& holds);  // false also when an abort ended it
  bool Pause(uint32_t milliseconds);                                   // false when an abort ended it
  bool stopped() const { return handset_.stop(); }
  // What `start_ms` and `hello_ms` bound: waiting that long once more would help nobody.
  bool InTime(bool in_time);
  uint32_t Now() const { return phone_.clock().TickMs(); }

  JobHandset& handset_;
  Diag_FTM& phone_;
  const Plan& plan_;
  const KRAL_VENTRIMS_OPTIONS& options_;
  uint32_t retries_left_;
  const CallFailure* failure_ = nullptr;  // of the attempt under way
  uint32_t lost_by_ = KRAL_ERROR_NONE;    // the failure before
  bool is_final_ = false;                 // the time of a start is over, or another handset is there
  bool programmer_started_ = false;
  bool greeted_ = false;
  uint32_t block_size_ = 0;
  uint16_t window_ = 0;
};

}  // namespace kral::station

#endif
