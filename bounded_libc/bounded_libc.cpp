#include <bounded_libc.h>

#include <cctype>
#include <cerrno>
#include <cstring>

errno_t memset_s(void* dest, size_t destMax, int c, size_t count) {
    if (count > destMax) {
        return ERANGE;
    }
    memset(dest, c, count);
    return 0;
}

int fscanf_s(FILE* stream, const char* format, ...) {
    if (strcmp(format, "%s") != 0) {
        return EOF;
    }
    va_list args;
    va_start(args, format);
    char* const word = va_arg(args, char*);
    const size_t size = va_arg(args, size_t);
    va_end(args);

    int c = getc(stream);
    while (isspace(c) != 0) {
        c = getc(stream);
    }
    size_t length = 0;
    for (; c != EOF && isspace(c) == 0; c = getc(stream)) {
        if (length + 1 == size) {
            return EOF;
        }
        word[length++] = static_cast<char>(c);
    }
    word[length] = '\0';
    return length > 0 ? 1 : EOF;
}

int vsnprintf_s(char* dest, size_t destMax, size_t count, const char* format, va_list args) {
    if (count >= destMax) {
        return -1;
    }
    const int length = vsnprintf(dest, count + 1, format, args);
    return length < 0 || static_cast<size_t>(length) > count ? -1 : length;
}
