// A library that is loaded and freed by hand, as hosts do that know it by its file only.
#ifndef KRAL_TESTS_UNLOAD_LIBRARY_H
#define KRAL_TESTS_UNLOAD_LIBRARY_H

namespace kral::unload {

// Whether a library without threads leaves the process when it is freed.
extern const bool kLeaves;

void* Load(const char* file);  // null when it cannot be had
void Free(void* library);
bool IsLoaded(const char* file);
void* Find(void* library, const char* function);

// Runs `action` as code runs that the system calls while it loads or unloads a library.
void RunWhileUnloading(void (*action)());

}  // namespace kral::unload

#endif
