// Host implementation of the platform's log interface: entries go to the device root's log.
#pragma once

typedef enum android_LogPriority {
    ANDROID_LOG_UNKNOWN = 0,
    ANDROID_LOG_DEFAULT,
    ANDROID_LOG_VERBOSE,
    ANDROID_LOG_DEBUG,
    ANDROID_LOG_INFO,
    ANDROID_LOG_WARN,
    ANDROID_LOG_ERROR,
    ANDROID_LOG_FATAL,
    ANDROID_LOG_SILENT,
} android_LogPriority;

#ifdef __cplusplus
extern "C" {
#endif

// Writes one entry, truncated to 1023 bytes as on a device. A null tag is replaced by the program's
// name. Returns the number of bytes written to the log, or a negative errno value.
int __android_log_print(int priority, const char* tag, const char* format, ...)
        __attribute__((format(printf, 3, 4)));

#ifdef __cplusplus
}
#endif
