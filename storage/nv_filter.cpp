// Reads, applies and writes filters.
#include "storage/nv_filter.h"

#include <algorithm>
#include <string_view>

#include "platform/file_util.h"
#include "storage/nv_xml.h"

namespace kral::nv {
namespace {

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

}  // namespace

bool NvFilter::Passes(const NvItem& item) const {
  if (is_empty()) return true;
  const auto holds_id = [&](const auto& range) {
    return item.id && *item.id >= range.first && *item.id <= range.second;
  };
  const auto is_part = [&](const std::string& part) {
    return item.name.find(part) != std::string::npos || item.path.find(part) != std::string::npos;
  };
  return std::any_of(ranges_.begin(), ranges_.end(), holds_id) || std::any_of(parts_.begin(), parts_.end(), is_part);
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
        read.ranges_.emplace_back(id, id);
      } else if (key.name == "NV_RANGE") {
        ForEachPart(key.text, [&](std::string_view range) {
          const size_t dash = range.find('-');
          const uint16_t first = ParseId(range.substr(0, dash));
          const uint16_t last = dash == std::string_view::npos ? first : ParseId(range.substr(dash + 1));
          if (first > last) throw BadXml("the range " + std::string(range) + " is empty");
          read.ranges_.emplace_back(first, last);
        });
      } else if (key.name == "NV_NAME_SUBSTRING_LIST") {
        ForEachPart(key.text, [&](std::string_view part) { read.parts_.emplace_back(part); });
      } else {
        throw BadXml("<" + key.name + "> is not expected in <NvFilter>");
      }
    }
    // One that lets nothing pass would be taken for none at all.
    if (read.is_empty()) throw BadXml("the filter is empty");
  } catch (const BadXml& bad) {
    problem = bad.what();
    return NvError::kCannotOpenFilter;
  }
  ranges_.insert(ranges_.end(), read.ranges_.begin(), read.ranges_.end());
  parts_.insert(parts_.end(), read.parts_.begin(), read.parts_.end());
  return NvError::kNone;
}

void NvFilter::AddItem(const NvItem& item) {
  if (item.is_file()) {
    parts_.push_back(item.path);
  } else {
    ranges_.emplace_back(*item.id, *item.id);
  }
}

NvError NvFilter::Save(const std::string& path) const {
  std::string text = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<NvFilter>\n";
  for (const auto& [first, last] : ranges_) {
    text += first == last ? "  <NV>" + std::to_string(first) + "</NV>\n"
                          : "  <NV_RANGE>" + std::to_string(first) + "-" + std::to_string(last) + "</NV_RANGE>\n";
  }
  for (const std::string& part : parts_) {
    text += "  <NV_NAME_SUBSTRING_LIST>" + EscapeXml(part) + "</NV_NAME_SUBSTRING_LIST>\n";
  }
  text += "</NvFilter>\n";
  const std::vector<uint8_t> bytes(text.begin(), text.end());
  return ReplaceWholeFile(path, bytes) ? NvError::kCannotOpenFilter : NvError::kNone;
}

}  // namespace kral::nv
