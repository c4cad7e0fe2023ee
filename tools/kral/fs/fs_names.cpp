// What can be told of names, modes, times and error numbers without asking a handset.
#include "tools/kral/fs/fs_names.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <chrono>
#include <utility>

#include "kral/efs.h"
#include "tools/kral/clock_text.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr std::size_t kLongestLocalName = 255;
constexpr std::string_view kReservedCharacters = "<>:\"/\\|?*";
// On Windows these are devices in every folder, with any extension.
constexpr std::array<std::string_view, 6> kDevices{"aux", "con", "conin$", "conout$", "nul", "prn"};

bool IsDevice(std::string_view name) {
  std::string stem(name.substr(0, name.find('.')));
  stem.erase(stem.find_last_not_of(' ') + 1);
  std::ranges::transform(stem, stem.begin(),
                         [](unsigned char character) { return static_cast<char>(std::tolower(character)); });
  if (std::ranges::find(kDevices, stem) != kDevices.end()) return true;
  if (!stem.starts_with("com") && !stem.starts_with("lpt")) return false;
  // One digit, or one of the three superscript digits, in Latin-1 or in UTF-8.
  const std::string_view digit = std::string_view(stem).substr(stem.size() == 5 && stem[3] == '\xC2' ? 4 : 3);
  return digit.size() == 1 && std::string_view("0123456789\xB9\xB2\xB3").find(digit) != std::string_view::npos;
}

struct KnownError {
  std::uint32_t number;
  std::string_view meaning;
};
constexpr std::array<KnownError, 21> kErrors{{
    {1, "not permitted"},
    {2, "no such file or directory"},
    {5, "input or output error"},
    {6, "exists already"},
    {9, "bad descriptor"},
    {12, "out of memory"},
    {13, "no access"},
    {16, "busy"},
    {17, "exists already"},
    {18, "on another file system"},
    {19, "no such device"},
    {20, "not a directory"},
    {21, "is a directory"},
    {22, "invalid"},
    {24, "too many files open"},
    {27, "file too large"},
    {28, "no room left"},
    {30, "read-only file system"},
    {36, "name too long"},
    {39, "directory not empty"},
    {40, "too many links"},
}};
static_assert(std::ranges::is_sorted(kErrors,
                                     [](const auto& left, const auto& right) { return left.number < right.number; }));

char KindLetter(std::uint32_t mode) {
  switch (mode & KRAL_EFS_MODE_KIND) {
    case 0x4000:
      return 'd';
    case 0x8000:
      return '-';
    case 0xA000:
      return 'l';
    case KRAL_EFS_MODE_ITEM_FILE:
      return 'i';
    default:
      return '?';
  }
}

}  // namespace

bool IsEfsArgument(std::string_view argument) {
  return argument.starts_with(':');
}

std::string EfsPath(std::string_view argument) {
  if (IsEfsArgument(argument)) argument.remove_prefix(1);
  while (argument.size() > 1 && argument.ends_with('/')) argument.remove_suffix(1);
  return argument.empty() ? "/" : std::string(argument);
}

std::vector<std::string> EfsNames(std::string_view path) {
  std::vector<std::string> names;
  while (!path.empty()) {
    const auto name = path.substr(0, path.find('/'));
    path.remove_prefix(std::min(path.size(), name.size() + 1));
    if (!name.empty() && name != ".") names.emplace_back(name);
  }
  return names;
}

std::string JoinEfs(std::string_view folder, std::string_view name) {
  return Format("{}{}{}", folder, folder.ends_with('/') ? "" : "/", name);
}

std::string_view LastName(std::string_view path) {
  while (!path.empty() && (path.back() == '/' || path.back() == '\\')) path.remove_suffix(1);
  const auto separator = path.find_last_of("/\\");
  return separator == std::string_view::npos ? path : path.substr(separator + 1);
}

std::string_view LastEfsName(std::string_view path) {
  while (path.ends_with('/')) path.remove_suffix(1);
  const auto separator = path.find_last_of('/');
  return separator == std::string_view::npos ? path : path.substr(separator + 1);
}

std::string_view ParentOf(std::string_view path) {
  const auto separator = path.find_last_of('/');
  return separator == std::string_view::npos || separator == 0 ? "/" : path.substr(0, separator);
}

bool IsSafeLocalName(std::string_view name) {
  if (name.empty() || name.size() > kLongestLocalName || name.back() == '.' || name.back() == ' ') return false;
  for (std::size_t i = 0; i < name.size(); ++i) {
    const auto code = static_cast<unsigned char>(name[i]);
    // Control characters: below the blank, DEL, and in UTF-8 the second range, C2 80 to C2 9F.
    const bool controls = code < ' ' || code == 0x7F || (code >= 0x80 && code < 0xA0 && i > 0 && name[i - 1] == '\xC2');
    if (controls || kReservedCharacters.find(name[i]) != std::string_view::npos) return false;
  }
  return true && !IsDevice(name);  // "." and ".." end with a dot
}

std::string ModeText(std::uint32_t mode) {
  std::string text(1, KindLetter(mode));
  for (int bit = 8; bit >= 0; --bit) text += (mode >> bit & 1) != 0 ? "xwr"[bit % 3] : '-';
  return text;
}

std::string TimeText(std::uint32_t seconds) {
  return ClockText(std::chrono::sys_seconds(std::chrono::seconds(std::int64_t{seconds})));
}

std::string ErrorText(std::uint32_t error_number) {
  const auto known =
      std::ranges::find_if(kErrors, [error_number](const KnownError& row) { return row.number == error_number; });
  return known == kErrors.end() ? Format("error {}", error_number)
                                : Format("error {}, {}", error_number, known->meaning);
}

}  // namespace kral::tool
