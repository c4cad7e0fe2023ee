#include "platform/forced_unwind.h"

#include <exception>

namespace kral {
namespace {

thread_local bool is_ending = false;

}  // namespace

void PassForcedUnwind() {
  // The unwind that ends a thread is no C++ exception, so there is none to point at; a handler for its type would be
  // given a reference to nothing.
  if (std::current_exception() != nullptr) return;
  is_ending = true;
  throw;
}

bool IsThreadEnding() {
  return is_ending;
}

}  // namespace kral
