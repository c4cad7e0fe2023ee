// Cuts a value into lines of bytes or into members, and puts these together again.
#include "storage/nv/nv_report_cells.h"

#include <algorithm>
#include <array>
#include <cstdio>

#include "platform/xml_document.h"

namespace kral::nv {
namespace {

constexpr size_t kLineBytes = 16;
constexpr size_t kFoldedLines = 2;  // fewer are not worth a fold
constexpr size_t kFoldedMembers = 4;

// A line of bytes, or a member.
struct Part {
  std::string html;
  bool differs = false;
  size_t units = 1;
};

std::string HexText(const char* format, size_t number) {
  std::array<char, 16> text{};
  std::snprintf(text.data(), text.size(), format, static_cast<unsigned>(number));
  return text.data();
}

std::string Marked(const std::string& text) {
  return "<mark>" + text + "</mark>";
}

std::vector<Part> Lines(std::span<const uint8_t> bytes, std::span<const uint8_t> other, bool compare) {
  std::vector<Part> parts;
  for (size_t begin = 0; begin < bytes.size(); begin += kLineBytes) {
    Part part{bytes.size() > kLineBytes ? "<i>" + HexText("%04X", begin) + "</i> " : "", false, 0};
    for (size_t at = begin; at < std::min(bytes.size(), begin + kLineBytes); ++at, ++part.units) {
      const bool differs = compare && (at >= other.size() || other[at] != bytes[at]);
      part.differs = part.differs || differs;
      const std::string text = HexText("%02X", bytes[at]);
      part.html += (at == begin ? "" : " ") + (differs ? Marked(text) : text);
    }
    parts.push_back(std::move(part));
  }
  return parts;
}

std::vector<Part> MemberParts(const ReportMembers& members, const ReportMembers& other, bool compare) {
  std::vector<Part> parts;
  for (size_t i = 0; i < members.size(); ++i) {
    const auto& [name, numbers] = members[i];
    Part part;
    part.differs = compare && (i >= other.size() || other[i].second != numbers);
    part.html = name.empty() ? "" : "<i>" + EscapeXml(name) + "</i> ";
    part.html += part.differs ? Marked(EscapeXml(numbers)) : EscapeXml(numbers);
    parts.push_back(std::move(part));
  }
  return parts;
}

// One part of the run stays in sight, so that it is seen what was folded.
std::string Folded(const std::vector<Part>& parts, size_t least, const std::string& what) {
  std::string html;
  for (size_t first = 0; first < parts.size();) {
    const auto end = std::find_if(parts.begin() + static_cast<std::ptrdiff_t>(first), parts.end(),
                                  [](const Part& part) { return part.differs; });
    const auto last = static_cast<size_t>(end - parts.begin());
    if (last == first) {
      html += "<div>" + parts[first++].html + "</div>";
      continue;
    }
    html += "<div>" + parts[first++].html + "</div>";
    size_t units = 0;
    std::string inside;
    const size_t count = last - first;
    for (; first < last; ++first) {
      units += parts[first].units;
      inside.append("<div>").append(parts[first].html).append("</div>");
    }
    if (count < least) {
      html += inside;
    } else {
      html.append("<details><summary>").append(std::to_string(units)).append(" ").append(what);
      html.append("</summary>").append(inside).append("</details>");
    }
  }
  return html;
}

bool ShowsMembers(const ReportSide& side) {
  return !side.members.empty();
}

}  // namespace

std::string ReportCell(const ReportSide& side, const ReportSide& other) {
  if (!side.is_there) return {};
  const bool compare = other.is_there;
  const std::string more = compare ? "equal " : "more ";
  if (!ShowsMembers(side)) return Folded(Lines(side.bytes, other.bytes, compare), kFoldedLines, more + "bytes");
  return Folded(MemberParts(side.members, other.members, compare && ShowsMembers(other)), kFoldedMembers,
                more + "members");
}

std::string ReportDifference(const ReportSide& first, const ReportSide& second) {
  std::string text;
  for (size_t i = 0; i < std::min(first.members.size(), second.members.size()); ++i) {
    if (first.members[i] == second.members[i]) continue;
    const auto& [name, numbers] = first.members[i];
    text.append(text.empty() ? "" : "; ").append(name).append(name.empty() ? "" : ": ");
    text.append(numbers).append(" to ").append(second.members[i].second);
  }
  if (!text.empty() || std::ranges::equal(first.bytes, second.bytes)) return text;
  if (ShowsMembers(first) && ShowsMembers(second)) return "in bytes that the definition does not tell";
  const size_t both = std::min(first.bytes.size(), second.bytes.size());
  const size_t all = std::max(first.bytes.size(), second.bytes.size());
  size_t from = all, count = all - both;
  for (size_t at = both; at-- > 0;) {
    if (first.bytes[at] == second.bytes[at]) continue;
    ++count;
    from = at;
  }
  if (from == all) from = both;
  text = std::to_string(count) + " of " + std::to_string(all) + " bytes, from " + HexText("0x%X", from) + " on";
  if (first.bytes.size() != second.bytes.size()) {
    text += "; " + std::to_string(first.bytes.size()) + " bytes to " + std::to_string(second.bytes.size());
  }
  return text;
}

}  // namespace kral::nv
