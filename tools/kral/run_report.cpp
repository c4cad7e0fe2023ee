// Draws a run: how long each step took in general, and what became of each handset when.
#include "tools/kral/run_report.h"

#include <algorithm>
#include <chrono>
#include <map>
#include <string_view>

#include "tools/kral/clock_text.h"
#include "tools/kral/format.h"
#include "tools/kral/page.h"

namespace kral::tool {
namespace {

constexpr double kWidth = 1000;  // of a drawing, in its own units
constexpr std::size_t kColours = 8;

constexpr std::string_view kRunStyle =
    R"(:root { --c0: #2f6fb2; --c1: #c77700; --c2: #2b8a5f; --c3: #8250df; --c4: #0e8a9c; --c5: #b5548f; --c6: #7a6a00;
  --c7: #6e7781; }
@media (prefers-color-scheme: dark) { :root { --c0: #5ea3ea; --c1: #e8a23d; --c2: #5cc394; --c3: #b392f0; --c4: #4fc3d4;
  --c5: #e58bc2; --c6: #c9b84a; --c7: #8b949e; } }
.c0 { fill: var(--c0); } .c1 { fill: var(--c1); } .c2 { fill: var(--c2); } .c3 { fill: var(--c3); }
.c4 { fill: var(--c4); } .c5 { fill: var(--c5); } .c6 { fill: var(--c6); } .c7 { fill: var(--c7); }
.lost { fill: var(--bad); } .rest { opacity: .35; }
h2 { font-size: 1.1em; margin: 1.5em 0 .3em; } b.good { color: var(--good); } b.bad { color: var(--bad); }
td { vertical-align: top; padding-top: 5px; padding-bottom: 5px; }
td:first-child, th:first-child { padding-left: 10px; }
tr.passed td:first-child { border-left: 3px solid var(--good); }
tr.failed td:first-child { border-left: 3px solid var(--bad); }
tr.failed .verdict { color: var(--bad); }
td.verdict { min-width: 9em; white-space: normal; overflow-wrap: anywhere; }
.verdict small, td.steps small { display: block; color: var(--dim); }
.steps { white-space: normal; } td.steps { width: 50%; min-width: 9em; } svg { height: 16px; } rect { height: 16px; }
.swatch { display: inline-block; width: 12px; height: 12px; margin-right: 6px; vertical-align: -1px; }
.some { margin: 0 0 .5em; color: var(--text); } body:has(#only:checked) tr.passed { display: none; }
)";

// All steps of one name.
struct StepSum {
  std::string name;
  std::vector<double> seconds;  // of each handset that had it
  std::uint16_t slowest_port = 0;
  double slowest = 0;
};

double Median(std::vector<double> numbers) {
  const auto middle = numbers.begin() + static_cast<std::ptrdiff_t>(numbers.size() / 2);
  std::ranges::nth_element(numbers, middle);
  return *middle;
}

std::string Rectangle(std::string_view kind, double x, double width, const std::string& title) {
  return Format(R"(<rect class="{}" x="{:.1f}" width="{:.1f}"><title>{}</title></rect>)", kind, x, std::max(width, 0.5),
                PageText(title));
}

std::string Drawing(const std::string& content) {
  return Format(R"(<svg viewBox="0 0 {:.0f} 16" preserveAspectRatio="none">{}</svg>)", kWidth, content);
}

class RunDrawing {
 public:
  RunDrawing(const RunHead& head, const std::vector<const Verdict*>& verdicts);

  std::string Page() const;

 private:
  void AddHandset(const Verdict& verdict);
  std::size_t NumberOf(const std::string& step) const;
  std::string ColourOf(const std::string& step) const;
  std::string Summary() const;
  std::string StepTable() const;
  std::string HandsetTable() const;
  std::string HandsetRow(const Verdict& verdict) const;
  std::string StepsOf(const Verdict& verdict) const;

  const RunHead& head_;
  const std::vector<const Verdict*>& verdicts_;
  std::vector<StepSum> steps_;  // in the order in which they came
  std::size_t failed_ = 0;
  double seconds_ = 0;  // until the last one ended
};

RunDrawing::RunDrawing(const RunHead& head, const std::vector<const Verdict*>& verdicts)
    : head_(head), verdicts_(verdicts) {
  for (const auto* verdict : verdicts_) AddHandset(*verdict);
}

void RunDrawing::AddHandset(const Verdict& verdict) {
  if (!verdict.passed()) ++failed_;
  std::map<std::string, double> sums;
  for (const auto& step : verdict.steps.all()) {
    seconds_ = std::max(seconds_, step.end);
    sums[step.name] += step.seconds();
    if (NumberOf(step.name) == steps_.size()) steps_.emplace_back().name = step.name;
  }
  for (const auto& [name, seconds] : sums) {
    auto& step = steps_[NumberOf(name)];
    step.seconds.push_back(seconds);
    if (seconds < step.slowest) continue;
    step.slowest = seconds;
    step.slowest_port = verdict.port;
  }
}

std::size_t RunDrawing::NumberOf(const std::string& step) const {
  const auto found = std::ranges::find(steps_, step, &StepSum::name);
  return static_cast<std::size_t>(found - steps_.begin());
}

std::string RunDrawing::ColourOf(const std::string& step) const {
  return step == kLostStep ? "lost" : Format("c{}", NumberOf(step) % kColours);
}

std::string RunDrawing::Summary() const {
  const auto passed = verdicts_.size() - failed_;
  auto text = Format("<p>{}: <b class=\"good\">{} passed</b>", Counted(verdicts_.size(), "handset"), passed);
  if (failed_ != 0) text += Format(", <b class=\"bad\">{} failed</b>", failed_);
  return text + Format(", in {:.1f} s, ended {}.</p>\n", seconds_, PageText(head_.ended));
}

std::string RunDrawing::StepTable() const {
  if (steps_.empty()) return {};
  double longest = 0;
  double all = 0;
  for (const auto& step : steps_) {
    longest = std::max(longest, step.slowest);
    for (const auto seconds : step.seconds) all += seconds;
  }
  const double scale = longest == 0 ? 0 : kWidth / longest;
  std::string rows;
  for (const auto& step : steps_) {
    const auto colour = ColourOf(step.name);
    const auto median = Median(step.seconds);
    double sum = 0;
    for (const auto seconds : step.seconds) sum += seconds;
    const auto bars = Rectangle(colour + " rest", 0, step.slowest * scale, Format("slowest: {:.1f} s", step.slowest)) +
                      Rectangle(colour, 0, median * scale, Format("median: {:.1f} s", median));
    rows += Format(
        "<tr><td><svg class=\"swatch\"><rect class=\"{}\" width=\"12\"/></svg>{}</td><td class=\"count\">{}</td>"
        "<td class=\"count\">{:.1f} s</td><td class=\"count\">{:.1f} s</td><td>COM{}</td><td class=\"count\">{:.0f} "
        "%</td><td class=\"steps\">{}</td></tr>\n",
        colour, PageText(step.name), step.seconds.size(), median, step.slowest, step.slowest_port,
        all == 0 ? 0 : sum * 100 / all, Drawing(bars));
  }
  return "<h2>Where the time went</h2>\n<table><thead><tr><th>Step</th><th class=\"count\">Handsets</th><th "
         "class=\"count\">Median</th><th class=\"count\">Slowest</th><th>on</th><th "
         "class=\"count\">Share</th><th class=\"steps\">Median, "
         "and slowest behind it</th></tr></thead>\n<tbody>\n" +
         rows + "</tbody></table>\n";
}

std::string RunDrawing::StepsOf(const Verdict& verdict) const {
  std::string bars;
  std::vector<std::string> times;
  const double scale = seconds_ == 0 ? 0 : kWidth / seconds_;
  for (const auto& step : verdict.steps.all()) {
    times.push_back(Format("{} {:.1f} s", step.name, step.seconds()));
    bars += Rectangle(ColourOf(step.name), step.begin * scale, step.seconds() * scale, times.back());
  }
  return bars.empty() ? "" : Drawing(bars) + "<small>" + PageText(Joined(times, " · ")) + "</small>";
}

std::string RunDrawing::HandsetRow(const Verdict& verdict) const {
  const auto slot = head_.slots.find(verdict.port);
  const auto slot_cell = head_.slots.empty()         ? std::string()
                         : slot == head_.slots.end() ? "<td></td>"
                                                     : Format("<td>{}</td>", slot->second);
  auto text = std::string(verdict.passed() ? "passed" : "<b>FAILED</b>");
  if (!verdict.passed()) {
    text += Format(": {}<small>{}</small>", PageText(verdict.failure->what()), PageText(verdict.failure->hint()));
  }
  return Format(
      "<tr class=\"{}\">{}<td>COM{}</td><td>{}</td><td>{}</td><td class=\"count\">{:.1f} s</td><td "
      "class=\"steps\">{}</td><td class=\"verdict\">{}</td></tr>\n",
      verdict.passed() ? "passed" : "failed", slot_cell, verdict.port, PageText(verdict.serial),
      PageText(verdict.model), verdict.seconds, StepsOf(verdict), text);
}

std::string RunDrawing::HandsetTable() const {
  std::string text = "<h2>Handsets</h2>\n";
  if (failed_ != 0 && failed_ != verdicts_.size()) {
    text += "<p class=\"some\"><label><input type=\"checkbox\" id=\"only\"> only those that failed</label></p>\n";
  }
  text += Format(
      "<table><thead><tr>{}<th>Port</th><th>Serial</th><th>Model</th><th class=\"count\">Time</th><th><div "
      "class=\"span\"><span>Steps, from 0 s</span><span>{:.1f} s</span></div></th><th>Verdict</th></tr></thead>\n"
      "<tbody>\n",
      head_.slots.empty() ? "" : "<th>Slot</th>", seconds_);
  for (const auto* verdict : verdicts_) text += HandsetRow(*verdict);
  return text + "</tbody></table>\n";
}

std::string RunDrawing::Page() const {
  return PageHead(head_.title, kRunStyle).append(Summary()).append(StepTable()).append(HandsetTable()).append(kPageEnd);
}

}  // namespace

std::string RunPage(const RunHead& head, const std::vector<const Verdict*>& verdicts) {
  return RunDrawing(head, verdicts).Page();
}

std::string TimeNow() {
  return ClockText(std::chrono::floor<std::chrono::seconds>(std::chrono::system_clock::now())) + " UTC";
}

}  // namespace kral::tool
