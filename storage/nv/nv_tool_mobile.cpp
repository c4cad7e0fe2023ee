// Sets and single items between the NV tool and the handset.
#include <algorithm>
#include <utility>

#include "commands/nv/nv_item.h"
#include "storage/efs/efs_format.h"
#include "storage/nv/nv_tool.h"
#include "storage/nv/nv_value.h"

namespace kral::nv {
namespace {

using Answer = items::PhoneItems::Answer;

size_t CountElements(const std::vector<NvItem*>& items) {
  size_t count = 0;
  for (const NvItem* item : items) count += size_t{item->max_index} + 1;
  return count;
}

}  // namespace

NvError NVTool_Manager::LoadFromMobile(Diag_FTM& phone) {
  NvMobile mobile(phone, subscription_);
  const FailureMark begin;
  const Answer listed = DefineItemFiles(phone, mobile);
  if (listed == Answer::kLost) return NvError::kNoConnection;
  if (listed == Answer::kAnswered) begin.GoBack();
  const std::vector<NvItem*> items = Chosen(&NvItem::will_read);
  Walk walk(*this, KRAL_NV_OPERATION_READ_MOBILE, CountElements(items));
  for (NvItem* item : items) {
    for (uint32_t element = 0; element <= item->max_index; ++element) {
      uint16_t status = 0;
      const NvError error = ReadElement(phone, mobile, *item, static_cast<uint16_t>(element), status);
      walk.Report(item->Title(), error);
      if (error == NvError::kNoConnection) return error;
    }
  }
  return walk.failed() || listed != Answer::kAnswered ? NvError::kCannotGetValue : NvError::kNone;
}

// kRefused when there may be more files than those that were found.
Answer NVTool_Manager::DefineItemFiles(Diag_FTM& phone, NvMobile& mobile) {
  std::vector<items::PhoneItems::FoundFile> files;
  const Answer listed = mobile.ListItemFiles(files);
  if (listed == Answer::kLost) return listed;
  if (listed == Answer::kRefused) phone.log().WriteLine(kLogErr, "Item files could not be listed to the end");
  for (const auto& [path, mode, size] : files) {
    if (NvItem* const known = definitions_.Find(path)) {
      known->mode = mode;
      continue;
    }
    if (size > kLongestValue || !IsUsualPath(path)) {
      phone.log().WriteLine(kLogErr, "A file of %u bytes is left out: it is too large or its name is unusual", size);
      continue;
    }
    Define(phone, GenericFile(path, size)).mode = mode;
  }
  return listed;
}

// kNoValue: the handset has none.
NvError NVTool_Manager::ReadElement(Diag_FTM& phone, NvMobile& mobile, NvItem& item, uint16_t element,
                                    uint16_t& status) {
  NvBytes stored;
  const NvAnswer answer = mobile.Read(item, element, stored);
  if (answer.kind == NvAnswer::Kind::kNoAnswer) return NvError::kNoConnection;
  status = answer.status;
  const NvSlot slot = SlotOf(item, element);
  if (answer.done()) return TakeStored(phone, item, slot, stored, KRAL_ERROR_LINK);
  item.values.erase(slot);
  if (status == kNeverWritten) return NvError::kNoValue;
  phone.log().WriteLine(kLogErr, "%s was refused with status %d", item.Title().c_str(), status);
  return item.is_file() ? NvError::kCannotReadFileItem : NvError::kCannotGetValue;
}

NvError NVTool_Manager::ReadWhole(Diag_FTM& phone, NvItem& item, uint16_t& status) {
  NvMobile mobile(phone, subscription_);
  NvError failure = NvError::kNone;
  bool has_value = false;
  FailureMark told_so_far;
  for (uint32_t element = 0; element <= item.max_index; ++element) {
    uint16_t told = 0;
    const NvError error = ReadElement(phone, mobile, item, static_cast<uint16_t>(element), told);
    if (error == NvError::kNoConnection) return error;
    has_value = has_value || error == NvError::kNone;
    // The first failure is what is told, and else that there is no value.
    if (error == NvError::kNone || failure != NvError::kNone) {
      told_so_far.GoBack();
      continue;
    }
    told_so_far = FailureMark();
    if (error == NvError::kNoValue) continue;
    failure = error;
    status = told;
  }
  if (failure != NvError::kNone || has_value) return failure;
  status = kNeverWritten;
  return item.is_file() ? NvError::kCannotReadFileItem : NvError::kCannotGetValue;
}

// An item that nobody defined gets its definition when the handset has it: as a numbered item, else as an RF NV item.
NvError NVTool_Manager::ReadItem(Diag_FTM& phone, uint16_t id, uint16_t& status) {
  if (NvItem* item = definitions_.Find(id)) return ReadWhole(phone, *item, status);
  NvItem generic = GenericItem(id);
  const NvError error = ReadWhole(phone, generic, status);
  if (error == NvError::kNone) Define(phone, std::move(generic));
  if (error == NvError::kNone || error == NvError::kNoConnection) return error;
  const KeepFailure keep;
  if (ReadItem(phone, pkv::RfNvPath(id)) != NvError::kNone) return error;
  status = 0;
  return NvError::kNone;
}

NvError NVTool_Manager::ReadItem(Diag_FTM& phone, const std::string& path) {
  uint16_t status = 0;
  if (NvItem* item = definitions_.Find(path)) return ReadWhole(phone, *item, status);
  if (!IsUsualPath(path)) return Told(NvError::kNotDefined, "the path " + path + " is not one of an item file");
  NvItem generic = GenericFile(path, 0);
  const NvError error = ReadWhole(phone, generic, status);
  if (error == NvError::kNone) Define(phone, std::move(generic));
  return error;
}

NvError NVTool_Manager::WriteElement(Diag_FTM& phone, NvMobile& mobile, const NvItem& item, NvSlot slot,
                                     const NvBytes& value, uint16_t& status) const {
  const NvError failure = item.is_file() ? NvError::kCannotWriteFileItem : NvError::kCannotSetValue;
  const auto stored = ToStored(item, value);
  if (!stored) {
    phone.log().WriteLine(kLogErr, "%s: its value has no room on the handset", item.Title().c_str());
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: its value has no room on the handset", item.Title().c_str()));
    return failure;
  }
  const NvAnswer answer = mobile.Write(item, slot.element, *stored);
  if (answer.kind == NvAnswer::Kind::kNoAnswer) return NvError::kNoConnection;
  status = answer.status;
  if (answer.done()) return NvError::kNone;
  phone.log().WriteLine(kLogErr, "%s was refused with status %d", item.Title().c_str(), status);
  return failure;
}

NvError NVTool_Manager::WriteToMobile(Diag_FTM& phone) {
  struct Value {
    const NvItem* item;
    NvSlot slot;
    const NvBytes* bytes;
  };
  std::vector<Value> values;
  for (const NvItem* item : Chosen(&NvItem::will_write)) {
    for (const auto& [slot, bytes] : item->values) {
      if (slot == SlotOf(*item, slot.element)) values.push_back({item, slot, &bytes});
    }
  }
  NvMobile mobile(phone, subscription_);
  Walk walk(*this, KRAL_NV_OPERATION_WRITE_MOBILE, values.size());
  for (const auto& [item, slot, bytes] : values) {
    uint16_t status = 0;
    const NvError error = WriteElement(phone, mobile, *item, slot, *bytes, status);
    walk.Report(item->Title(), error);
    if (error == NvError::kNoConnection) return error;
  }
  return walk.failed() ? NvError::kCannotSetValue : NvError::kNone;
}

NvError NVTool_Manager::WriteItem(Diag_FTM& phone, const NvItem& item, uint16_t& status) {
  NvMobile mobile(phone, subscription_);
  NvError result = NvError::kNoValue;
  for (const auto& [slot, value] : item.values) {
    if (slot != SlotOf(item, slot.element)) continue;
    result = WriteElement(phone, mobile, item, slot, value, status);
    if (result != NvError::kNone) return result;
  }
  if (result == NvError::kNoValue) return Told(result, item.Title() + " has no value");
  return result;
}

}  // namespace kral::nv
