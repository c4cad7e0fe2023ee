#ifndef KRAL_TESTS_FLOOD_NOW_H
#define KRAL_TESTS_FLOOD_NOW_H

/* Seconds since an unknown moment. */
double now(void);

#endif
