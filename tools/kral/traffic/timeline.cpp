// Sorts packets into columns of time and draws these.
#include "tools/kral/traffic/timeline.h"

#include <algorithm>
#include <chrono>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/kral/format.h"
#include "tools/kral/page.h"
#include "tools/kral/traffic/playback.h"
#include "tools/kral/traffic/traffic.h"

namespace kral::tool {
namespace {

constexpr unsigned kColumnWidth = 4;  // in units of the drawing
constexpr unsigned kRowHeight = 28;

constexpr std::string_view kTimelineStyle = R"(:root { --bar: #2f6fb2; }
@media (prefers-color-scheme: dark) { :root { --bar: #6cb0f5; } }
.time { width: 70%; } svg { height: 28px; }
path { stroke: var(--bar); stroke-width: 4; fill: none; } .drops { stroke: var(--bad); }
#drops .drops { opacity: .5; } tr.dropped td { color: var(--bad); }
)";

// A line upwards for each column that holds something; the fullest is as high as the row. With `whole` each is.
template <class Columns>
std::string Lines(const Columns& columns, bool whole) {
  const std::uint64_t most = std::max<std::uint64_t>(1, *std::ranges::max_element(columns));
  std::string lines;
  for (std::size_t i = 0; i < columns.size(); ++i) {
    if (columns[i] == 0) continue;
    const auto height = whole ? kRowHeight : std::max<std::uint64_t>(1, columns[i] * kRowHeight / most);
    lines += Format("M{} {}v-{}", i * kColumnWidth + kColumnWidth / 2, kRowHeight, height);
  }
  return lines;
}

std::string Drawing(std::size_t columns, std::string_view content) {
  return Format(R"(<svg viewBox="0 0 {} {}" preserveAspectRatio="none">{}</svg>)", columns * kColumnWidth, kRowHeight,
                content);
}

}  // namespace

std::uint64_t MicrosecondsNow() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
}

std::size_t Timeline::ColumnAt(std::uint64_t microseconds) {
  if (!has_begun_) {
    has_begun_ = true;
    begin_ = end_ = microseconds;
  }
  end_ = std::max(end_, microseconds);
  const auto since = microseconds < begin_ ? 0 : microseconds - begin_;
  const auto fold = [](Columns& columns) {
    for (std::size_t i = 0; i < kColumns; ++i) {
      columns[i] = i < kColumns / 2 ? columns[2 * i] + columns[2 * i + 1] : 0;
    }
  };
  for (; since / width_ >= kColumns; width_ *= 2) {
    for (auto& [what, row] : rows_) fold(row.columns);
    fold(drops_);
  }
  return static_cast<std::size_t>(since / width_);
}

std::size_t Timeline::UsedColumns() const {
  return static_cast<std::size_t>((end_ - begin_) / width_) + 1;
}

void Timeline::Add(std::uint64_t microseconds, std::span<const std::uint8_t> packet) {
  const auto column = ColumnAt(microseconds);
  auto& row = rows_[DescribePacket(packet)];
  if (row.packets == 0) row.name = NameOfPacket(handle_, packet);
  ++row.packets;
  ++row.columns[column];
}

void Timeline::SetDropped(std::uint64_t microseconds, std::uint64_t count) {
  if (count <= dropped_) return;
  drops_[ColumnAt(microseconds)] += static_cast<std::uint32_t>(count - dropped_);
  dropped_ = count;
}

std::string Timeline::PageRow(const std::string& what, const Row& row) const {
  const auto drops = dropped_ == 0 ? "" : R"(<use href="#drops"/>)";
  return Format("<tr><td>{}</td><td>{}</td><td class=\"count\">{}</td><td>{}</td></tr>\n", PageText(what),
                PageText(row.name), row.packets,
                Drawing(UsedColumns(), Format(R"(<path d="{}"/>{})", Lines(row.columns, false), drops)));
}

std::string Timeline::Page(const std::string& title) const {
  std::vector<std::pair<std::string, const Row*>> rows;
  std::uint64_t packets = 0;
  for (const auto& [what, row] : rows_) {
    rows.emplace_back(what, &row);
    packets += row.packets;
  }
  std::ranges::stable_sort(
      rows, [](const auto& left, const auto& right) { return left.second->packets > right.second->packets; });
  auto page = PageHead(title, kTimelineStyle);
  page += Format(
      "<p>{} of {}, {} dropped, in {:.3f} s. A column is {} ms; each row is as high as its fullest column.</p>\n",
      Counted(packets, "packet"), Counted(rows.size(), "kind"), dropped_, static_cast<double>(end_ - begin_) / 1e6,
      width_ / 1000);
  if (dropped_ != 0) {
    page += Format("<svg style=\"height: 0\"><symbol id=\"drops\"><path class=\"drops\" d=\"{}\"/></symbol></svg>\n",
                   Lines(drops_, true));
  }
  page += Format(
      "<table><thead><tr><th>What</th><th>Name</th><th class=\"count\">Packets</th><th class=\"time\"><div "
      "class=\"span\"><span>{}</span><span>{}</span></div></th></tr></thead>\n<tbody>\n",
      has_begun_ ? TimeText(begin_) : "", has_begun_ ? TimeText(end_) : "");
  if (dropped_ != 0) {
    page += Format("<tr class=\"dropped\"><td>dropped</td><td></td><td class=\"count\">{}</td><td>{}</td></tr>\n",
                   dropped_, Drawing(UsedColumns(), Format(R"(<path class="drops" d="{}"/>)", Lines(drops_, false))));
  }
  for (const auto& [what, row] : rows) page += PageRow(what, *row);
  return page.append("</tbody></table>\n").append(kPageEnd);
}

}  // namespace kral::tool
