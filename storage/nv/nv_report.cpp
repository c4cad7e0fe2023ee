// Makes the comparison page and the list of values.
#include "storage/nv/nv_report.h"

#include <algorithm>
#include <map>
#include <optional>
#include <tuple>
#include <utility>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_report_cells.h"
#include "storage/nv/nv_value.h"

namespace kral::nv {
namespace {

constexpr const char* kPageHead = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width">
<title>NV comparison</title>
<style>
:root { color-scheme: light dark; --text: #1f2328; --dim: #667; --line: #d0d7de; --head: #f3f4f6; --page: #fff;
  --changed: #b35900; --first: #b42318; --second: #18794e; --mark: #ffd8a8; --marked: #5c2b00; }
@media (prefers-color-scheme: dark) {
  :root { --text: #e6e6e6; --dim: #9aa4b2; --line: #3a4150; --head: #232936; --page: #161a22;
    --changed: #ffb366; --first: #ff8a80; --second: #7ee2a8; --mark: #6b4410; --marked: #ffe3bf; } }
body { font: 14px/1.45 system-ui, sans-serif; margin: 2em; color: var(--text); background: var(--page); }
h1 { font-size: 1.5em; } h2, summary.all { font-size: 1.15em; font-weight: 600; margin-top: 1.5em; }
dl { display: grid; grid-template-columns: max-content 1fr; gap: 0 1em; } dt { color: var(--dim); } dd { margin: 0; }
input { font: inherit; padding: 0.35em 0.6em; width: 24em; max-width: 100%; }
table { border-collapse: collapse; margin: 0.7em 0; width: 100%; }
th, td { border-bottom: 1px solid var(--line); padding: 0.4em 0.8em 0.4em 0; text-align: left; vertical-align: top; }
th { background: var(--head); position: sticky; top: 0; }
th:first-child, td:first-child { padding-left: 0.7em; }
td:first-child { border-left: 3px solid transparent; white-space: nowrap; max-width: 22em; overflow-wrap: anywhere; }
tr.changed td:first-child { border-left-color: var(--changed); }
tr.first td:first-child { border-left-color: var(--first); }
tr.second td:first-child { border-left-color: var(--second); }
td.value { font: 12px/1.5 ui-monospace, monospace; overflow-wrap: anywhere; }
@media (min-width: 1100px) { td.value { min-width: 54ch; } }
td.value i { color: var(--dim); font-style: normal; }
td.value details { color: var(--dim); } td.value summary { cursor: pointer; }
mark { background: var(--mark); color: var(--marked); border-radius: 2px; }
tr.first td:last-child { color: var(--first); } tr.second td:last-child { color: var(--second); }
</style>
</head>
<body>
)";
constexpr const char* kFilter =
    "<p><input id=\"filter\" type=\"search\" placeholder=\"Filter by item or name\"> <span id=\"shown\"></span></p>\n";
// Without scripts the page shows everything.
constexpr const char* kScript = R"(<script>
const filter = document.getElementById("filter"), shown = document.getElementById("shown");
const rows = [...document.querySelectorAll("tbody tr")].map(row =>
  ({row, text: (row.cells[0].textContent + " " + row.cells[1].textContent).toLowerCase()}));
filter.addEventListener("input", () => {
  const wanted = filter.value.trim().toLowerCase();
  let count = 0;
  for (const {row, text} of rows) {
    row.hidden = !text.includes(wanted);
    if (!row.hidden) ++count;
  }
  shown.textContent = wanted ? `${count} of ${rows.length}` : "";
  const same = document.getElementById("same");
  if (same && wanted) same.open = true;
});
</script>
)";
constexpr const char* kTableHead =
    "<table>\n<thead><tr><th>Item</th><th>Name</th><th>Subscription</th><th>Index</th><th>First</th><th>Second</th>"
    "<th>Difference</th></tr></thead>\n<tbody>\n";
constexpr const char* kTableEnd = "</tbody>\n</table>\n";

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

// By definition where there is one that the bytes satisfy; the bytes otherwise.
ReportSide Side(NvItem* item, const std::optional<NvBytes>& stored) {
  ReportSide side;
  if (!stored) return side;
  side.is_there = true;
  side.bytes = *stored;
  if (item != nullptr && !item->generic) {
    if (const auto value = FromStored(*item, *stored)) side.members = item->type->ToMembers(*value);
  }
  return side;
}

std::string Cell(const std::string& text) {
  return "<td>" + EscapeXml(text) + "</td>";
}

std::string ValueCell(const ReportSide& side, const ReportSide& other) {
  return "<td class=\"value\">" + ReportCell(side, other) + "</td>";
}

struct Row {
  const char* kind = nullptr;  // null: the same on both sides
  std::string text;
};

Row MakeRow(const Key& key, const Pair& pair, NvDefinitions& definitions) {
  const auto& [path, id, subscription, index] = key;
  NvItem* item = path.empty() ? definitions.Find(static_cast<uint16_t>(id)) : definitions.Find(path);
  const ReportSide first = Side(item, pair.first);
  const ReportSide second = Side(item, pair.second);
  Row row;
  if (!pair.second) {
    row.kind = "first";
  } else if (!pair.first) {
    row.kind = "second";
  } else if (*pair.first != *pair.second) {
    row.kind = "changed";
  }
  const std::string difference = !pair.second  ? "only in the first"
                                 : !pair.first ? "only in the second"
                                               : ReportDifference(first, second);
  row.text = row.kind == nullptr ? "<tr>" : "<tr class=\"" + std::string(row.kind) + "\">";
  row.text += Cell(path.empty() ? std::to_string(id) : path) + Cell(item == nullptr ? "" : item->name) +
              Cell(std::to_string(subscription)) + Cell(std::to_string(index)) + ValueCell(first, second) +
              ValueCell(second, first) + Cell(difference) + "</tr>\n";
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
  return "<h1>NV comparison</h1>\n<dl><dt>First</dt><dd>" + EscapeXml(first_name) + "</dd><dt>Second</dt><dd>" +
         EscapeXml(second_name) + "</dd></dl>\n<p>" + std::to_string(comparison.changed) + " items differ, " +
         std::to_string(comparison.only_first) + " are only in the first, " + std::to_string(comparison.only_second) +
         " only in the second, " + std::to_string(comparison.same) + " are the same.</p>\n";
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
  std::string page = kPageHead + Summary(first_name, second_name, comparison) + kFilter;
  if (!differing.empty()) page += "<h2>Differences</h2>\n" + (kTableHead + differing) + kTableEnd;
  if (!equal.empty()) {
    page += "<details id=\"same\">\n<summary class=\"all\">Items that are the same</summary>\n" + (kTableHead + equal) +
            kTableEnd + "</details>\n";
  }
  return page + kScript + "</body>\n</html>\n";
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
