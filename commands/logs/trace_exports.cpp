// Exports of the trace of a connection.
#include "frame/export_call.h"
#include "kral/log.h"
#include "transport/trace/trace_writer.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;
using kral::kNoFileName;

bool ReadTraceCounters(Diag_FTM& phone, KRAL_TRACE_COUNTERS* counters) {
  const kral::TraceCounters c = phone.trace().counters();
  *counters = {c.frames, c.bad, c.others, c.lost, c.lost_bytes, phone.trace().pending()};
  return true;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_StartTrace(KRAL_HANDLE handle, const char* file_name) {
  return ExportCall(handle, __func__)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(&Diag_FTM::StartTrace, file_name);
}

uint8_t KRAL_CALL KRAL_StopTrace(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce(&Diag_FTM::StopTrace);
}

uint8_t KRAL_CALL KRAL_KeepTrace(KRAL_HANDLE handle, uint32_t bytes) {
  return ExportCall(handle, __func__).RunAtOnce(&Diag_FTM::KeepTrace, bytes);
}

uint8_t KRAL_CALL KRAL_SaveTrace(KRAL_HANDLE handle, const char* file_name) {
  return ExportCall(handle, __func__)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(&Diag_FTM::SaveTrace, file_name);
}

uint8_t KRAL_CALL KRAL_GetTraceCounters(KRAL_HANDLE handle, KRAL_TRACE_COUNTERS* counters) {
  return ExportCall(handle, __func__)
      .Require(counters != nullptr, "there is no room for the counters")
      .Unlogged()
      .RunAtOnce(ReadTraceCounters, counters);
}

}  // extern "C"
