// Exports of the NV packet functions: name line, handle, operation.
#include <span>
#include <vector>

#include "base/outputs.h"
#include "commands/nv/nv_batch.h"
#include "commands/nv/nv_item.h"
#include "frame/export_call.h"
#include "kral/nv.h"

namespace nv = kral::nv;
using kral::Diag_FTM;
using kral::ExportCall;
using kral::Put;

namespace {

bool IsMissing(Diag_FTM& phone, const char* name, const void* data, uint32_t count) {
  if (data != nullptr || count == 0) return false;
  phone.log().WriteLine(kral::kLogErr, "%s() -- its data are missing", name);
  kral::Fail(kral::Failure(KRAL_ERROR_ARGUMENT, "there is no buffer for the data"));
  return true;
}

// Data and status of a read; a null status goes out as 0.
using ItemRead = kral::Reply (*)(Diag_FTM& phone, uint16_t item, uint16_t context, std::span<uint8_t> data,
                                 uint16_t& status);

bool Read(Diag_FTM& phone, const char* name, ItemRead read, uint16_t item, uint16_t context, uint8_t* data,
          uint16_t length, uint16_t* status) {
  phone.log().WriteLine(kral::kLogFn, "%s (iItemID = %d, iLength = %d)", name, item, length);
  if (IsMissing(phone, name, data, length)) return false;
  uint16_t reported = status == nullptr ? uint16_t{0} : *status;
  if (!read(phone, item, context, {data, length}, reported)) return false;
  Put(status, reported);
  return true;
}

// The write that batch mode turns into an entry of the queue.
bool Write(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t* status) {
  phone.log().WriteLine(kral::kLogFn, "KRAL_DIAG_NV_WRITE_F (iItemID = %d , pItemData[0] = %d, iLength = %d)", item,
                        data.empty() ? 0 : data[0], static_cast<int>(data.size()));
  uint16_t reported = nv::kDone;
  if (phone.state<nv::Batch>().on) {
    nv::Enqueue(phone, item, data);
  } else if (!nv::Write(phone, item, data, reported)) {
    return false;
  }
  Put(status, reported);
  return true;
}

bool ReadElement(Diag_FTM& phone, uint16_t item, uint8_t index, uint8_t* data, uint16_t length, uint16_t* status) {
  uint16_t reported = nv::kDone;
  const bool answered = !IsMissing(phone, "KRAL_DIAG_NV_READ_ARRAY_F", data, length) &&
                        nv::ReadElement(phone, item, index, {data, length}, reported);
  // The status tells why, so it is handed out with a refusal, too.
  if (answered) Put(status, reported);
  const bool passed = answered && (reported == nv::kDone || kral::Fail(nv::Refusal(item, reported)));
  phone.log().WriteLine(kral::kLogRet, "KRAL_DIAG_NV_READ_ARRAY_F () = %s", passed ? "PASS" : "FAIL");
  return passed;
}

bool Flush(Diag_FTM& phone, uint16_t* last_item, uint16_t* total_status, uint8_t* item_status) {
  nv::BatchOutcome outcome;
  const bool written = nv::FlushBatchQueue(phone, outcome);
  Put(last_item, outcome.last_item);
  Put(total_status, outcome.total_status);
  Put(item_status, outcome.last_item_status);
  return written;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_DIAG_NV_READ_F(KRAL_HANDLE handle, uint16_t item, uint8_t* data, uint16_t length,
                                      uint16_t* status) {
  const ItemRead read = [](Diag_FTM& phone, uint16_t id, uint16_t, std::span<uint8_t> bytes, uint16_t& reported) {
    return nv::Read(phone, id, bytes, reported);
  };
  return ExportCall(handle, __func__).Run(Read, __func__, read, item, uint16_t{0}, data, length, status);
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_F(KRAL_HANDLE handle, uint16_t item, const uint8_t* data, uint16_t length,
                                       uint16_t* status) {
  return ExportCall(handle, __func__).Run([&](Diag_FTM& phone) {
    return !IsMissing(phone, "KRAL_DIAG_NV_WRITE_F", data, length) && Write(phone, item, {data, length}, status);
  });
}

uint8_t KRAL_CALL KRAL_DIAG_NV_READ_EXT_F(KRAL_HANDLE handle, uint16_t item, uint8_t* data, uint16_t context,
                                          uint16_t length, uint16_t* status) {
  return ExportCall(handle, __func__)
      .Run(Read, "KRAL_DIAG_NV_READ_EXT_F", nv::ReadExtended, item, context, data, length, status);
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_EXT_F(KRAL_HANDLE handle, uint16_t item, const uint8_t* data, uint16_t context,
                                           uint16_t length, uint16_t* status) {
  return ExportCall(handle, __func__).Run([&](Diag_FTM& phone) {
    phone.log().WriteLine(kral::kLogFn, "KRAL_DIAG_NV_WRITE_EXT_F (iItemID = %d, iLength = %d)", item, length);
    if (IsMissing(phone, "KRAL_DIAG_NV_WRITE_EXT_F", data, length)) return false;
    uint16_t reported = status == nullptr ? uint16_t{0} : *status;
    if (!nv::WriteExtended(phone, item, context, {data, length}, reported)) return false;
    Put(status, reported);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_DIAG_NV_READ_ARRAY_F(KRAL_HANDLE handle, uint16_t item, uint8_t index, uint8_t* data,
                                            uint16_t length, uint16_t* status) {
  return ExportCall(handle, __func__).Run(ReadElement, item, index, data, length, status);
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_ARRAY_F(KRAL_HANDLE handle, uint16_t item, uint8_t index, const uint8_t* data,
                                             uint16_t length, uint16_t* status) {
  return ExportCall(handle, __func__).Run([&](Diag_FTM& phone) {
    if (IsMissing(phone, "KRAL_DIAG_NV_WRITE_ARRAY_F", data, length)) return false;
    std::vector<uint8_t> element{index};
    element.insert(element.end(), data, data + length);
    return Write(phone, item, element, status);
  });
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_SetBatchMode(KRAL_HANDLE handle, uint8_t start) {
  return ExportCall(handle, __func__).Run([start](Diag_FTM& phone) {
    nv::SetBatchMode(phone, start != 0);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(KRAL_HANDLE handle, const uint16_t* items, uint16_t count) {
  return ExportCall(handle, __func__).Run([&](Diag_FTM& phone) {
    if (IsMissing(phone, "KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List", items, count)) return false;
    nv::SetReadOnlyList(phone, {items, count});
    return true;
  });
}

uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_FlushBatchQueue(KRAL_HANDLE handle, uint16_t* last_error_item,
                                                     uint16_t* last_total_status, uint8_t* last_item_status) {
  return ExportCall(handle, __func__).Run(Flush, last_error_item, last_total_status, last_item_status);
}

}  // extern "C"
