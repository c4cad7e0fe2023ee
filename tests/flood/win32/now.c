#include "tests/flood/now.h"

#include <windows.h>

double now(void) {
  LARGE_INTEGER ticks;
  LARGE_INTEGER a_second;
  QueryPerformanceCounter(&ticks);
  QueryPerformanceFrequency(&a_second);
  return (double)ticks.QuadPart / (double)a_second.QuadPart;
}
