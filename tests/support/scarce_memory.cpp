// The test program's own operator new, which can be told to refuse.
#include "tests/support/scarce_memory.h"

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <new>

namespace {

std::atomic<size_t> refused_from{SIZE_MAX};

void* Allocate(size_t size) noexcept {
  return size >= refused_from ? nullptr : std::malloc(size == 0 ? 1 : size);
}

}  // namespace

void* operator new(size_t size) {
  if (void* const memory = Allocate(size)) return memory;
  throw std::bad_alloc();
}
void* operator new(size_t size, const std::nothrow_t&) noexcept {
  return Allocate(size);
}
void operator delete(void* memory) noexcept {
  std::free(memory);
}
void operator delete(void* memory, size_t) noexcept {
  std::free(memory);
}
void operator delete(void* memory, const std::nothrow_t&) noexcept {
  std::free(memory);
}

namespace kral::test {

ScarceMemory::ScarceMemory(size_t from) {
  refused_from = from;
}
ScarceMemory::~ScarceMemory() {
  refused_from = SIZE_MAX;
}

}  // namespace kral::test
