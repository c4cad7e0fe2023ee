// When which step of the work on a handset was under way.
#ifndef KRAL_TOOLS_STEP_TIMES_H
#define KRAL_TOOLS_STEP_TIMES_H

#include <string>
#include <utility>
#include <vector>

namespace kral::tool {

// While a handset is away.
inline constexpr const char* kLostStep = "lost";

struct StepTime {
  std::string name;
  double begin = 0;  // in seconds, since the work on all handsets began
  double end = 0;

  double seconds() const { return end - begin; }
};

// A step lasts until the next one.
class StepTimes {
 public:
  void Enter(std::string name, double now) {
    if (!steps_.empty() && steps_.back().name == name) return;
    End(now);
    steps_.push_back({std::move(name), now, now});
  }
  void End(double now) {
    if (!steps_.empty()) steps_.back().end = now;
  }
  // One that was all there was, and had no name of its own.
  void NameTheOnly(const std::string& name) {
    if (steps_.size() == 1) steps_.front().name = name;
  }
  const std::vector<StepTime>& all() const { return steps_; }

 private:
  std::vector<StepTime> steps_;
};

}  // namespace kral::tool

#endif
