#include <android/log.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>

#include "platform/events.h"

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    char text[host::kMaxLogText + 1] = "";
    // Formatting stops when the stream's buffer is full. vsnprintf() would format the rest as well:
    // for a reply of 1 MiB, it takes 1.7 ms instead of 8 us.
    FILE* const stream = fmemopen(text, sizeof(text), "w");
    if (stream == nullptr) {
        return -errno;
    }
    va_list args;
    va_start(args, format);
    vfprintf(stream, format, args);
    va_end(args);
    fclose(stream);
    return host::WriteLog(priority, tag != nullptr ? tag : program_invocation_short_name, text);
}
