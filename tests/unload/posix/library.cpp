#include "tests/unload/library.h"

#include <dlfcn.h>
#include <link.h>

#include <cstddef>

namespace kral::unload {

const bool kLeaves = false;

void* Load(const char* file) {
  return ::dlopen(file, RTLD_NOW | RTLD_LOCAL);
}

void Free(void* library) {
  ::dlclose(library);
}

bool IsLoaded(const char* file) {
  void* const library = ::dlopen(file, RTLD_NOW | RTLD_NOLOAD);
  if (library != nullptr) ::dlclose(library);
  return library != nullptr;
}

void* Find(void* library, const char* function) {
  return ::dlsym(library, function);
}

namespace {

int RunAction(dl_phdr_info*, size_t, void* action) {
  (*static_cast<void (**)()>(action))();
  return 1;
}

}  // namespace

// The walk over the loaded libraries holds the loader's lock.
void RunWhileUnloading(void (*action)()) {
  ::dl_iterate_phdr(RunAction, &action);
}

}  // namespace kral::unload
