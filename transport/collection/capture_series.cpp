// Numbers in the names of files.
#include "transport/collection/capture_series.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/file_util.h"
#include "platform/folder.h"

namespace kral {
namespace {

constexpr size_t kLeastDigits = 5;
constexpr uint32_t kLastNumber = UINT32_MAX;

struct SeriesName {
  explicit SeriesName(const std::string& path) {
    const size_t name = NameBegin(path);
    const size_t dot = path.find_last_of('.');
    // A name that begins with its only dot has no ending.
    const size_t end = dot == std::string::npos || dot <= name ? path.size() : dot;
    folder = name == 0 ? "." : path.substr(0, name);
    stem = path.substr(name, end - name) + "-";
    begin = path.substr(0, end) + "-";
    ending = path.substr(end);
  }

  std::string Path(uint32_t number) const {
    std::string digits = std::to_string(number);
    digits.insert(0, kLeastDigits - std::min(kLeastDigits, digits.size()), '0');
    return begin + digits + ending;
  }

  std::optional<uint32_t> NumberOf(std::string_view name) const {
    if (name.size() < stem.size() + kLeastDigits + ending.size() || !name.starts_with(stem) ||
        !name.ends_with(ending)) {
      return std::nullopt;
    }
    const auto digits = name.substr(stem.size(), name.size() - stem.size() - ending.size());
    if (digits.size() > kLeastDigits && digits.front() == '0') return std::nullopt;
    uint32_t number = 0;
    const auto end = digits.data() + digits.size();
    const auto result = std::from_chars(digits.data(), end, number);
    return result.ec == std::errc() && result.ptr == end ? std::optional(number) : std::nullopt;
  }

  std::string folder;
  std::string stem;
  std::string begin;
  std::string ending;
};

CaptureSink OpenNext(const SeriesName& name, uint32_t keep) {
  std::vector<FolderEntry> entries;
  if (ListFolder(name.folder, entries)) return {};
  std::vector<uint32_t> files;
  uint32_t last = 0;  // of whatever has such a name
  for (const auto& entry : entries) {
    const auto number = name.NumberOf(entry.name);
    if (!number) continue;
    last = std::max(last, *number);
    if (entry.file.kind == LocalKind::kFile) files.push_back(*number);
  }
  // Another capture of the name may have taken a number meanwhile.
  CaptureSink next;
  while (!next) {
    if (last == kLastNumber) return {};
    const auto error = MakeCaptureFile(name.Path(++last), next);
    if (error && error != std::errc::file_exists) return {};
  }
  // Only a file that has begun takes the place of others.
  if (keep == 0) return next;
  std::ranges::sort(files);
  for (size_t i = 0; i + keep <= files.size(); ++i) {
    const auto path = name.Path(files[i]);
    if (!IsInUse(path)) RemoveFile(path);  // one that is being played goes another time
  }
  return next;
}

}  // namespace

std::function<CaptureSink()> CaptureSeries(const std::string& path, uint32_t keep) {
  return [name = SeriesName(path), keep] { return OpenNext(name, keep); };
}

}  // namespace kral
