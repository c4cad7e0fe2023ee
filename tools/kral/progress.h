// The progress of long work, on stderr: a bar with rate and remaining time on a terminal, a line now and then where
// there is none, and with --json one object per line.
//
//   Progress progress(context.out, "put", bytes_in_all);
//   progress.Describe("/nv/item");   // what is being worked on
//   progress.Update(bytes_so_far);   // as often as wanted; it draws only now and then
#ifndef KRAL_TOOLS_PROGRESS_H
#define KRAL_TOOLS_PROGRESS_H

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/clock.h"
#include "tools/kral/output.h"

namespace kral::tool {

class Progress {
 public:
  enum class Unit { kBytes, kItems };

  // A `total` of 0 is unknown: no share and no remaining time are shown.
  Progress(const Output& out, std::string work, std::uint64_t total, Unit unit = Unit::kBytes,
           Clock& clock = SystemClock());
  ~Progress();  // wipes the bar
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void Describe(std::string_view subject);
  void SetTotal(std::uint64_t total) { total_ = total; }
  void Update(std::uint64_t done);
  void Advance(std::uint64_t amount) { Update(done_ + amount); }
  std::uint64_t done() const { return done_; }

  // A note that does not get in the way of the bar.
  void Note(std::string_view text);

 private:
  enum class Style { kBar, kLines, kJson, kLane };

  void Show();
  void DrawBar();
  void WriteLine() const;
  void WriteObject() const;
  void TellLane() const;
  Json Members() const;
  void Wipe();

  std::string Figures() const;  // "45 %  1.2 MiB/s  0:07 left", as far as known
  double Rate() const;          // per second; 0 as long as nothing can be told
  std::uint64_t SecondsLeft(double rate) const;

  const Output& out_;
  const std::string work_;
  const Unit unit_;
  const Style style_;
  Clock& clock_;
  std::string subject_;
  std::uint64_t total_;
  std::uint64_t done_ = 0;
  std::uint64_t elapsed_ms_ = 0;
  std::uint32_t last_tick_;
  std::uint64_t rate_from_ms_ = 0;  // since when, and from which amount on, the rate is counted
  std::uint64_t rate_from_ = 0;
  std::uint64_t next_ms_;  // when something is to be shown again
  std::size_t drawn_width_ = 0;
};

// Title, bar and figures in so many columns; what there is no room for is left out.
std::string BarLine(const std::string& title, const WorkShown& shown, std::size_t width);

std::string SizeText(std::uint64_t bytes);        // "512 B", "1.5 MiB"
std::string DurationText(std::uint64_t seconds);  // "0:07", "1:02:03"

}  // namespace kral::tool

#endif
