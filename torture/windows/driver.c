/* Calls functions of DLLs for a program at the other end of its standard input and output. It shares nothing with the
 * library, whose header it does not even include: functions are found by name, arguments are told.
 *
 *   a line in:   <thread> <module>!<function> <argument>...     module "-" is this program
 *   a line out:  <thread> <eax> <edx> <bytes of each b argument>...   or   <thread> ! <what is wrong>
 *   arguments:   i<hex> 32 bits; q<hex> 64 bits; s<hex> bytes that are only read; b<hex> bytes in and out
 *
 * Every thread number is a thread of its own, made when it is first named; so calls run beside each other. Each call is
 * made with the stack aligned to 4 bytes and no more: the remainder to 16 is another one every time. */
#include <fcntl.h>
#include <io.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <windows.h>

#define MOST_THREADS 128
#define MOST_ARGUMENTS 24

typedef struct {
  HANDLE there_is_one;
  char* volatile line;
} Worker;

typedef struct {
  uint32_t words[2 * MOST_ARGUMENTS];
  unsigned word_count;
  uint8_t* buffers[MOST_ARGUMENTS];
  size_t sizes[MOST_ARGUMENTS];
  int returned[MOST_ARGUMENTS];
  unsigned buffer_count;
} Arguments;

static Worker workers[MOST_THREADS];
static CRITICAL_SECTION output;
static volatile LONG calls;

/* Pushes the words behind `gap` bytes below a stack aligned to 16. Works for both calling conventions, because the
 * stack pointer is taken back from the frame. What a callee has to keep is compared: -1 in *kept when it did not. */
uint64_t call_on_stack(void* function, const uint32_t* words, unsigned count, unsigned gap, int* kept);
__asm__(
    ".globl _call_on_stack\n"
    "_call_on_stack:\n"
    "  push %ebp\n  mov %esp, %ebp\n  push %ebx\n  push %esi\n  push %edi\n"
    "  mov 12(%ebp), %esi\n  mov 16(%ebp), %ecx\n"
    "  and $-16, %esp\n  sub 20(%ebp), %esp\n"
    "1: test %ecx, %ecx\n  jz 2f\n  dec %ecx\n  push (%esi,%ecx,4)\n  jmp 1b\n"
    "2: mov $0x5EED0001, %ebx\n  mov $0x5EED0002, %esi\n  mov $0x5EED0003, %edi\n"
    "  call *8(%ebp)\n"
    "  mov 24(%ebp), %ecx\n"
    "  cmp $0x5EED0001, %ebx\n  jne 3f\n  cmp $0x5EED0002, %esi\n  jne 3f\n  cmp $0x5EED0003, %edi\n  je 4f\n"
    "3: movl $-1, (%ecx)\n"
    "4: lea -12(%ebp), %esp\n  pop %edi\n  pop %esi\n  pop %ebx\n  pop %ebp\n  ret\n");

static int digit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  return c >= 'a' && c <= 'f' ? c - 'a' + 10 : -1;
}

/* Bytes from hex digits, up to the next other character; a terminating 0 behind them. */
static const char* take_bytes(const char* text, Arguments* arguments, int returned) {
  const size_t size = strspn(text, "0123456789abcdef") / 2;
  uint8_t* bytes = malloc(size + 1);
  for (size_t i = 0; i < size; ++i) bytes[i] = (uint8_t)(digit(text[2 * i]) * 16 + digit(text[2 * i + 1]));
  bytes[size] = 0;
  arguments->buffers[arguments->buffer_count] = bytes;
  arguments->sizes[arguments->buffer_count] = size;
  arguments->returned[arguments->buffer_count++] = returned;
  arguments->words[arguments->word_count++] = (uint32_t)(uintptr_t)bytes;
  return text + 2 * size;
}

static int take_arguments(const char* text, Arguments* arguments) {
  while (*text == ' ') {
    char* end = NULL;
    if (arguments->buffer_count == MOST_ARGUMENTS || arguments->word_count >= 2 * MOST_ARGUMENTS - 1) return 0;
    ++text;
    if (*text == 'i' || *text == 'q') {
      const int is_long = *text == 'q';
      const uint64_t value = _strtoui64(text + 1, &end, 16);
      arguments->words[arguments->word_count++] = (uint32_t)value;
      if (is_long) arguments->words[arguments->word_count++] = (uint32_t)(value >> 32);
      text = end;
    } else if (*text == 's' || *text == 'b') {
      text = take_bytes(text + 1, arguments, *text == 'b');
    } else {
      return 0;
    }
  }
  return *text == 0;
}

