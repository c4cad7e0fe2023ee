// Hands out the handles of jobs: counted, so that a value comes back only after 16 million jobs, and in a range that no
// handset's handle has, so that neither is taken for the other.
#include "station/job_table.h"

#include <map>

#include "base/failure.h"
#include "base/mutex.h"

namespace kral::station::JobTable {
namespace {

constexpr KRAL_VENTRIMS_JOB kFirst = 0x56000001;  // handles of the system are smaller by far
constexpr KRAL_VENTRIMS_JOB kLast = 0x56FFFFFF;

struct Table {
  Mutex mutex;
  KRAL_VENTRIMS_JOB next KRAL_GUARDED_BY(mutex) = kFirst;
  std::map<KRAL_VENTRIMS_JOB, std::shared_ptr<Job>> jobs KRAL_GUARDED_BY(mutex);
};

// Never destroyed: the process may end with jobs running.
Table& Jobs() {
  static Table& table = *new Table;
  return table;
}

std::shared_ptr<Job> Unknown(KRAL_VENTRIMS_JOB handle) {
  Fail(Failure(KRAL_ERROR_ARGUMENT, "the handle 0x%X is not one of a job", static_cast<unsigned>(handle)));
  return nullptr;
}

}  // namespace

KRAL_VENTRIMS_JOB Add() {
  Table& table = Jobs();
  const MutexLock lock(table.mutex);
  while (table.jobs.contains(table.next)) table.next = table.next == kLast ? kFirst : table.next + 1;
  const KRAL_VENTRIMS_JOB handle = table.next;
  table.jobs.emplace(handle, std::make_shared<Job>(handle));
  table.next = handle == kLast ? kFirst : handle + 1;
  return handle;
}

std::shared_ptr<Job> Find(KRAL_VENTRIMS_JOB handle) {
  Table& table = Jobs();
  const MutexLock lock(table.mutex);
  const auto found = table.jobs.find(handle);
  return found == table.jobs.end() ? Unknown(handle) : found->second;
}

std::shared_ptr<Job> Remove(KRAL_VENTRIMS_JOB handle) {
  Table& table = Jobs();
  const MutexLock lock(table.mutex);
  const auto found = table.jobs.find(handle);
  if (found == table.jobs.end()) return Unknown(handle);
  auto job = std::move(found->second);
  table.jobs.erase(found);
  return job;
}

}  // namespace kral::station::JobTable
