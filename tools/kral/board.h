// Several handsets that are worked on at once, as they are shown: on a terminal a line for each, redrawn in place;
// elsewhere a line for each change, and with --json an object.
#ifndef KRAL_TOOLS_BOARD_H
#define KRAL_TOOLS_BOARD_H

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/lane.h"
#include "tools/kral/output.h"
#include "tools/kral/step_times.h"

namespace kral::tool {

// What became of one handset.
struct Verdict {
  std::uint16_t port = 0;
  std::string serial;
  std::string model;
  double seconds = 0;
  std::optional<ToolError> failure;
  std::string data;               // text of its result
  Json members = Json::object();  // the same with --json
  StepTimes steps;

  bool passed() const { return !failure; }
};

// For any thread.
class Board {
 public:
  Board(const Output& out, const std::vector<std::uint16_t>& ports);
  ~Board();  // wipes the lines
  Board(const Board&) = delete;
  Board& operator=(const Board&) = delete;

  // Collects the data of a handset in its verdict, which must live as long.
  Lane& LaneOf(std::size_t row, Verdict& verdict);

  void Begin(std::size_t row, const Verdict& verdict);
  void End(std::size_t row, const Verdict& verdict);
  void Draw();             // about ten times a second
  double seconds() const;  // since it was made
  // Data on stdout that do not get in the way of the lines.
  void Print(std::string_view text);

 private:
  class RowLane;
  enum class State { kWorking, kFailed, kWaiting, kPassed };  // in this order they are worth a line
  enum class Style { kTerminal, kLines, kJson };
  struct Row {
    std::uint16_t port = 0;
    std::string serial;
    State state = State::kWaiting;
    WorkShown shown;
    std::string verdict;
  };

  void Say(const Row& row, std::string_view text);
  void WipeLocked();
  std::string LineOf(const Row& row, std::size_t width) const;
  std::vector<std::string> Lines(std::size_t width, std::size_t height) const;

  const Output& out_;
  const Style style_;
  const std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
  std::mutex mutex_;
  std::vector<Row> rows_;
  std::deque<RowLane> lanes_;
  std::size_t drawn_ = 0;  // lines
};

// "COM7  80C0FFEE"
std::string TitleOf(std::uint16_t port, const std::string& serial);

}  // namespace kral::tool

#endif
