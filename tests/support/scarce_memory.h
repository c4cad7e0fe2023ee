// While it lives, no memory is given for anything of that size and more, on any thread.
#ifndef KRAL_TESTS_SUPPORT_SCARCE_MEMORY_H
#define KRAL_TESTS_SUPPORT_SCARCE_MEMORY_H

#include <cstddef>

namespace kral::test {

class ScarceMemory {
 public:
  explicit ScarceMemory(size_t refused_from);
  ~ScarceMemory();
  ScarceMemory(const ScarceMemory&) = delete;
  ScarceMemory& operator=(const ScarceMemory&) = delete;
};

}  // namespace kral::test

#endif
