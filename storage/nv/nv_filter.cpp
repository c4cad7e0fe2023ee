// Reads, applies and writes filters.
#include "storage/nv/nv_filter.h"

#include <algorithm>
#include <iterator>
#include <string_view>
#include <utility>

#include "base/xml_attributes.h"
#include "platform/file_util.h"
#include "storage/pkv/pkv_format.h"

namespace kral::nv {
namespace {

constexpr size_t kMostEntries = size_t{1} << 18;  // all ids and more files than a handset has

std::string_view Trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r\n";
  text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
  text.remove_suffix(text.size() - std::min(text.find_last_not_of(kBlanks) + 1, text.size()));
  return text;
}

uint16_t ParseId(std::string_view text) {
  const auto id = ParseDecimal(Trimmed(text), UINT16_MAX);
  if (!id) throw BadXml(std::string(Trimmed(text)) + " is no NV id");
  return static_cast<uint16_t>(*id);
}

// "1000-1999"; several are separated by commas.
template <class Take>
void ForEachPart(std::string_view list, Take take) {
  while (!list.empty()) {
    const std::string_view part = list.substr(0, list.find(','));
    list.remove_prefix(std::min(part.size() + 1, list.size()));
    if (!Trimmed(part).empty()) take(Trimmed(part));
  }
}

// Of sorted parts of which none begins with another, the one that a text begins with is the last that is not above it.
bool HoldsAny(std::string_view text, const std::vector<std::string>& parts) {
  for (; !text.empty(); text.remove_prefix(1)) {
    const auto above = std::ranges::upper_bound(parts, text);
    if (above != parts.begin() && text.starts_with(*std::prev(above))) return true;
  }
  return false;
}

}  // namespace

bool NvFilter::Passes(const NvItem& item) const {
  if (is_empty()) return true;
  if (item.id) {
    const auto above = std::ranges::upper_bound(ids_, *item.id, {}, [](const auto& range) { return range.first; });
    if (above != ids_.begin() && *item.id <= std::prev(above)->second) return true;
  }
  return HoldsAny(item.name, parts_) || (item.is_file() && HoldsAny(pkv::PathKey(item.path), parts_));
}

void NvFilter::Sort() {
  std::ranges::sort(ids_);
  size_t kept = 0;
  for (const auto& range : ids_) {
    if (kept > 0 && range.first <= uint32_t{ids_[kept - 1].second} + 1) {
      ids_[kept - 1].second = std::max(ids_[kept - 1].second, range.second);
    } else {
      ids_[kept++] = range;
    }
  }
  ids_.resize(kept);
  // A part that begins with another is found with it.
  std::ranges::sort(parts_);
  std::vector<std::string> parts;
  for (std::string& part : parts_) {
    if (parts.empty() || !part.starts_with(parts.back())) parts.push_back(std::move(part));
  }
  parts_ = std::move(parts);
}

NvError NvFilter::Load(const std::string& path, std::string& problem) {
  XmlElement root;
  switch (LoadXml(path, root, problem)) {
    case XmlResult::kNoParser:
      return NvError::kNoXmlParser;
    case XmlResult::kMalformed:
      return NvError::kCannotOpenFilter;
    case XmlResult::kOk:
      break;
  }
  return Read(root, problem);
}

NvError NvFilter::Read(const XmlElement& root, std::string& problem) {
  NvFilter read;
  try {
    if (root.name != "NvFilter") throw BadXml("the root element is <" + root.name + ">");
    for (const XmlElement& key : root.children) {
      if (key.name == "NV") {
        const uint16_t id = ParseId(key.text);
        read.ids_.emplace_back(id, id);
      } else if (key.name == "NV_RANGE") {
        ForEachPart(key.text, [&](std::string_view range) {
          const size_t dash = range.find('-');
          const uint16_t first = ParseId(range.substr(0, dash));
          const uint16_t last = dash == std::string_view::npos ? first : ParseId(range.substr(dash + 1));
          if (first > last) throw BadXml("the range " + std::string(range) + " is empty");
          read.ids_.emplace_back(first, last);
        });
      } else if (key.name == "NV_NAME_SUBSTRING_LIST") {
        ForEachPart(key.text, [&](std::string_view part) { read.parts_.emplace_back(part); });
      } else {
        throw BadXml("<" + key.name + "> is not expected in <NvFilter>");
      }
    }
    // One that lets nothing pass would be taken for none at all.
    if (read.is_empty()) throw BadXml("the filter is empty");
    read.ids_.insert(read.ids_.end(), ids_.begin(), ids_.end());
    read.parts_.insert(read.parts_.end(), parts_.begin(), parts_.end());
    if (read.ids_.size() + read.parts_.size() > kMostEntries) throw BadXml("the filter has too many entries");
  } catch (const BadXml& bad) {
    problem = bad.what();
    return NvError::kCannotOpenFilter;
  }
  read.Sort();
  *this = std::move(read);
  return NvError::kNone;
}

NvError SaveFilter(const std::string& path, std::span<const NvItem* const> items) {
  std::string text = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<NvFilter>\n";
  for (const NvItem* item : items) {
    text += item->is_file()
                ? "  <NV_NAME_SUBSTRING_LIST>" + EscapeXml(pkv::PathKey(item->path)) + "</NV_NAME_SUBSTRING_LIST>\n"
                : "  <NV>" + std::to_string(*item->id) + "</NV>\n";
  }
  text += "</NvFilter>\n";
  const std::vector<uint8_t> bytes(text.begin(), text.end());
  const std::error_code error = ReplaceWholeFile(path, bytes);
  return error ? NotWritten(NvError::kCannotOpenFilter, path, error) : NvError::kNone;
}

}  // namespace kral::nv
