// Exports of jobs: the handle, what callers may pass, the operation of the job.
#include "kral/ventrims.h"

#include <algorithm>
#include <cstring>
#include <string>

#include "base/failure.h"
#include "base/outputs.h"
#include "frame/export_call.h"
#include "kral/diag.h"
#include "kral/download.h"
#include "station/job_table.h"

namespace {

using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::kNoFileName;
using kral::station::Job;
using kral::station::JobHandset;
using kral::station::Step;
using kral::station::StepKind;
namespace table = kral::station::JobTable;

constexpr const char* kNoRecord = "there is no record, or its size is too small";

// operation(job) on the job of that handle.
template <class Operation>
uint8_t OnJob(ExportCall& call, KRAL_VENTRIMS_JOB handle, Operation&& operation) {
  return call.Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    const auto job = table::Find(handle);
    return job && operation(*job) ? 1 : 0;
  });
}

template <class Operation>
uint8_t OnJob(const char* function, KRAL_VENTRIMS_JOB handle, Operation&& operation) {
  ExportCall call(handle, function);
  return OnJob(call, handle, operation);
}

// The first version's size is the least; of a longer record the rest is left alone.
template <class Record>
bool IsRecord(const Record* record) {
  return record != nullptr && record->size >= sizeof(Record);
}

template <class Record>
bool GiveRecord(Record* output, const Record& record) {
  if (!IsRecord(output)) return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", kNoRecord));
  *output = record;
  return true;
}

bool AddFileStep(Job& job, StepKind kind, const char* file, uint32_t number = 0) {
  if (file == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", kNoFileName));
  return job.AddStep({.kind = kind, .file = file, .number = number});
}

const char* WhatIsWrongWithImage(uint32_t format, uint8_t method) {
  if (format > KRAL_IMAGE_FORMAT_HEX) return "there is no such image format";
  return method > KRAL_STREAM_NOR ? "there is no such method of writing an image" : nullptr;
}

bool NotFromCallback(const Job& job, const char* what) {
  return !job.IsCalling() || Fail(Failure(KRAL_ERROR_ARGUMENT, "a job cannot be %s from its own callback", what));
}

}  // namespace

