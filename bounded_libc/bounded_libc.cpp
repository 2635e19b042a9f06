#include <bounded_libc.h>

#include <cctype>
#include <cerrno>
#include <climits>
#include <cstring>

errno_t memset_s(void* dest, size_t destMax, int c, size_t count) {
    if (dest == nullptr) {
        return EINVAL;
    }
    if (destMax == 0 || destMax > INT_MAX) {
        return ERANGE;
    }
    memset(dest, c, count < destMax ? count : destMax);
    return count > destMax ? ERANGE : 0;
}

namespace {

// Reads up to the next white space into `word` of `size` bytes. False at the end of the input and
// for a word that does not fit.
bool ReadWord(FILE* stream, char* word, size_t size) {
    if (word == nullptr || size == 0) {
        return false;
    }
    word[0] = '\0';
    int c = getc(stream);
    while (isspace(c) != 0) {
        c = getc(stream);
    }
    size_t length = 0;
    for (; c != EOF && isspace(c) == 0; c = getc(stream)) {
        if (length + 1 == size) {
            word[0] = '\0';
            return false;
        }
        word[length++] = static_cast<char>(c);
    }
    ungetc(c, stream);
    word[length] = '\0';
    return length > 0;
}

}  // namespace

int fscanf_s(FILE* stream, const char* format, ...) {
    if (stream == nullptr || format == nullptr || strcmp(format, "%s") != 0) {
        return EOF;
    }
    va_list args;
    va_start(args, format);
    char* const word = va_arg(args, char*);
    const size_t size = va_arg(args, size_t);
    va_end(args);
    return ReadWord(stream, word, size) ? 1 : EOF;
}

int vsnprintf_s(char* dest, size_t destMax, size_t count, const char* format, va_list args) {
    if (dest == nullptr || destMax == 0 || destMax > INT_MAX) {
        return -1;
    }
    dest[0] = '\0';
    if (format == nullptr || count >= destMax) {
        return -1;
    }
    const int length = vsnprintf(dest, count + 1, format, args);
    if (length < 0) {
        dest[0] = '\0';
        return -1;
    }
    return static_cast<size_t>(length) > count ? -1 : length;
}
