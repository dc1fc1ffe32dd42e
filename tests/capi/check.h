/* A failed CHECK reports its line and makes the program exit non-zero. */
#ifndef QUARRIN_CAPI_CHECK_H
#define QUARRIN_CAPI_CHECK_H

#include <quarrin/plugin.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

static int check_failures;

#define CHECK(cond)                                                            \
  do {                                                                         \
    if (!(cond)) {                                                             \
      fprintf(stderr, "%s:%d: CHECK failed: %s\n", __FILE__, __LINE__, #cond); \
      ++check_failures;                                                        \
    }                                                                          \
  } while (0)

#define CHECK_DONE() (check_failures ? 1 : 0)

/* Whether the string's UTF-8 copy is the text given. */
static inline int utf8_is(QrTypeRef string, const char* text) {
  char* copy = QrStringCopyUTF8(string);
  int same = copy && strcmp(copy, text) == 0;
  free(copy);
  return same;
}

/* Releases every value up to the NULL that ends the list. */
static inline void release_all(QrTypeRef first, ...) {
  va_list rest;
  va_start(rest, first);
  for (QrTypeRef v = first; v; v = va_arg(rest, QrTypeRef)) QrRelease(v);
  va_end(rest);
}

#endif
