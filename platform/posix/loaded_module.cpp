// The library is linked to stay loaded until the process ends, and a thread's end waits for nobody.
#include "platform/loaded_module.h"

namespace kral {

ModuleReference ModuleReference::Take() {
  return {};
}

ModuleReference::ModuleReference(ModuleReference&&) noexcept {}

ModuleReference& ModuleReference::operator=(ModuleReference&&) noexcept {
  return *this;
}

ModuleReference::~ModuleReference() = default;

bool HasEndedWithin(std::thread&, std::chrono::milliseconds) {
  return true;
}

}  // namespace kral
