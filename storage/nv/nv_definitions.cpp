// Keeps definitions and finds them by index, id and path.
#include "storage/nv/nv_definitions.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "storage/pkv/pkv_format.h"

namespace kral::nv {
namespace {

constexpr std::string_view kRfFolder = "/nv/item_files/rfnv/";
constexpr size_t kRfDigits = 8;
constexpr size_t kLongestGenericPath = 200;  // a request with a path has room for little more

}  // namespace

std::string NvItem::Title() const {
  return is_file() ? path : "NV ID " + std::to_string(*id);
}

std::optional<uint16_t> RfIdOfPath(std::string_view path) {
  const std::string key = pkv::PathKey(path);
  if (!key.starts_with(kRfFolder)) return std::nullopt;
  const std::string_view digits = std::string_view(key).substr(kRfFolder.size());
  uint16_t id = 0;
  const auto result = std::from_chars(digits.data(), digits.data() + digits.size(), id);
  if (digits.size() != kRfDigits || result.ec != std::errc() || result.ptr != digits.data() + digits.size()) {
    return std::nullopt;
  }
  return id;
}

bool IsUsualPath(std::string_view path) {
  return !path.empty() && path.size() <= kLongestGenericPath &&
         std::ranges::all_of(path, [](char c) { return c >= ' ' && c <= '~'; });
}

NvTypePtr NvDefinitions::FindType(std::string_view name) const {
  const auto type = types_.find(std::string(name));
  return type == types_.end() ? nullptr : type->second;
}

void NvDefinitions::PutType(NvTypePtr type) {
  types_[type->name()] = std::move(type);
}

NvItem* NvDefinitions::At(size_t index) {
  if (index < numbered_.size()) return &numbered_[index];
  index -= numbered_.size();
  return index < files_.size() ? &files_[index] : nullptr;
}

NvItem* NvDefinitions::FindNumbered(uint16_t id) {
  const auto item = by_id_.find(id);
  return item == by_id_.end() ? nullptr : &numbered_[item->second];
}

NvItem* NvDefinitions::Find(uint16_t id) {
  if (NvItem* const item = FindNumbered(id)) return item;
  if (const auto item = by_rf_id_.find(id); item != by_rf_id_.end()) return &files_[item->second];
  return nullptr;
}

NvItem* NvDefinitions::Find(std::string_view path) {
  const auto item = by_path_.find(pkv::PathKey(path));
  return item == by_path_.end() ? nullptr : &files_[item->second];
}

bool NvDefinitions::Put(NvItem item) {
  auto& items = item.is_file() ? files_ : numbered_;
  size_t index = items.size();
  if (item.is_file()) {
    index = by_path_.try_emplace(pkv::PathKey(item.path), index).first->second;
    if (item.id) by_rf_id_[*item.id] = index;
  } else {
    index = by_id_.try_emplace(*item.id, index).first->second;
  }
  if (index == items.size()) {
    items.push_back(std::move(item));
    return false;
  }
  const bool was_generic = items[index].generic;
  if (item.mode == 0) item.mode = items[index].mode;  // the handset's file is the same
  items[index] = std::move(item);
  return !was_generic;
}

void NvDefinitions::Clear() {
  *this = {};
}

}  // namespace kral::nv