static void* find_function(char* name, char** rest) {
  char* bang = strchr(name, '!');
  if (bang == NULL) return NULL;
  char* end = bang + 1 + strcspn(bang + 1, " ");
  const char last = *end;
  *bang = *end = 0;
  const HMODULE module = GetModuleHandleA(strcmp(name, "-") == 0 ? NULL : name);
  void* function = module == NULL ? NULL : (void*)(uintptr_t)GetProcAddress(module, bang + 1);
  *end = last;
  *rest = end;
  return function;
}

static void print_outcome(unsigned thread, uint64_t result, const Arguments* arguments) {
  static const char digits[] = "0123456789abcdef";
  size_t room = 64;
  for (unsigned i = 0; i < arguments->buffer_count; ++i) room += 2 * arguments->sizes[i] + 1;
  char* text = malloc(room);
  char* at = text + sprintf(text, "%u %x %x", thread, (unsigned)result, (unsigned)(result >> 32));
  for (unsigned i = 0; i < arguments->buffer_count; ++i) {
    if (!arguments->returned[i]) continue;
    *at++ = ' ';
    for (size_t k = 0; k < arguments->sizes[i]; ++k) {
      *at++ = digits[arguments->buffers[i][k] >> 4];
      *at++ = digits[arguments->buffers[i][k] & 15];
    }
  }
  *at++ = '\n';
  EnterCriticalSection(&output);
  fwrite(text, 1, (size_t)(at - text), stdout);
  fflush(stdout);
  LeaveCriticalSection(&output);
  free(text);
}

static void print_fault(unsigned thread, const char* text) {
  EnterCriticalSection(&output);
  printf("%u ! %s\n", thread, text);
  fflush(stdout);
  LeaveCriticalSection(&output);
}

static void serve(unsigned thread, char* line) {
  Arguments arguments = {{0}, 0, {NULL}, {0}, {0}, 0};
  char* rest = NULL;
  void* function = find_function(line, &rest);
  int kept = 0;
  if (function == NULL) {
    print_fault(thread, "there is no such function");
  } else if (!take_arguments(rest, &arguments)) {
    print_fault(thread, "these arguments cannot be read");
  } else {
    const unsigned gap = 4 * ((unsigned)InterlockedIncrement(&calls) % 4);
    const uint64_t result = call_on_stack(function, arguments.words, arguments.word_count, gap, &kept);
    if (kept == 0)
      print_outcome(thread, result, &arguments);
    else
      print_fault(thread, "a register has changed");
  }
  for (unsigned i = 0; i < arguments.buffer_count; ++i) free(arguments.buffers[i]);
}

static __attribute__((noreturn)) DWORD WINAPI work(void* number) {
  const unsigned thread = (unsigned)(uintptr_t)number;
  Worker* worker = &workers[thread];
  for (;;) {
    WaitForSingleObject(worker->there_is_one, INFINITE);
    char* line = worker->line;
    const char* space = strchr(line, ' ');
    serve(thread, line + (space - line) + 1);
    free(line);
  }
}

static void hand_over(char* line) {
  const unsigned long thread = strtoul(line, NULL, 10);
  if (thread >= MOST_THREADS || strchr(line, ' ') == NULL) exit(2);
  Worker* worker = &workers[thread];
  worker->line = line;
  if (worker->there_is_one == NULL) {
    worker->there_is_one = CreateEventA(NULL, FALSE, FALSE, NULL);
    CloseHandle(CreateThread(NULL, 0, work, (void*)(uintptr_t)thread, 0, NULL));
  }
  SetEvent(worker->there_is_one);
}

/* A line without its end, or NULL; the caller's. */
static char* read_line(void) {
  size_t room = 1024;
  size_t used = 0;
  char* line = malloc(room);
  while (fgets(line + used, (int)(room - used), stdin) != NULL) {
    used += strlen(line + used);
    if (used > 0 && line[used - 1] == '\n') {
      line[strcspn(line, "\r\n")] = 0;
      return line;
    }
    room *= 2;
    line = realloc(line, room);
  }
  free(line);
  return NULL;
}

/* The handle table of this process as the system counts it: handles, and threads of the system's own are not among it.
 */
