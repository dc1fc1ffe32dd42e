/* A failed CHECK reports its line and makes the program exit non-zero. */
#ifndef QUARRIN_CAPI_CHECK_H
#define QUARRIN_CAPI_CHECK_H

#include <stdio.h>

static int check_failures;

#define CHECK(cond)                                                            \
  do {                                                                         \
    if (!(cond)) {                                                             \
      fprintf(stderr, "%s:%d: CHECK failed: %s\n", __FILE__, __LINE__, #cond); \
      ++check_failures;                                                        \
    }                                                                          \
  } while (0)

#define CHECK_DONE() (check_failures ? 1 : 0)

#endif