extern "C" {

KRAL_VENTRIMS_JOB KRAL_CALL KRAL_VENTRIMS_Create(void) {
  return ExportCall(__func__).Connecting([] { return table::Add(); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_Free(KRAL_VENTRIMS_JOB job) {
  return OnJob(__func__, job, [job](const Job& found) {
    if (!NotFromCallback(found, "freed")) return false;
    const auto removed = table::Remove(job);
    if (removed) removed->Close();
    return removed != nullptr;
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetOptions(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_OPTIONS* options) {
  return OnJob(__func__, job, [options](const Job& found) { return GiveRecord(options, found.options()); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_SetOptions(KRAL_VENTRIMS_JOB job, const KRAL_VENTRIMS_OPTIONS* options) {
  return OnJob(__func__, job, [options](Job& found) {
    return IsRecord(options) ? found.SetOptions(*options) : Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", kNoRecord));
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddProgrammer(KRAL_VENTRIMS_JOB job, const char* file, uint32_t kind) {
  return OnJob(__func__, job, [=](Job& found) {
    if (kind > KRAL_VENTRIMS_PROGRAMMER_HEX)
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no flash programmer of kind %u", kind));
    return AddFileStep(found, StepKind::kProgrammer, file, kind);
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddPartitionTable(KRAL_VENTRIMS_JOB job, const char* file, uint8_t override_table) {
  return OnJob(__func__, job,
               [=](Job& found) { return AddFileStep(found, StepKind::kPartitionTable, file, override_table); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddImage(KRAL_VENTRIMS_JOB job, const char* file, uint32_t format, uint8_t image_type,
                                         const char* header_file, uint8_t method) {
  return OnJob(__func__, job, [=](Job& found) {
    if (file == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", kNoFileName));
    if (const char* const wrong = WhatIsWrongWithImage(format, method))
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", wrong));
    Step step{.kind = StepKind::kImage, .file = file, .number = format, .image_type = image_type, .method = method};
    step.has_header = header_file != nullptr;
    if (step.has_header) step.header_file = header_file;
    return found.AddStep(std::move(step));
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddIdentity(KRAL_VENTRIMS_JOB job) {
  return OnJob(__func__, job, [](Job& found) { return found.AddStep({.kind = StepKind::kIdentity}); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddMode(KRAL_VENTRIMS_JOB job, uint32_t mode) {
  return OnJob(__func__, job, [=](Job& found) {
    if (mode > KRAL_MODE_LOW_POWER) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no operating mode %u", mode));
    return found.AddStep({.kind = StepKind::kMode, .number = mode});
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddRestore(KRAL_VENTRIMS_JOB job, const char* file) {
  return OnJob(__func__, job, [=](Job& found) { return AddFileStep(found, StepKind::kRestore, file); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddVerify(KRAL_VENTRIMS_JOB job, const char* file) {
  return OnJob(__func__, job, [=](Job& found) { return AddFileStep(found, StepKind::kVerify, file); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetStepName(KRAL_VENTRIMS_JOB job, uint32_t step, char* text, uint32_t size) {
  return OnJob(__func__, job, [=](const Job& found) {
    std::string name;
    if (!found.StepName(step, name)) return false;
    if (text == nullptr || name.size() >= size)
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no room for the %zu bytes of the name", name.size() + 1));
    std::memcpy(text, name.c_str(), name.size() + 1);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddPort(KRAL_VENTRIMS_JOB job, uint32_t port, uint32_t* handset) {
  return OnJob(__func__, job, [=](Job& found) { return found.AddPort(port, handset); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_AddHandle(KRAL_VENTRIMS_JOB job, KRAL_HANDLE handle, uint32_t* handset) {
  return OnJob(__func__, job, [=](Job& found) { return found.AddHandle(handle, handset); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetHandle(KRAL_VENTRIMS_JOB job, uint32_t handset, KRAL_HANDLE* handle) {
  return OnJob(__func__, job, [=](const Job& found) {
    const auto one = found.handset(handset);
    if (one) kral::Put(handle, one->handle());
    return one != nullptr;
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_SetCallback(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_CALLBACK callback, uintptr_t value) {
  return OnJob(__func__, job, [=](Job& found) { return found.SetCallback(callback, value); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_Start(KRAL_VENTRIMS_JOB job) {
  return OnJob(__func__, job, [](Job& found) { return found.Start(); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_Abort(KRAL_VENTRIMS_JOB job, uint32_t handset) {
  return OnJob(__func__, job, [=](Job& found) { return found.Abort(handset); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_Wait(KRAL_VENTRIMS_JOB job, uint32_t time_out_ms) {
  ExportCall call(job, __func__);
  call.Answering();
  return OnJob(call, job, [=](Job& found) { return NotFromCallback(found, "waited for") && found.Wait(time_out_ms); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetState(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_STATE* state) {
  return OnJob(__func__, job, [=](const Job& found) { return GiveRecord(state, found.state()); });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetProgress(KRAL_VENTRIMS_JOB job, uint32_t handset, KRAL_VENTRIMS_PROGRESS* progress) {
  return OnJob(__func__, job, [=](const Job& found) {
    const auto one = found.handset(handset);
    return one && GiveRecord(progress, one->progress());
  });
}

uint8_t KRAL_CALL KRAL_VENTRIMS_GetResult(KRAL_VENTRIMS_JOB job, uint32_t handset, KRAL_VENTRIMS_RESULT* result) {
  return OnJob(__func__, job, [=](const Job& found) {
    const auto one = found.handset(handset);
    if (!one) return false;
    if (!one->ended()) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no verdict on handset %u yet", handset));
    return GiveRecord(result, one->result());
  });
}

}  // extern "C"
