// Takes the place of `new` and `delete` in the whole test program; malloc and free do the work, as sanitizers see them.
#include "tests/support/failing_allocation.h"

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <new>

namespace kral::test {
namespace {

thread_local size_t to_go = 0;  // 0: none fails
thread_local bool failed = false;
std::atomic<size_t> refused_from{SIZE_MAX};

}  // namespace

FailingAllocation::FailingAllocation(size_t n) {
  failed = false;
  to_go = n;
}

FailingAllocation::~FailingAllocation() {
  to_go = 0;
}

bool FailingAllocation::has_failed() const {
  return failed;
}

ScarceMemory::ScarceMemory(size_t from) {
  refused_from = from;
}

ScarceMemory::~ScarceMemory() {
  refused_from = SIZE_MAX;
}

static void* Allocate(size_t size) {
  if (to_go > 0 && --to_go == 0) {
    failed = true;
    throw std::bad_alloc();
  }
  if (size >= refused_from) throw std::bad_alloc();
  if (void* const memory = std::malloc(size > 0 ? size : 1)) return memory;
  throw std::bad_alloc();
}

}  // namespace kral::test

void* operator new(std::size_t size) {
  return kral::test::Allocate(size);
}

// The sanitizer has its own of these, whose memory the ones below may not free.
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  try {
    return kral::test::Allocate(size);
  } catch (...) {
    return nullptr;
  }
}

void operator delete(void* memory, const std::nothrow_t&) noexcept {
  std::free(memory);
}

void operator delete(void* memory) noexcept {
  std::free(memory);
}

void operator delete(void* memory, std::size_t) noexcept {
  std::free(memory);
}
