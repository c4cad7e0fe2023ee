// Decides when and how progress is shown. What the work is, and its end, are the verb's affair.
#include "tools/kral/progress.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <utility>

#include "platform/console.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr std::uint64_t kBarIntervalMs = 100;
constexpr std::uint64_t kObjectIntervalMs = 500;
constexpr std::uint64_t kLineIntervalMs = 5000;  // short work leaves a log file without any
constexpr std::uint64_t kSettledMs = 300;        // a rate told earlier would only jump about
constexpr std::size_t kWidestBar = 40;
constexpr std::size_t kNarrowestBar = 5;

// The end of a name tells more than its beginning.
std::string Shortened(const std::string& text, std::size_t room) {
  if (text.size() <= room) return text;
  if (room <= 3) return text.substr(text.size() - room);
  return "..." + text.substr(text.size() - (room - 3));
}

// "45 %  1.2 MiB/s  0:07 left" without what is in the middle: how long it still takes is worth more than the rate.
std::string WithoutRate(const std::string& figures) {
  const auto first = figures.find("  ");
  const auto last = figures.rfind("  ");
  return first == last ? figures : figures.substr(0, first) + figures.substr(last);
}

}  // namespace

std::string SizeText(std::uint64_t bytes) {
  constexpr std::array<const char*, 4> kUnits{"KiB", "MiB", "GiB", "TiB"};
  if (bytes < 1024) return Format("{} B", bytes);
  double value = static_cast<double>(bytes) / 1024;
  std::size_t unit = 0;
  for (; value >= 1023.95 && unit + 1 < kUnits.size(); ++unit) value /= 1024;
  return Format("{:.1f} {}", value, kUnits[unit]);
}

std::string BarLine(const std::string& title, const WorkShown& shown, std::size_t width) {
  const auto text = shown.subject.empty() ? shown.work : shown.work + " " + shown.subject;
  std::string bar;
  auto figures = shown.figures;
  if (title.size() + figures.size() + 2 > width) figures = WithoutRate(figures);
  const auto taken = title.size() + figures.size() + 2;
  auto room = width - std::min(width, taken);
  if (shown.total > 0 && room > text.size() + kNarrowestBar + 4) {
    const auto cells = std::min(room - text.size() - 4, kWidestBar);
    const auto done = static_cast<double>(std::min(shown.done, shown.total));
    const auto full = static_cast<std::size_t>(static_cast<double>(cells) * done / static_cast<double>(shown.total));
    bar = Format("  [{}{}]", std::string(full, '#'), std::string(cells - full, '-'));
    room -= bar.size();
  }
  return (title + Shortened(text, room) + bar + "  " + figures).substr(0, width);
}

std::string DurationText(std::uint64_t seconds) {
  const auto minutes = seconds / 60;
  if (minutes < 60) return Format("{}:{:02}", minutes, seconds % 60);
  return Format("{}:{:02}:{:02}", minutes / 60, minutes % 60, seconds % 60);
}

Progress::Progress(const Output& out, std::string work, std::uint64_t total, Unit unit, Clock& clock)
    : out_(out),
      work_(std::move(work)),
      unit_(unit),
      style_(out.lane() != nullptr                ? Style::kLane
             : out.json()                         ? Style::kJson
             : IsTerminal(StandardStream::kError) ? Style::kBar
                                                  : Style::kLines),
      clock_(clock),
      total_(total),
      last_tick_(clock.TickMs()),
      next_ms_(style_ == Style::kLines ? kLineIntervalMs
               : out.json()            ? kObjectIntervalMs
                                       : kBarIntervalMs) {
  if (style_ == Style::kLane && !out.json()) TellLane();
}

Progress::~Progress() {
  Wipe();
}

void Progress::Describe(std::string_view subject) {
  subject_ = Printable(subject);
}

void Progress::Update(std::uint64_t done) {
  const auto tick = clock_.TickMs();
  elapsed_ms_ += tick - last_tick_;
  last_tick_ = tick;
  if (done < done_) {  // begun again: what went before says nothing on how long it takes from here
    rate_from_ms_ = elapsed_ms_;
    rate_from_ = done;
  }
  done_ = done;
  if (elapsed_ms_ >= next_ms_) Show();
}

void Progress::Note(std::string_view text) {
  Wipe();
  out_.Note(text);
}

void Progress::Show() {
  switch (style_) {
    case Style::kBar:
      next_ms_ = elapsed_ms_ + kBarIntervalMs;
      return DrawBar();
    case Style::kLines:
      next_ms_ = elapsed_ms_ + kLineIntervalMs;
      return WriteLine();
    case Style::kJson:
      next_ms_ = elapsed_ms_ + kObjectIntervalMs;
      return WriteObject();
    case Style::kLane:
      next_ms_ = elapsed_ms_ + (out_.json() ? kObjectIntervalMs : kBarIntervalMs);
      return TellLane();
  }
}

double Progress::Rate() const {
  const auto elapsed_ms = elapsed_ms_ - rate_from_ms_;
  return elapsed_ms < kSettledMs ? 0 : static_cast<double>(done_ - rate_from_) * 1000 / static_cast<double>(elapsed_ms);
}

std::uint64_t Progress::SecondsLeft(double rate) const {
  return static_cast<std::uint64_t>(std::ceil(static_cast<double>(total_ - std::min(done_, total_)) / rate));
}

std::string Progress::Figures() const {
  std::string text;
  if (total_ > 0) {
    text = Format("{:.0f} %", 100 * static_cast<double>(std::min(done_, total_)) / static_cast<double>(total_));
  } else {
    text = unit_ == Unit::kBytes ? SizeText(done_) : Format("{}", done_);
  }
  const double rate = Rate();
  if (rate <= 0) return text;
  text +=
      unit_ == Unit::kBytes ? Format("  {}/s", SizeText(static_cast<std::uint64_t>(rate))) : Format("  {:.1f}/s", rate);
  if (total_ > 0) text += Format("  {} left", DurationText(SecondsLeft(rate)));
  return text;
}

void Progress::DrawBar() {
  // The last column stays free: a terminal may wrap behind it.
  const auto width = static_cast<std::size_t>(std::max(TerminalWidth(StandardStream::kError) - 1, 1));
  const WorkShown shown{work_, subject_, done_, total_, Figures(), {}};
  WriteAside(Format("\r{:<{}}", BarLine("", shown, width), width));
  drawn_width_ = width;
}

void Progress::WriteLine() const {
  out_.Note(Format("{}{}{}: {}", work_, subject_.empty() ? "" : " ", subject_, Figures()));
}

Json Progress::Members() const {
  Json object{{"work", work_}};
  if (!subject_.empty()) object["subject"] = subject_;
  object["unit"] = unit_ == Unit::kBytes ? "bytes" : "items";
  object["done"] = done_;
  if (total_ > 0) object["total"] = total_;
  if (const double rate = Rate(); rate > 0) {
    object["per_second"] = std::round(rate * 10) / 10;
    if (total_ > 0) object["seconds_left"] = SecondsLeft(rate);
  }
  return object;
}

void Progress::WriteObject() const {
  Json object{{"event", "progress"}};
  object.update(Members());
  WriteAside(JsonLine(object));
}

void Progress::TellLane() const {
  out_.lane()->Show({work_, subject_, done_, total_, Figures(), out_.json() ? Members() : Json()});
}

void Progress::Wipe() {
  if (drawn_width_ == 0) return;
  WriteAside(Format("\r{:<{}}\r", "", std::exchange(drawn_width_, 0)));
}

}  // namespace kral::tool
