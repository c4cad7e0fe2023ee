// Sets of items between the NV tool and files of the PC, and the reports.
#include <algorithm>
#include <cstdio>
#include <map>
#include <memory>
#include <set>
#include <utility>

#include "commands/nv/nv_item.h"
#include "kral/efs.h"
#include "platform/file_util.h"
#include "storage/items/phone_identity.h"
#include "storage/nv/nv_report.h"
#include "storage/nv/nv_tool.h"
#include "storage/nv/nv_value.h"
#include "storage/pkv/pkv_array_note.h"
#include "transport/engine/kral_thread_interface.h"

namespace kral::nv {
namespace {

NvError ErrorOf(const pkv::PkvOutcome& outcome) {
  switch (outcome.result) {
    case pkv::PkvResult::kDone:
      return NvError::kNone;
    case pkv::PkvResult::kNoStorage:
      return NvError::kNoPkvStorage;
    case pkv::PkvResult::kDamagedItem:
      return NvError::kBadPkvItem;
    case pkv::PkvResult::kNoItem:
      return NvError::kNoValue;
    case pkv::PkvResult::kCannotOpen:
    case pkv::PkvResult::kCannotWrite:
      break;
  }
  return NvError::kCannotOpenPkv;
}

NvError Judged(Diag_FTM& phone, const pkv::PkvOutcome& outcome) {
  const NvError error = ErrorOf(outcome);
  if (error == NvError::kNone) return error;
  phone.log().WriteLine(kLogErr, "%s", outcome.text.c_str());  // begins with the path
  Fail(ToolFailure(error, outcome.text));
  return error;
}

NvError ReadPkvFile(Diag_FTM& phone, const std::string& file, pkv::PkvSet& set) {
  const pkv::PkvOutcome outcome = pkv::ReadPkv(file, set);
  const NvError error = Judged(phone, outcome);
  pkv::LogUnread(phone.log(), file, set);
  return error;
}

// A path of a file as a title.
std::string Printable(std::string path) {
  std::replace_if(
      path.begin(), path.end(), [](char c) { return c < ' ' || c > '~'; }, '?');
  return path;
}

NvError SaveText(const std::string& file, const std::string& text, NvError failure) {
  const std::vector<uint8_t> bytes(text.begin(), text.end());
  const std::error_code error = ReplaceWholeFile(file, bytes);
  return error ? NotWritten(failure, file, error) : NvError::kNone;
}

}  // namespace

// --- PKV files -------------------------------------------------------------------------------------------------------

NvError NVTool_Manager::TakeStored(Diag_FTM& phone, NvItem& item, NvSlot slot, std::span<const uint8_t> stored,
                                   uint32_t failure) {
  auto value = FromStored(item, stored);
  if (!value) {
    phone.log().WriteLine(kLogErr, "%s: %d bytes are no value of its type", item.Title().c_str(),
                          static_cast<int>(stored.size()));
    Fail(Failure(failure, "%s: %zu bytes are no value of the type in its definition", item.Title().c_str(),
                 stored.size()));
    return NvError::kCannotGetValue;
  }
  item.values[slot] = std::move(*value);
  return NvError::kNone;
}

// What a PKV file tells of its items beside their values.
struct NVTool_Manager::PkvArrays {
  explicit PkvArrays(const pkv::PkvSet& set) : noted(pkv::NotedArrays(set.properties)) {
    for (const pkv::PkvNvItem& entry : set.items) {
      // Beyond the last element that there can be the word still says that the item is an array.
      auto& index = highest[entry.id];
      index = std::max(index, entry.index <= kHighestElement ? entry.index : uint16_t{1});
    }
    if (!noted) return;
    // One element at least that is not the first: else the item would be a plain one.
    for (const uint16_t id : *noted) highest[id] = std::max<uint16_t>(highest[id], 1);
  }
  bool IsArray(uint16_t id) const { return highest.at(id) > 0; }

