#include <android/log.h>

#include <fcntl.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <utility>

#include "device_root.h"

namespace {

constexpr size_t kEntryBytes = 1024;  // with the terminator, as on the device
constexpr char kPriorityLetters[] = "??VDIWEFS";

int OpenLog() {
    const int root = host::DeviceRoot();
    if (root < 0) {
        return -1;
    }
    return openat(root, "log", O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                  0600);
}

// Month and day, from 1, of a day counted from 1970-01-01. The C library's gmtime_r would read the
// machine's time zone first: seven system calls, which UTC has no use for.
std::pair<int, int> MonthAndDay(int64_t day) {
    int year = 1970;
    const auto leapDay = [&year] {
        return year % 4 == 0 && (year % 100 != 0 || year % 400 == 0) ? 1 : 0;
    };
    for (; day >= 365 + leapDay(); ++year) {
        day -= 365 + leapDay();
    }
    const int lengths[] = {31, 28 + leapDay(), 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
    int month = 0;
    while (day >= lengths[month]) {
        day -= lengths[month++];
    }
    return {month + 1, static_cast<int>(day) + 1};
}

// What stands in front of every line of an entry: date, time (UTC), process, thread, priority, tag.
std::string LineHead(int priority, const char* tag) {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    const auto [month, day] = MonthAndDay(now.tv_sec / 86400);
    const auto second = static_cast<int>(now.tv_sec % 86400);
    const bool known = priority >= 0 && priority <= ANDROID_LOG_SILENT;
    char head[96];
    snprintf(head, sizeof(head), "%02d-%02d %02d:%02d:%02d.%03ld %5d %5d %c ", month, day,
             second / 3600, second / 60 % 60, second % 60, now.tv_nsec / 1000000, getpid(),
             static_cast<int>(syscall(SYS_gettid)), known ? kPriorityLetters[priority] : '?');
    return std::string(head) + (tag != nullptr ? tag : program_invocation_short_name) + ": ";
}

// What an entry keeps of its text. A stream hands the rest over in large pieces to be dropped,
// where vsnprintf goes through it byte by byte and vasprintf copies it: half the time of a large
// reply.
struct EntryText {
    char bytes[kEntryBytes];
    size_t length;
};

ssize_t Keep(void* entryText, const char* bytes, size_t size) {
    auto* const text = static_cast<EntryText*>(entryText);
    const size_t kept = std::min(size, kEntryBytes - 1 - text->length);
    memcpy(text->bytes + text->length, bytes, kept);
    text->length += kept;
    return static_cast<ssize_t>(size);
}

}  // namespace

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    static const int log = OpenLog();
    static EntryText text;  // for the holder of the stream's lock
    static FILE* const stream = fopencookie(&text, "w", {nullptr, Keep, nullptr, nullptr});
    if (log < 0 || stream == nullptr) {
        return -EBADF;
    }
    const std::string head = LineHead(priority, tag);
    std::string entry;
    flockfile(stream);
    text.length = 0;
    va_list args;
    va_start(args, format);
    const bool formatted = vfprintf(stream, format, args) >= 0 && fflush(stream) == 0;
    va_end(args);
    text.bytes[text.length] = '\0';
    for (const char* line = text.bytes; line == text.bytes || *line != '\0';) {
        const char* const end = strchrnul(line, '\n');
        entry.append(head).append(line, end).append("\n");
        line = *end != '\0' ? end + 1 : end;
    }
    funlockfile(stream);
    if (!formatted) {
        return -EINVAL;
    }
    // One append, so that the lines of other processes never come between or inside.
    const ssize_t written = write(log, entry.data(), entry.size());
    return written < 0 ? -errno : static_cast<int>(written);
}
