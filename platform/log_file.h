// An entry of the device's log, which is the file `log` in the device root: this header, then
// `size` bytes with the priority (one byte), the tag and the text, both with a terminating zero.
// Writers append an entry in one call.
#pragma once

#include <android/log.h>

#include <cstddef>
#include <cstdint>

#include "platform/files.h"

namespace host {

constexpr size_t kMaxLogText = 1023;  // bytes of a text before its terminator, as on a device

// In the machine's byte order.
struct LogEntryHeader {
    uint32_t size;
    int32_t pid;
    int32_t tid;
    uint32_t seconds;  // since 1970-01-01 UTC
    uint32_t nanoseconds;
};

// The letter that readers show for a priority; '?' for an unknown one.
constexpr char LogPriorityLetter(int priority) {
    return priority >= ANDROID_LOG_VERBOSE && priority <= ANDROID_LOG_SILENT
                   ? "VDIWEFS"[priority - ANDROID_LOG_VERBOSE]
                   : '?';
}

// Appends an entry of this thread, time-stamped now. Returns the number of bytes written or a
// negative errno value.
int AppendLogEntry(int priority, const char* tag, const char* text);

}  // namespace host
