// A lack of memory at one chosen moment or above a chosen size, for tests of what becomes of the work then.
#ifndef KRAL_TESTS_SUPPORT_FAILING_ALLOCATION_H
#define KRAL_TESTS_SUPPORT_FAILING_ALLOCATION_H

#include <cstddef>

namespace kral::test {

// While it lives, the n-th allocation by `new` on this thread fails, counted from 1; the others succeed.
class FailingAllocation {
 public:
  explicit FailingAllocation(size_t n);
  ~FailingAllocation();
  FailingAllocation(const FailingAllocation&) = delete;
  FailingAllocation& operator=(const FailingAllocation&) = delete;

  bool has_failed() const;  // false: there were fewer
};

// While it lives, no memory is given by `new` for anything of that size and more, on any thread.
class ScarceMemory {
 public:
  explicit ScarceMemory(size_t refused_from);
  ~ScarceMemory();
  ScarceMemory(const ScarceMemory&) = delete;
  ScarceMemory& operator=(const ScarceMemory&) = delete;
};

}  // namespace kral::test

#endif
