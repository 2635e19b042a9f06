// The bounds-checked C functions that the tool uses. Pointers must be valid and sizes greater than
// 0. After a failure, the contents of the buffer are unspecified unless stated otherwise.
#pragma once

#include <stdarg.h>
#include <stddef.h>
#include <stdio.h>

typedef int errno_t;

#ifdef __cplusplus
extern "C" {
#endif

// Sets `count` bytes and returns 0. Writes nothing and returns ERANGE if `count` exceeds `destMax`.
errno_t memset_s(void* dest, size_t destMax, int c, size_t count);

// Reads one word and the white-space character after it. Supports only the format "%s", whose
// arguments are the buffer and its size in bytes (size_t), including the terminator. Returns 1, or
// EOF if there is no word, the word does not fit, or the format is not supported.
int fscanf_s(FILE* stream, const char* format, ...);

// Formats at most `count` characters and a terminator. Returns the length of the result, or -1:
// - if the result is longer than `count`; the buffer then holds its first `count` characters
// - if the result cannot be formatted
// - if `count` leaves no space for the terminator; nothing is written
int vsnprintf_s(char* dest, size_t destMax, size_t count, const char* format, va_list args);

#ifdef __cplusplus
}
#endif
