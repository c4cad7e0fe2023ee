// The order of the steps: what callers added, with what the options and the job itself add.
#ifndef KRAL_STATION_JOB_PLAN_H
#define KRAL_STATION_JOB_PLAN_H

#include <optional>

#include "kral/ventrims.h"
#include "station/step.h"

namespace kral::station {

// Nothing, with the failure noted, for steps in an order that no handset can take.
std::optional<Plan> MakePlan(const std::vector<Step>& steps, uint32_t flags);

// Whether the handset is in its boot loader when the plan begins: then nobody may talk to it first, and what it has
// said already must be kept.
bool BeginsInBootLoader(const Plan& plan);

}  // namespace kral::station

#endif
