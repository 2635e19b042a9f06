// The part of the platform's bounds-checked C library that the tool uses. Callers pass valid
// pointers and sizes above 0. After a failure the buffer is unspecified unless stated otherwise.
#pragma once

#include <stdarg.h>
#include <stddef.h>
#include <stdio.h>

typedef int errno_t;

#ifdef __cplusplus
extern "C" {
#endif

// Returns 0. Writes nothing and returns ERANGE when `count` exceeds `destMax`.
errno_t memset_s(void* dest, size_t destMax, int c, size_t count);

// Reads one word and the white-space character after it. Supports only the format "%s"; its
// arguments are the buffer and its size in bytes (size_t), including the terminator. Returns 1, or
// EOF when there is no word, when the word does not fit, or for any other format.
int fscanf_s(FILE* stream, const char* format, ...);

// Returns the length of the result, or -1 when it is longer than `count` characters (the buffer
// then holds the first `count` of them and a terminator), when it cannot be formatted, and, with
// nothing written, when `count` leaves no space for the terminator.
int vsnprintf_s(char* dest, size_t destMax, size_t count, const char* format, va_list args);

#ifdef __cplusplus
}
#endif
