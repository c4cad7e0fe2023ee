#include "tests/flood/now.h"

#include <time.h>

double now(void) {
  struct timespec time;
  timespec_get(&time, TIME_UTC);
  return (double)time.tv_sec + (double)time.tv_nsec * 1e-9;
}
