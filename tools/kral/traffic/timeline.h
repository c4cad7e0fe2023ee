// When packets came, by what they are, and when some were dropped: as a page that needs nothing beside it.
#ifndef KRAL_TOOLS_TRAFFIC_TIMELINE_H
#define KRAL_TOOLS_TRAFFIC_TIMELINE_H

#include <array>
#include <cstdint>
#include <map>
#include <span>
#include <string>

#include "kral/kral.h"

namespace kral::tool {

class Timeline {
 public:
  // Names come from the table of log names of the handle.
  explicit Timeline(KRAL_HANDLE handle) : handle_(handle) {}

  // Microseconds since 1970 UTC. What is older than the first of all counts as just as old.
  void Add(std::uint64_t microseconds, std::span<const std::uint8_t> packet);
  // So many were dropped by then altogether.
  void SetDropped(std::uint64_t microseconds, std::uint64_t count);

  std::string Page(const std::string& title) const;

 private:
  // However long it lasts, memory stays: when the time is full, each two columns become one.
  static constexpr std::size_t kColumns = 240;
  using Columns = std::array<std::uint32_t, kColumns>;
  struct Row {
    std::string name;
    std::uint64_t packets = 0;
    Columns columns{};
  };

  std::size_t ColumnAt(std::uint64_t microseconds);
  std::size_t UsedColumns() const;
  std::string PageRow(const std::string& what, const Row& row) const;

  KRAL_HANDLE handle_;
  bool has_begun_ = false;
  std::uint64_t begin_ = 0;
  std::uint64_t end_ = 0;
  std::uint64_t width_ = 1000;  // of a column, in microseconds
  std::map<std::string, Row> rows_;
  std::uint64_t dropped_ = 0;
  Columns drops_{};
};

// Now, as packets count it.
std::uint64_t MicrosecondsNow();

}  // namespace kral::tool

#endif
