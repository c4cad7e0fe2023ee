// The handles of jobs.
#ifndef KRAL_STATION_JOB_TABLE_H
#define KRAL_STATION_JOB_TABLE_H

#include <memory>

#include "kral/ventrims.h"
#include "station/job.h"

namespace kral::station::JobTable {

KRAL_VENTRIMS_JOB Add();                                // a new job; may throw for want of memory
std::shared_ptr<Job> Find(KRAL_VENTRIMS_JOB handle);    // null, with the failure noted, for an unknown one
std::shared_ptr<Job> Remove(KRAL_VENTRIMS_JOB handle);  // the same; from now on it is unknown

}  // namespace kral::station::JobTable

#endif
