// The part of the platform's bounds-checked C library that the tool uses.
#pragma once

#include <stdarg.h>
#include <stddef.h>
#include <stdio.h>

typedef int errno_t;

#ifdef __cplusplus
extern "C" {
#endif

// Returns 0, or an errno value for a null or zero-sized destination and for a count beyond it; in
// the last case the whole destination is set.
errno_t memset_s(void* dest, size_t destMax, int c, size_t count);

// Knows the format "%s", whose arguments are the buffer and its size in bytes (size_t). Returns 1,
// or EOF at the end of the input, for a word that does not fit (the buffer then holds the empty
// string) and for any other format.
int fscanf_s(FILE* stream, const char* format, ...);

// Returns the length of the result, or -1 when it is longer than `count` characters (the buffer
// then holds its beginning), cannot be formatted or `count` leaves no space for the terminator (the
// empty string).
int vsnprintf_s(char* dest, size_t destMax, size_t count, const char* format, va_list args);

#ifdef __cplusplus
}
#endif
