// Compares words letter by letter; with equal distances the longer common beginning decides.
#include "tools/kral/nearest_word.h"

#include <algorithm>
#include <cstddef>
#include <numeric>
#include <utility>

namespace kral::tool {
namespace {

// How many letters have to be changed, added or left out.
std::size_t Distance(std::string_view from, std::string_view to) {
  std::vector<std::size_t> row(to.size() + 1);
  std::iota(row.begin(), row.end(), std::size_t{0});
  for (const char letter : from) {
    std::size_t diagonal = row[0]++;
    for (std::size_t i = 0; i < to.size(); ++i) {
      const auto changed = diagonal + (letter == to[i] ? 0 : 1);
      diagonal = row[i + 1];
      row[i + 1] = std::min({changed, diagonal + 1, row[i] + 1});
    }
  }
  return row.back();
}

std::size_t CommonBeginning(std::string_view one, std::string_view other) {
  const auto [end, ignored] = std::mismatch(one.begin(), one.end(), other.begin(), other.end());
  return static_cast<std::size_t>(end - one.begin());
}

// Of an option, what stands behind the dashes.
std::string_view LettersOf(std::string_view word) {
  return word.substr(std::min(word.find_first_not_of('-'), word.size()));
}

}  // namespace

std::optional<std::string> NearestWord(std::string_view word, const std::vector<std::string>& known) {
  const auto rank = [word](const std::string& other) {
    return std::pair(Distance(word, other), word.size() - CommonBeginning(word, other));
  };
  const auto nearest = std::ranges::min_element(
      known, [&rank](const auto& left, const auto& right) { return rank(left) < rank(right); });
  if (nearest == known.end()) return {};
  const auto most = std::max(LettersOf(word).size(), LettersOf(*nearest).size()) + 1;
  if (2 * Distance(word, *nearest) > most) return {};
  return *nearest;
}

}  // namespace kral::tool
