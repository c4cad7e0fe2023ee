/* A malloc whose k-th call from chosen libraries fails. Preloaded; what the rest of the process allocates is not
 * counted. */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <link.h>
#include <stdatomic.h>
#include <stddef.h>
#include <stdint.h>
#include <string.h>

extern void* __libc_malloc(size_t size);
extern void* __libc_calloc(size_t count, size_t size);
extern void* __libc_realloc(void* block, size_t size);

#define MOST_RANGES 32

static struct {
  uintptr_t begin;
  uintptr_t end;
} ranges[MOST_RANGES];
static size_t range_count;
static atomic_long counted;
static atomic_long failing;

static int add_ranges(struct dl_phdr_info* info, size_t size, void* names) {
  const char* const* name = names;
  (void)size;
  for (; *name != NULL; ++name) {
    if (strstr(info->dlpi_name, *name) == NULL) continue;
    for (int i = 0; i < info->dlpi_phnum && range_count < MOST_RANGES; ++i) {
      if (info->dlpi_phdr[i].p_type != PT_LOAD || (info->dlpi_phdr[i].p_flags & PF_X) == 0) continue;
      ranges[range_count].begin = info->dlpi_addr + info->dlpi_phdr[i].p_vaddr;
      ranges[range_count].end = ranges[range_count].begin + info->dlpi_phdr[i].p_memsz;
      ++range_count;
    }
  }
  return 0;
}

/* Counts the calls that come from libraries whose names contain one of these. Gives how many ranges of code they have.
 */
size_t watch_libraries(const char* const* names) {
  range_count = 0;
  dl_iterate_phdr(add_ranges, (void*)names);
  return range_count;
}

/* The k-th call from now on fails; 0: none does. Gives how many calls there were since the last time. */
long fail_allocation(long k) {
  atomic_store(&failing, 0);
  const long calls = atomic_exchange(&counted, 0);
  atomic_store(&failing, k);
  return calls;
}

static int fails(const void* caller) {
  const long k = atomic_load(&failing);
  if (k == 0) return 0;
  for (size_t i = 0; i < range_count; ++i) {
    if ((uintptr_t)caller < ranges[i].begin || (uintptr_t)caller >= ranges[i].end) continue;
    if (atomic_fetch_add(&counted, 1) + 1 != k) return 0;
    errno = ENOMEM;
    return 1;
  }
  return 0;
}

void* malloc(size_t size) {
  return fails(__builtin_return_address(0)) ? NULL : __libc_malloc(size);
}

void* calloc(size_t count, size_t size) {
  return fails(__builtin_return_address(0)) ? NULL : __libc_calloc(count, size);
}

void* realloc(void* block, size_t size) {
  return fails(__builtin_return_address(0)) ? NULL : __libc_realloc(block, size);
}
