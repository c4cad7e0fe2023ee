// The small files and the folders in which Linux tells of its devices and processes. Where something cannot be read,
// nothing is there; where there is no memory, all of these throw std::bad_alloc. (Streams and directory iterators of
// the standard library take the one for the other, or end the process.)
#ifndef KRAL_PLATFORM_POSIX_SYSTEM_FILES_H
#define KRAL_PLATFORM_POSIX_SYSTEM_FILES_H

#include <charconv>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

namespace kral {

// Without "." and "..", in the system's order; nothing when the folder cannot be read.
std::optional<std::vector<std::string>> NamesIn(const std::filesystem::path& folder);
// The same with the reason instead, also for a lack of memory that is the system's.
std::error_code ReadNames(const std::filesystem::path& folder, std::vector<std::string>& names);

// Links are followed.
bool Exists(const std::filesystem::path& path);

std::string TextOf(const std::filesystem::path& file);
std::string FirstLineOf(const std::filesystem::path& file);

// The path without links; nothing when it leads nowhere.
std::optional<std::filesystem::path> RealPath(const std::filesystem::path& path);

// Takes the text up to the separator, and the separator, from the front; nothing when the text is empty.
std::optional<std::string_view> TakeUntil(char separator, std::string_view& text);
// What stands between spaces.
std::vector<std::string_view> WordsOf(std::string_view line);

// A number that is the whole text.
template <class Number>
std::optional<Number> NumberIn(std::string_view text, int base = 10) {
  Number number{};
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return number;
}

}  // namespace kral

#endif
