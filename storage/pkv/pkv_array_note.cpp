// Writes and reads the note of arrays.
#include "storage/pkv/pkv_array_note.h"

#include <algorithm>
#include <charconv>
#include <string_view>

namespace kral::pkv {
namespace {

constexpr const char* kArraysProperty = "Arrays";

}  // namespace

void NoteArrays(const std::set<uint16_t>& ids, PkvProperties& properties) {
  std::string list;
  for (const uint16_t id : ids) list.append(list.empty() ? "" : ",").append(std::to_string(id));
  properties.values.emplace_back(kArraysProperty, list);
}

std::optional<std::set<uint16_t>> NotedArrays(const PkvProperties& properties) {
  const auto& values = properties.values;
  const auto note = std::ranges::find_if(values, [](const auto& v) { return v.first == kArraysProperty; });
  if (note == values.end()) return std::nullopt;
  std::set<uint16_t> ids;
  for (std::string_view rest = note->second; !rest.empty();) {
    const std::string_view digits = rest.substr(0, rest.find(','));
    rest.remove_prefix(std::min(digits.size() + 1, rest.size()));
    uint16_t id = 0;
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), id);
    if (error == std::errc() && end == digits.data() + digits.size()) ids.insert(id);
  }
  return ids;
}

}  // namespace kral::pkv
