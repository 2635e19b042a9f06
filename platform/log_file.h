// The device's log, which is the file `log` in the device root. An entry is a header and `size`
// bytes: the priority (one byte), the tag and the text, both zero-terminated. Writers append an
// entry with a single write.
#pragma once

#include <android/log.h>

#include <cstddef>
#include <cstdint>

namespace host {

constexpr size_t kMaxLogText = 1023;  // bytes, without the terminator, as on a device

// In the machine's byte order.
struct LogEntryHeader {
    uint32_t size;
    int32_t pid;
    int32_t tid;
    uint32_t seconds;  // since 1970-01-01 UTC
    uint32_t nanoseconds;
};

// Returns the letter that logcat prints for a priority, or '?' if it is unknown.
constexpr char LogPriorityLetter(int priority) {
    return priority >= ANDROID_LOG_VERBOSE && priority <= ANDROID_LOG_SILENT
                   ? "VDIWEFS"[priority - ANDROID_LOG_VERBOSE]
                   : '?';
}

// Appends an entry with this thread's ID and the current time. Returns the number of bytes written
// or a negative errno value.
int AppendLogEntry(int priority, const char* tag, const char* text);

}  // namespace host
