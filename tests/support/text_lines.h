// The lines of a text, without their ends on either platform.
#ifndef KRAL_TESTS_SUPPORT_TEXT_LINES_H
#define KRAL_TESTS_SUPPORT_TEXT_LINES_H

#include <sstream>
#include <string>
#include <vector>

namespace kral::test {

inline std::vector<std::string> TextLines(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) {
    if (line.ends_with('\r')) line.pop_back();
    lines.push_back(line);
  }
  return lines;
}

}  // namespace kral::test

#endif
