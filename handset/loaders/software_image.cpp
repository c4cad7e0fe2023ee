// Software images, found and made.
#include "handset/loaders/software_image.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr std::string_view kMark = "VHSW";
constexpr size_t kLongestRevision = 31;

}  // namespace

std::optional<std::string> SoftwareRevision(const FlashMemory& flash) {
  const Bytes head = flash.Load(0, kMark.size() + kLongestRevision + 1);
  if (!std::equal(kMark.begin(), kMark.end(), head.begin())) return std::nullopt;
  const auto revision = head.begin() + static_cast<std::ptrdiff_t>(kMark.size());
  const auto end = std::find(revision, head.end(), uint8_t{0});
  if (end == revision || end == head.end()) return std::nullopt;
  return std::string(revision, end);
}

Bytes MakeSoftware(std::string_view revision, size_t size) {
  Bytes image(kMark.size() + revision.size() + 1);
  std::ranges::copy(revision, std::ranges::copy(kMark, image.begin()).out);
  for (size_t i = image.size(); i < size; ++i) image.push_back(static_cast<uint8_t>(i * 5 + (i >> 8)));
  return image;
}

}  // namespace kral::handset
