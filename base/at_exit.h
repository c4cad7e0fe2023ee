// Something that is done when a scope is left, whatever leaves it: a return, an exception, or the end of the thread.
#ifndef KRAL_BASE_AT_EXIT_H
#define KRAL_BASE_AT_EXIT_H

#include <utility>

namespace kral {

template <class Action>
class [[nodiscard]] AtExit {
 public:
  explicit AtExit(Action action) : action_(std::move(action)) {}
  ~AtExit() { action_(); }
  AtExit(const AtExit&) = delete;
  AtExit& operator=(const AtExit&) = delete;

 private:
  Action action_;
};

}  // namespace kral

#endif
