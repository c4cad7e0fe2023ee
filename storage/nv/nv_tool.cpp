// Definitions, values, filters and subscriptions of the NV tool. Where sets come from and go to is in
// nv_tool_mobile.cpp and nv_tool_files.cpp.
#include "storage/nv/nv_tool.h"

#include <algorithm>
#include <utility>

#include "base/guarded_call.h"
#include "storage/nv/nv_value.h"

namespace kral::nv {
namespace {

NvError NoSuchElement(const NvItem& item, uint16_t element) {
  return Told(NvError::kIndexOutOfBound, item.Title() + ": element " + std::to_string(element) +
                                             " is not one of 0 to " + std::to_string(item.max_index));
}

}  // namespace

void NVTool_Manager::Walk::Report(const std::string& title, NvError error) {
  ++done_;
  // An item that the handset has no value for is no failure of the set.
  if (!failed_ && error != NvError::kNone && error != NvError::kNoValue) {
    failed_ = true;
    first_ = FailureMark();
  } else if (error != NvError::kNoConnection) {  // which ends the set
    first_.GoBack();
  }
  if (tool_.callback_ == nullptr) return;
  CallGuarded(
      [&] { tool_.callback_(operation_, done_, total_, title.c_str(), static_cast<uint32_t>(error), tool_.handle_); });
}

// --- Definitions -----------------------------------------------------------------------------------------------------

NvError NVTool_Manager::LoadDefinitions(Diag_FTM& phone, const std::string& file, NvDefinitionKind kind) {
  NvDefinitionFile read;
  std::string problem;
  const NvError error = LoadDefinitionFile(file, kind, definitions_, read, problem);
  if (error != NvError::kNone) {
    phone.log().WriteLine(kLogErr, "%s", problem.c_str());
    Fail(ToolFailure(error, problem));
    return error;
  }
  for (NvTypePtr& type : read.types) definitions_.PutType(std::move(type));
  bool redefined = false;
  for (NvItem& item : read.items) {
    const std::string title = item.Title();
    Mark(phone, item);
    if (!definitions_.Put(std::move(item))) continue;
    redefined = true;
    // "Defintion": stations look for the line as it is.
    phone.log().WriteLine(kLogErr, "Duplicate NV Defintion:%s Redefined", title.c_str());
  }
  return redefined ? NvError::kRedefined : NvError::kNone;
}

void NVTool_Manager::ClearDefinitions() {
  definitions_.Clear();
  roaming_lists_.clear();
}

std::string NVTool_Manager::FileNames() {
  std::string names;
  for (size_t i = definitions_.numbered_count(); i < definitions_.count(); ++i) {
    names += (names.empty() ? "" : "\n") + definitions_.At(i)->path;
  }
  return names;
}

NvItem& NVTool_Manager::Define(Diag_FTM& phone, NvItem item) {
  if (item.is_file()) {
    phone.log().WriteLine(kLogRet, "Created generic definition for item file path: %s", item.path.c_str());
  } else {
    phone.log().WriteLine(kLogRet, "NV ID %d definition not found. Created a definition with byte array of 128",
                          *item.id);
  }
  Mark(phone, item);
  const std::string path = item.path;
  const uint16_t id = item.id.value_or(0);
  definitions_.Put(std::move(item));
  return path.empty() ? *definitions_.Find(id) : *definitions_.Find(path);
}

// --- Values ----------------------------------------------------------------------------------------------------------

NvSlot NVTool_Manager::SlotOf(const NvItem& item, uint16_t element) const {
  return {item.is_file() ? uint16_t{0} : subscription_, element};
}

NvError NVTool_Manager::GetValue(const NvItem& item, uint16_t element, const NvBytes*& value) const {
  if (element > item.max_index) return NoSuchElement(item, element);
  const auto found = item.values.find(SlotOf(item, element));
  if (found == item.values.end()) return Told(NvError::kNoValue, item.Title() + " has no value");
  value = &found->second;
  return NvError::kNone;
}

NvError NVTool_Manager::SetBytes(Diag_FTM& phone, NvItem& item, uint16_t element, std::span<const uint8_t> value) {
  if (element > item.max_index) return NoSuchElement(item, element);
  if (!item.type->Holds(value)) {
    phone.log().WriteLine(kLogErr, "%s: %d bytes are no value of its type", item.Title().c_str(),
                          static_cast<int>(value.size()));
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: %zu bytes are no value of its type", item.Title().c_str(), value.size()));
    return NvError::kCannotSetValue;
  }
  item.values[SlotOf(item, element)].assign(value.begin(), value.end());
  return NvError::kNone;
}

NvError NVTool_Manager::SetText(Diag_FTM& phone, NvItem& item, uint16_t element, std::string_view text) {
  if (element > item.max_index) return NoSuchElement(item, element);
  std::string problem;
  auto value = item.type->FromText(text, problem);
  if (!value) {
    phone.log().WriteLine(kLogErr, "%s: %s", item.Title().c_str(), problem.c_str());
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: %s", item.Title().c_str(), problem.c_str()));
    return NvError::kCannotSetValue;
  }
  item.values[SlotOf(item, element)] = std::move(*value);
  return NvError::kNone;
}

void NVTool_Manager::ClearValue(NvItem& item) const {
  const uint16_t subscription = SlotOf(item, 0).subscription;
  std::erase_if(item.values, [&](const auto& value) { return value.first.subscription == subscription; });
}

void NVTool_Manager::ClearValues() {
  definitions_.ForEach([](NvItem& item) { item.values.clear(); });
  roaming_lists_.clear();
}

// --- Filters ---------------------------------------------------------------------------------------------------------

void NVTool_Manager::Mark(Diag_FTM& phone, NvItem& item) const {
  item.will_read = read_filter_.Passes(item);
  item.will_write = write_filter_.Passes(item);
  if (!phone.log().Wants(kLogNvManagerDebug)) return;
  const std::string title = item.Title();
  phone.log().WriteLine(kLogNvManagerDebug, "%s%s", title.c_str(), item.will_read ? ":WILL_READ" : ":WILL_NOT_READ");
  phone.log().WriteLine(kLogNvManagerDebug, "%s%s", title.c_str(), item.will_write ? ":WILL_WRITE" : ":WILL_NOT_WRITE");
}

void NVTool_Manager::MarkAll(Diag_FTM& phone) {
  definitions_.ForEach([&](NvItem& item) { Mark(phone, item); });
}

std::vector<NvItem*> NVTool_Manager::Chosen(bool NvItem::*mark) {
  std::vector<NvItem*> items;
  definitions_.ForEach([&](NvItem& item) {
    if (item.*mark) items.push_back(&item);
  });
  return items;
}

NvError NVTool_Manager::LoadFilter(Diag_FTM& phone, const std::string& file, NvFilter& filter) {
  std::string problem;
  const NvError error = filter.Load(file, problem);
  if (error == NvError::kNone) {
    MarkAll(phone);
  } else {
    phone.log().WriteLine(kLogErr, "%s", problem.c_str());
    Fail(ToolFailure(error, problem));
  }
  return error;
}

NvError NVTool_Manager::LoadReadFilter(Diag_FTM& phone, const std::string& file) {
  return LoadFilter(phone, file, read_filter_);
}

NvError NVTool_Manager::LoadWriteFilter(Diag_FTM& phone, const std::string& file) {
  return LoadFilter(phone, file, write_filter_);
}

void NVTool_Manager::ClearReadFilters(Diag_FTM& phone) {
  read_filter_ = {};
  MarkAll(phone);
}

void NVTool_Manager::ClearWriteFilters(Diag_FTM& phone) {
  write_filter_ = {};
  MarkAll(phone);
}

NvError NVTool_Manager::CreateFilter(const std::string& file, bool with_value) {
  std::vector<const NvItem*> items;
  definitions_.ForEach([&](const NvItem& item) {
    const uint16_t subscription = SlotOf(item, 0).subscription;
    const bool has_value =
        std::ranges::any_of(item.values, [&](const auto& value) { return value.first.subscription == subscription; });
    if (has_value == with_value) items.push_back(&item);
  });
  if (!items.empty()) return SaveFilter(file, items);
  return Told(NvError::kNoValue, with_value ? "no item has a value" : "there is no item without a value");
}

// --- Subscriptions ---------------------------------------------------------------------------------------------------

void NVTool_Manager::SetMultiSim(bool supported) {
  multi_sim_ = supported;
  if (!supported) subscription_ = 0;
}

NvError NVTool_Manager::SetSubscription(uint16_t subscription) {
  if (subscription != 0 && !multi_sim_) {
    return Told(NvError::kIndexOutOfBound,
                "there is no subscription " + std::to_string(subscription) + ": the handset has one only");
  }
  subscription_ = subscription;
  return NvError::kNone;
}

}  // namespace kral::nv
