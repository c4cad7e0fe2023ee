// The name under which a file is written before it takes its own.
#ifndef KRAL_PLATFORM_TEMPORARY_NAME_H
#define KRAL_PLATFORM_TEMPORARY_NAME_H

#include <array>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <string>

namespace kral {

// What a name may have at most: bytes on Linux, UTF-16 units on Windows.
inline constexpr size_t kLongestName = 255;

// Whether the character at a place goes on with the one in front: of UTF-8, or of UTF-16 behind a surrogate.
inline bool GoesOn(char unit) {
  return (static_cast<unsigned char>(unit) & 0xC0U) == 0x80U;
}
inline bool GoesOn(wchar_t unit) {
  return (static_cast<unsigned long>(unit) & 0xFC00U) == 0xDC00U;
}

// PATH.PROCESS.NUMBER.tmp. `name` is where the name begins in the path; it is cut where it would be too long.
template <class String>
String TemporaryName(const String& path, size_t name, unsigned long process, int number) {
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), ".%lu.%d.tmp", process, number);
  const String ending(text.data(), text.data() + std::strlen(text.data()));
  if (path.size() - name + ending.size() <= kLongestName) return path + ending;
  size_t end = name + kLongestName - ending.size();
  while (end > name && GoesOn(path[end])) --end;
  return path.substr(0, end) + ending;
}

}  // namespace kral

#endif
