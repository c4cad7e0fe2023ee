// Makes the comparison page and the list of values.
#include "storage/nv/nv_report.h"

#include <algorithm>
#include <map>
#include <optional>
#include <tuple>
#include <utility>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_value.h"

namespace kral::nv {
namespace {

constexpr const char* kPageHead = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<title>NV comparison</title>
<style>
body { font-family: sans-serif; margin: 2em; color: #222; }
table { border-collapse: collapse; margin: 1em 0; }
th, td { border: 1px solid #bbb; padding: 0.3em 0.6em; text-align: left; vertical-align: top; }
th { background: #eee; position: sticky; top: 0; }
td.value { font-family: monospace; max-width: 40em; overflow-wrap: anywhere; }
tr.changed { background: #fff3cd; }
tr.first { background: #f8d7da; }
tr.second { background: #d7ecd9; }
</style>
</head>
<body>
)";
constexpr const char* kTableHead =
    "<table>\n<tr><th>Item</th><th>Name</th><th>Subscription</th><th>Index</th><th>First</th><th>Second</th>"
    "<th>Difference</th></tr>\n";

// Numbered items first, then files.
using Key = std::tuple<std::string, uint32_t, uint16_t, uint16_t>;  // key of the path, id, subscription, index

struct Pair {
  std::optional<NvBytes> first;
  std::optional<NvBytes> second;
};
using Pairs = std::map<Key, Pair>;

void Collect(const pkv::PkvSet& set, std::optional<NvBytes> Pair::*side, Pairs& pairs) {
  for (const pkv::PkvNvItem& item : set.items) {
    pairs[{"", item.id, item.subscription, item.index}].*side = NvBytes(item.data.begin(), item.data.end());
  }
  for (const pkv::PkvEfsFile& file : set.files) {
    pairs[{pkv::PathKey(file.path), 0, uint16_t{0}, uint16_t{0}}].*side = file.bytes;
  }
}

using Members = std::vector<std::pair<std::string, std::string>>;

// By definition where there is one that the bytes satisfy; the bytes otherwise.
Members Decoded(NvItem* item, const NvBytes& stored) {
  if (item != nullptr && !item->generic) {
    if (const auto value = FromStored(*item, stored)) return item->type->ToMembers(*value);
  }
  return {{"", ToHex(stored)}};
}

std::string Joined(const Members& members) {
  std::string text;
  for (const auto& [name, numbers] : members) text += (text.empty() ? "" : ", ") + numbers;
  return text;
}

// The members that are not equal: "level: 1,2 to 1,3".
std::string Difference(const Members& first, const Members& second) {
  std::string text;
  for (size_t i = 0; i < std::min(first.size(), second.size()); ++i) {
    if (first[i] == second[i] || first[i].first.empty()) continue;
    text += (text.empty() ? "" : "; ") + first[i].first + ": " + first[i].second + " to " + second[i].second;
  }
  return text;
}

std::string Cell(const std::string& text, const char* kind = nullptr) {
  return (kind == nullptr ? "<td>" : "<td class=\"" + std::string(kind) + "\">") + EscapeXml(text) + "</td>";
}

struct Row {
  const char* kind = nullptr;  // null: the same on both sides
  std::string text;
};

Row MakeRow(const Key& key, const Pair& pair, NvDefinitions& definitions) {
  const auto& [path, id, subscription, index] = key;
  NvItem* item = path.empty() ? definitions.Find(static_cast<uint16_t>(id)) : definitions.Find(path);
  const Members first = pair.first ? Decoded(item, *pair.first) : Members();
  const Members second = pair.second ? Decoded(item, *pair.second) : Members();
  Row row;
  if (!pair.second) {
    row.kind = "first";
  } else if (!pair.first) {
    row.kind = "second";
  } else if (*pair.first != *pair.second) {
    row.kind = "changed";
  }
  std::string difference = !pair.second ? "only in the first" : !pair.first ? "only in the second" : "";
  // Bytes behind a value's end may differ, too.
  if (difference.empty() && row.kind != nullptr) {
    difference = first == second ? "in bytes that the definition does not tell" : Difference(first, second);
  }
  row.text = row.kind == nullptr ? "<tr>" : "<tr class=\"" + std::string(row.kind) + "\">";
  row.text += Cell(path.empty() ? std::to_string(id) : path) + Cell(item == nullptr ? "" : item->name) +
              Cell(std::to_string(subscription)) + Cell(std::to_string(index)) + Cell(Joined(first), "value") +
              Cell(Joined(second), "value") + Cell(difference) + "</tr>\n";
  return row;
}

void Count(const Pair& pair, NvComparison& comparison) {
  if (!pair.second) {
    ++comparison.only_first;
  } else if (!pair.first) {
    ++comparison.only_second;
  } else if (*pair.first == *pair.second) {
    ++comparison.same;
  } else {
    ++comparison.changed;
  }
}

std::string Summary(const std::string& first_name, const std::string& second_name, const NvComparison& comparison) {
  return "<h1>NV comparison</h1>\n<p>First: " + EscapeXml(first_name) + "<br>\nSecond: " + EscapeXml(second_name) +
         "</p>\n<p>" + std::to_string(comparison.changed) + " items differ, " + std::to_string(comparison.only_first) +
         " are only in the first, " + std::to_string(comparison.only_second) + " only in the second, " +
         std::to_string(comparison.same) + " are the same.</p>\n";
}

}  // namespace

std::string ComparisonPage(const std::string& first_name, const pkv::PkvSet& first, const std::string& second_name,
                           const pkv::PkvSet& second, NvDefinitions& definitions, NvComparison& comparison) {
  Pairs pairs;
  Collect(first, &Pair::first, pairs);
  Collect(second, &Pair::second, pairs);
  comparison = {};
  std::string differing;
  std::string equal;
  for (const auto& [key, pair] : pairs) {
    Count(pair, comparison);
    const Row row = MakeRow(key, pair, definitions);
    (row.kind == nullptr ? equal : differing) += row.text;
  }
  std::string page = kPageHead + Summary(first_name, second_name, comparison);
  if (!differing.empty()) page += "<h2>Differences</h2>\n" + (kTableHead + differing) + "</table>\n";
  if (!equal.empty()) {
    page += "<details>\n<summary>Items that are the same</summary>\n" + (kTableHead + equal) + "</table>\n</details>\n";
  }
  return page + "</body>\n</html>\n";
}

std::string QdfText(NvDefinitions& definitions) {
  std::string text;
  definitions.ForEach([&text](const NvItem& item) {
    for (const auto& [slot, value] : item.values) {
      text += item.Title() + '\t' + item.name + '\t' + std::to_string(slot.subscription) + '\t' +
              std::to_string(slot.element) + '\t' + item.type->ToText(value) + '\n';
    }
  });
  return text;
}

}  // namespace kral::nv
