#include "platform/forced_unwind.h"

#include <cxxabi.h>

namespace kral {
namespace {

thread_local bool is_ending = false;

}  // namespace

void PassForcedUnwind() {
  try {
    throw;
  } catch (abi::__forced_unwind&) {
    is_ending = true;
    throw;
  } catch (...) {
  }
}

bool IsThreadEnding() {
  return is_ending;
}

}  // namespace kral