__declspec(dllexport) uint32_t handle_count(void) {
  typedef struct {
    void* object;
    uintptr_t process;
    uintptr_t handle;
    uint32_t other[4];
  } Entry;
  typedef struct {
    uintptr_t count;
    uintptr_t reserved;
    Entry entries[1];
  } Table;
  typedef LONG(WINAPI * Query)(ULONG, void*, ULONG, ULONG*);
  enum { kExtendedHandles = 64, kRoom = 4 << 20 };
  const Query query = (Query)(uintptr_t)GetProcAddress(GetModuleHandleA("ntdll"), "NtQuerySystemInformation");
  Table* table = malloc(kRoom);
  ULONG size = 0;
  uint32_t count = 0;
  if (query(kExtendedHandles, table, kRoom, &size) == 0) {
    for (uintptr_t i = 0; i < table->count; ++i) count += table->entries[i].process == GetCurrentProcessId();
  }
  free(table);
  return count;
}

static volatile LONG allocations;
static volatile LONG failing;
static void*(__cdecl* real_malloc)(size_t);
static void*(__cdecl* real_calloc)(size_t, size_t);
static void*(__cdecl* real_realloc)(void*, size_t);

static int fails(void) {
  const LONG k = failing;
  return k != 0 && InterlockedIncrement(&allocations) == k;
}

static void* __cdecl failing_malloc(size_t size) {
  return fails() ? NULL : real_malloc(size);
}

static void* __cdecl failing_calloc(size_t count, size_t size) {
  return fails() ? NULL : real_calloc(count, size);
}

static void* __cdecl failing_realloc(void* block, size_t size) {
  return fails() ? NULL : real_realloc(block, size);
}

static uint32_t replace_import(const char* name, void** slot) {
  const struct {
    const char* name;
    void* own;
    void** real;
  } functions[] = {{"malloc", (void*)(uintptr_t)failing_malloc, (void**)&real_malloc},
                   {"calloc", (void*)(uintptr_t)failing_calloc, (void**)&real_calloc},
                   {"realloc", (void*)(uintptr_t)failing_realloc, (void**)&real_realloc}};
  DWORD before = 0;
  for (size_t i = 0; i < sizeof functions / sizeof functions[0]; ++i) {
    if (strcmp(name, functions[i].name) != 0) continue;
    if (*slot == functions[i].own) return 1;
    *functions[i].real = *slot;
    VirtualProtect(slot, sizeof *slot, PAGE_READWRITE, &before);
    *slot = functions[i].own;
    VirtualProtect(slot, sizeof *slot, before, &before);
    return 1;
  }
  return 0;
}

/* Counts the allocations of a DLL from now on, those in its run time libraries too. Gives how many of its imports
 * allocate. */
__declspec(dllexport) uint32_t watch_allocations(const char* dll) {
  uint8_t* const base = (uint8_t*)GetModuleHandleA(dll);
  const IMAGE_NT_HEADERS* const headers = (const void*)(base + ((const IMAGE_DOS_HEADER*)base)->e_lfanew);
  const DWORD table = headers->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT].VirtualAddress;
  uint32_t replaced = 0;
  for (const IMAGE_IMPORT_DESCRIPTOR* one = (const void*)(base + table); one->Name != 0; ++one) {
    const IMAGE_THUNK_DATA* name = (const void*)(base + one->OriginalFirstThunk);
    void** slot = (void**)(base + one->FirstThunk);
    for (; name->u1.AddressOfData != 0; ++name, ++slot) {
      if (IMAGE_SNAP_BY_ORDINAL(name->u1.Ordinal)) continue;
      const IMAGE_IMPORT_BY_NAME* const function = (const void*)(base + name->u1.AddressOfData);
      replaced += replace_import((const char*)function->Name, slot);
    }
  }
  return replaced;
}

/* The k-th allocation from now on fails; 0: none does. Gives how many there were since the last time. */
__declspec(dllexport) int32_t fail_allocation(int32_t k) {
  InterlockedExchange(&failing, 0);
  const LONG were = InterlockedExchange(&allocations, 0);
  InterlockedExchange(&failing, k);
  return were;
}

int main(void) {
  _setmode(_fileno(stdout), _O_BINARY);
  InitializeCriticalSection(&output);
  printf("ready %lx\n", GetCurrentProcessId());
  fflush(stdout);
  for (char* line = read_line(); line != NULL; line = read_line()) hand_over(line);
  /* What is under way must not keep the process. */
  TerminateProcess(GetCurrentProcess(), 0);
  return 0;
}