  std::optional<std::set<uint16_t>> noted;
  std::map<uint16_t, uint16_t> highest;  // index word by id
};

// Null when the index word names no element, and when file and definition do not agree on what is an array: the first
// byte of the value is then part of it, or is not.
NvItem* NVTool_Manager::ItemOfPkv(Diag_FTM& phone, const pkv::PkvNvItem& entry, const PkvArrays& arrays) {
  NvItem* item = definitions_.FindNumbered(entry.id);
  const uint16_t highest_index = arrays.highest.at(entry.id);
  if (item == nullptr) item = &Define(phone, GenericItem(entry.id, highest_index));
  if (entry.index > item->max_index) return nullptr;
  return !arrays.noted || item->is_array() == arrays.IsArray(entry.id) ? item : nullptr;
}

NvError NVTool_Manager::LoadFromPkv(Diag_FTM& phone, const std::string& file) {
  pkv::PkvSet set;
  if (const NvError error = ReadPkvFile(phone, file, set); error != NvError::kNone) return error;
  const PkvArrays arrays(set);
  Walk walk(*this, KRAL_NV_OPERATION_READ_PKV, set.items.size() + set.files.size());
  for (const pkv::PkvNvItem& entry : set.items) {
    NvItem* item = ItemOfPkv(phone, entry, arrays);
    NvError error = NvError::kBadPkvItem;
    if (item == nullptr) {
      phone.log().WriteLine(kLogErr, "NV ID %d with index %d has no place", entry.id, entry.index);
      Fail(Failure(KRAL_ERROR_BAD_FILE, "NV item %d of the file has index %d, which has no place", entry.id,
                   entry.index));
    } else {
      const size_t size = item->is_array() ? kDataSize - 1 : kDataSize;
      error = !item->will_read ? NvError::kNone
                               : TakeStored(phone, *item, {entry.subscription, entry.index},
                                            std::span(entry.data).first(size), KRAL_ERROR_BAD_FILE);
    }
    walk.Report("NV ID " + std::to_string(entry.id), error);
  }
  for (const pkv::PkvEfsFile& entry : set.files) {
    walk.Report(Printable(entry.path), TakeFile(phone, entry));
  }
  return walk.failed() ? NvError::kBadPkvItem : NvError::kNone;
}

NvError NVTool_Manager::TakeFile(Diag_FTM& phone, const pkv::PkvEfsFile& entry) {
  NvItem* item = definitions_.Find(entry.path);
  if (item == nullptr) {
    if (entry.bytes.size() > kLongestValue || !IsUsualPath(entry.path)) {
      phone.log().WriteLine(kLogErr, "A file of %u bytes is left out: it is too large or its name is unusual",
                            static_cast<unsigned>(entry.bytes.size()));
      Fail(Failure(KRAL_ERROR_BAD_FILE, "the file %s of %zu bytes is too large, or its name is unusual",
                   entry.path.c_str(), entry.bytes.size()));
      return NvError::kBadPkvItem;
    }
    item = &Define(phone, GenericFile(entry.path, entry.bytes.size()));
  }
  if (!item->will_read) return NvError::kNone;
  const NvError error = TakeStored(phone, *item, {}, entry.bytes, KRAL_ERROR_BAD_FILE);
  if (error == NvError::kNone) item->mode = entry.mode;
  return error;
}

bool NVTool_Manager::AppendToPkv(Diag_FTM& phone, const NvItem& item, NvSlot slot, const NvBytes& value,
                                 pkv::PkvSet& set) const {
  auto stored = ToStored(item, value);
  if (!stored) {
    phone.log().WriteLine(kLogErr, "%s: its value has no room in a data field", item.Title().c_str());
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: its value has no room in a data field", item.Title().c_str()));
  }
  if (item.is_file()) {
    const uint32_t mode = item.mode != 0 ? item.mode : ModeOfNewFile(stored->size());
    set.files.push_back({item.path, mode, std::move(*stored)});
    return true;
  }
  pkv::PkvNvItem entry;
  entry.id = *item.id;
  entry.index = slot.element;
  entry.subscription = slot.subscription;
  std::copy_n(stored->begin(), std::min(stored->size(), entry.data.size()), entry.data.begin());
  set.items.push_back(entry);
  return true;
}

NvError NVTool_Manager::WriteToPkv(Diag_FTM& phone, const std::string& file) {
  const std::vector<NvItem*> items = Chosen(&NvItem::will_write);
  size_t total = 0;
  for (const NvItem* item : items) total += item->values.size();
  if (total == 0) return Told(NvError::kNoValue, "no item that the filter lets pass has a value");
  Walk walk(*this, KRAL_NV_OPERATION_WRITE_PKV, total);
  pkv::PkvSet set;
  std::set<uint16_t> arrays;
  for (const NvItem* item : items) {
    if (item->is_array() && item->id) arrays.insert(*item->id);
    for (const auto& [slot, value] : item->values) {
      const bool appended = AppendToPkv(phone, *item, slot, value, set);
      walk.Report(item->Title(), appended ? NvError::kNone : NvError::kCannotSetValue);
    }
  }
  // A backup that lacks something is none.
  if (walk.failed()) return NvError::kCannotSetValue;
  // Values need no handset, and the null port is none; one that is there signs them.
  const bool has_handset = phone.port() != kNullPort && phone.connected() && phone.IsPhoneConnected();
  if (has_handset) items::AppendIdentity(phone, set.properties);
  pkv::NoteArrays(arrays, set.properties);
  const pkv::PkvOutcome outcome = pkv::WritePkv(file, set, &phone.log());
  return Judged(phone, outcome);
}

// --- Source files ----------------------------------------------------------------------------------------------------

NvError NVTool_Manager::LoadFromSource(Diag_FTM& phone, const std::string& file) {
  NvSource source;
  std::string problem;
  if (const NvError error = LoadSource(file, source, problem); error != NvError::kNone) {
    phone.log().WriteLine(kLogErr, "%s", problem.c_str());
    Fail(ToolFailure(error, problem));
    return error;
  }
  std::map<uint16_t, uint16_t> highest;
  for (const NvSourceItem& entry : source.items) {
    if (!entry.id) continue;
    auto& index = highest[*entry.id];
    index = std::max(index, entry.slot.element);
  }
  Walk walk(*this, KRAL_NV_OPERATION_READ_SOURCE, source.items.size());
  for (const NvSourceItem& entry : source.items) {
    const NvError error = TakeSource(phone, entry, entry.id ? highest[*entry.id] : uint16_t{0});
    walk.Report(entry.id ? "NV ID " + std::to_string(*entry.id) : entry.path, error);
  }
  for (auto& [number, list] : source.roaming_lists) roaming_lists_[number] = std::move(list);
  return walk.failed() ? NvError::kBadSourceItem : NvError::kNone;
}

NvError NVTool_Manager::TakeSource(Diag_FTM& phone, const NvSourceItem& entry, uint16_t highest_index) {
  const auto reject = [&](const std::string& problem) {
    const std::string text = (entry.id ? "NV ID " + std::to_string(*entry.id) : entry.path) + ": " + problem;
    phone.log().WriteLine(kLogErr, "%s", text.c_str());
    Fail(ToolFailure(NvError::kBadSourceItem, text));
    return NvError::kBadSourceItem;
  };
  std::optional<NvBytes> bytes;
  if (!entry.is_direct) bytes = FromHex(entry.value);
  if (!entry.is_direct && !bytes) return reject("its value is not hexadecimal");
  NvItem* item = entry.id ? definitions_.FindNumbered(*entry.id) : definitions_.Find(entry.path);
  if (item == nullptr) {
    if (entry.is_direct) return reject("decimal numbers need a definition");
    if (!entry.id && (bytes->size() > kLongestValue || !IsUsualPath(entry.path))) {
      return reject("it is too large or its name is unusual");
    }
    NvItem generic = entry.id ? GenericItem(*entry.id, highest_index) : GenericFile(entry.path, bytes->size());
    generic.name = entry.name;
    item = &Define(phone, std::move(generic));
  }
  if (!item->will_read) return NvError::kNone;
  if (entry.slot.element > item->max_index) return reject("its index is out of range");
  const NvSlot slot{item->is_file() ? uint16_t{0} : entry.slot.subscription, entry.slot.element};
  if (entry.is_direct) {
    std::string problem;
    auto value = item->type->FromText(entry.value, problem);
    if (!value) return reject(problem);
    item->values[slot] = std::move(*value);
    return NvError::kNone;
  }
  if (item->generic && item->is_file()) {
    item->type = std::make_shared<NvDataType>(NvDataType::Generic(bytes->size()));
  } else if (item->generic && bytes->size() < item->type->longest()) {
    bytes->resize(item->type->longest());  // as a write fills the data field up
  }
  auto value = item->type->Cut(*bytes);
  if (!value) return reject("its bytes are no value of its type");
  item->values[slot] = std::move(*value);
  return NvError::kNone;
}

NvError NVTool_Manager::WriteToSource(Diag_FTM& phone, const std::string& file) {
  NvSource source;
  for (const NvItem* item : Chosen(&NvItem::will_write)) {
    for (const auto& [slot, value] : item->values) {
      NvSourceItem entry;
      if (item->is_file()) {
        entry.path = item->path;
      } else {
        entry.id = item->id;
      }
      entry.name = item->name;
      entry.slot = slot;
      entry.is_direct = !item->generic;
      entry.value = entry.is_direct ? item->type->ToText(value) : ToHex(value);
      source.items.push_back(std::move(entry));
    }
  }
  source.roaming_lists = roaming_lists_;
  if (source.items.empty() && source.roaming_lists.empty()) {
    return Told(NvError::kNoValue, "no item that the filter lets pass has a value");
  }
  Walk walk(*this, KRAL_NV_OPERATION_WRITE_SOURCE, source.items.size());
  for (const NvSourceItem& entry : source.items) {
    walk.Report(entry.id ? "NV ID " + std::to_string(*entry.id) : entry.path, NvError::kNone);
  }
  const NvError error = SaveSource(file, source);
  if (error == NvError::kNone) return error;
  phone.log().WriteLine(kLogErr, "%s cannot be written", file.c_str());
  return error;
}

// --- Reports ---------------------------------------------------------------------------------------------------------

NvError NVTool_Manager::ComparePkv(Diag_FTM& phone, const std::string& first, const std::string& second,
                                   const std::string& page) {
  for (const auto* const source : {&first, &second}) {
    const std::unique_ptr<std::FILE, bool (*)(std::FILE*)> reading(OpenToRead(*source), CloseStream);
    if (reading == nullptr || !IsInUse(page)) continue;
    Fail(Failure(KRAL_ERROR_ARGUMENT, "the page %.150s would replace a file that is being read or written",
                 page.c_str()));
    return NvError::kCannotOpenReport;
  }
  pkv::PkvSet first_set;
  pkv::PkvSet second_set;
  if (const NvError error = ReadPkvFile(phone, first, first_set); error != NvError::kNone) return error;
  if (const NvError error = ReadPkvFile(phone, second, second_set); error != NvError::kNone) return error;
  NvComparison comparison;
  const std::string text = ComparisonPage(first, first_set, second, second_set, definitions_, comparison);
  phone.log().WriteLine(kLogRet,
                        "KRAL_NV_PKV_Diff: %u items differ, %u only in the first, %u only in the second, %u same",
                        static_cast<unsigned>(comparison.changed), static_cast<unsigned>(comparison.only_first),
                        static_cast<unsigned>(comparison.only_second), static_cast<unsigned>(comparison.same));
  return SaveText(page, text, NvError::kCannotOpenReport);
}

NvError NVTool_Manager::GenerateQdf(const std::string& file) {
  const std::string text = QdfText(definitions_);
  // An older list is worth more than an empty one.
  if (text.empty()) return Told(NvError::kNoValue, "no item has a value");
  return SaveText(file, text, NvError::kCannotOpenQdf);
}

}  // namespace kral::nv
