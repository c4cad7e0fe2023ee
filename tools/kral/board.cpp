// Draws the lines of several handsets, and keeps what each of them prints apart from the others.
#include "tools/kral/board.h"

#include <algorithm>
#include <array>

#include "platform/console.h"
#include "tools/kral/format.h"
#include "tools/kral/progress.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

constexpr std::size_t kLeastHeight = 4;

// Up so many lines, to their beginning, and everything from there on is gone.
std::string WipeSequence(std::size_t lines) {
  return lines == 0 ? std::string() : Format("\x1b[{}A\r\x1b[J", lines);
}

}  // namespace

std::string TitleOf(std::uint16_t port, const std::string& serial) {
  return serial.empty() ? Format("COM{}", port) : Format("COM{} {}", port, serial);
}

class Board::RowLane final : public Lane {
 public:
  RowLane(Board& board, std::size_t row, Verdict& verdict) : board_(board), row_(row), verdict_(verdict) {}

  void Data(std::string_view text) override { verdict_.data += text; }
  void Object(const Json& members) override { verdict_.members.update(members); }
  void Note(std::string_view text) override {
    const std::lock_guard lock(board_.mutex_);
    board_.Say(row(), text);
  }
  void Show(const WorkShown& shown) override {
    const std::lock_guard lock(board_.mutex_);
    const bool is_new = row().shown.work != shown.work;
    row().shown = shown;
    if (is_new) verdict_.steps.Enter(shown.work, board_.seconds());
    if (board_.style_ == Style::kLines && is_new) board_.Say(row(), shown.work);
    if (board_.style_ != Style::kJson) return;
    Json event{{"event", "progress"}, {"port", row().port}};
    event.update(shown.event);
    WriteAside(JsonLine(event));
  }

 private:
  Row& row() { return board_.rows_[row_]; }

  Board& board_;
  const std::size_t row_;
  Verdict& verdict_;
};

Board::Board(const Output& out, const std::vector<std::uint16_t>& ports)
    : out_(out),
      style_(out.json()                                     ? Style::kJson
             : ObeysCursorSequences(StandardStream::kError) ? Style::kTerminal
                                                            : Style::kLines) {
  for (const auto port : ports) {
    rows_.emplace_back();
    rows_.back().port = port;
  }
}

Board::~Board() {
  WipeLocked();
}

Lane& Board::LaneOf(std::size_t row, Verdict& verdict) {
  const std::lock_guard lock(mutex_);
  return lanes_.emplace_back(*this, row, verdict);
}

void Board::Begin(std::size_t row, const Verdict& verdict) {
  const std::lock_guard lock(mutex_);
  rows_[row].state = State::kWorking;
  rows_[row].serial = verdict.serial;
}

void Board::End(std::size_t row, const Verdict& verdict) {
  const std::lock_guard lock(mutex_);
  Row& ended = rows_[row];
  ended.state = verdict.passed() ? State::kPassed : State::kFailed;
  ended.serial = verdict.serial;
  ended.verdict = verdict.passed() ? Format("passed in {:.1f} s", verdict.seconds)
                                   : Format("FAILED: {}", NameText(verdict.failure->what()));
  if (style_ == Style::kLines && !ended.shown.work.empty()) Say(ended, ended.verdict);
  if (style_ != Style::kJson) return;
  const Json event{{"event", "verdict"}, {"port", verdict.port}, {"ok", verdict.passed()}};
  WriteAside(JsonLine(event));
}

double Board::seconds() const {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - begin_).count();
}

void Board::Say(const Row& row, std::string_view text) {
  WipeLocked();
  if (style_ == Style::kJson) {
    const Json event{{"event", "note"}, {"port", row.port}, {"text", text}};
    WriteAside(JsonLine(event));
  } else {
    WriteAside(Format("kral: {}: {}\n", TitleOf(row.port, row.serial), SafeText(text)));
  }
}

void Board::Print(std::string_view text) {
  const std::lock_guard lock(mutex_);
  WipeLocked();
  out_.Data(text);
}

void Board::WipeLocked() {
  if (drawn_ == 0) return;
  WriteAside(WipeSequence(drawn_));
  drawn_ = 0;
}

std::string Board::LineOf(const Row& row, std::size_t width) const {
  const auto title = TitleOf(row.port, row.serial);
  std::string line;
  switch (row.state) {
    case State::kWaiting:
      line = title + "  waiting";
      break;
    case State::kWorking:
      line = row.shown.work.empty() ? title + "  working" : BarLine(title + "  ", row.shown, width);
      break;
    default:
      line = title + "  " + row.verdict;
      break;
  }
  return FirstCharacters(line, width);
}

std::vector<std::string> Board::Lines(std::size_t width, std::size_t height) const {
  std::vector<const Row*> shown;
  for (const auto& row : rows_) shown.push_back(&row);
  const bool fits = rows_.size() <= height;
  if (!fits) {
    // The most telling ones, in their own order.
    std::ranges::stable_sort(shown, {}, &Row::state);
    shown.resize(height - 1);
    std::ranges::sort(shown);
  }
  std::vector<std::string> lines;
  lines.reserve(shown.size() + 1);
  for (const auto* row : shown) lines.push_back(LineOf(*row, width));
  if (!fits) {
    std::array<std::size_t, 4> counts{};
    for (const auto& row : rows_) ++counts[static_cast<std::size_t>(row.state)];
    const auto count = [&](State state) { return counts[static_cast<std::size_t>(state)]; };
    lines.push_back(Format("{} in all: {} working, {} waiting, {} passed, {} failed", rows_.size(),
                           count(State::kWorking), count(State::kWaiting), count(State::kPassed), count(State::kFailed))
                        .substr(0, width));
  }
  return lines;
}

void Board::Draw() {
  if (style_ != Style::kTerminal) return;
  const std::lock_guard lock(mutex_);
  // The last column and the last line stay free: a terminal may wrap and scroll behind them.
  const auto width = static_cast<std::size_t>(std::max(TerminalWidth(StandardStream::kError) - 1, 1));
  const auto height = static_cast<std::size_t>(std::max(TerminalHeight(StandardStream::kError) - 1, 1));
  const auto lines = Lines(width, std::max(height, kLeastHeight));
  std::string text = WipeSequence(drawn_);
  for (const auto& line : lines) text += line + "\n";
  drawn_ = lines.size();
  WriteAside(text);
}

}  // namespace kral::tool
