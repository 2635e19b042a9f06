#include <android/log.h>

#include <fcntl.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <string>

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

// What stands in front of every line of an entry: date, time (UTC), process, thread, priority, tag.
std::string LineHead(int priority, const char* tag) {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    tm date = {};
    gmtime_r(&now.tv_sec, &date);
    const bool known = priority >= 0 && priority <= ANDROID_LOG_SILENT;
    char head[64];
    snprintf(head, sizeof(head), "%02d-%02d %02d:%02d:%02d.%03ld %5d %5d %c ", date.tm_mon + 1,
             date.tm_mday, date.tm_hour, date.tm_min, date.tm_sec, now.tv_nsec / 1000000, getpid(),
             static_cast<int>(syscall(SYS_gettid)), known ? kPriorityLetters[priority] : '?');
    return std::string(head) + (tag != nullptr ? tag : program_invocation_short_name) + ": ";
}

}  // namespace

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    static const int log = OpenLog();
    if (log < 0) {
        return -EBADF;
    }
    char text[kEntryBytes];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text, sizeof(text), format, args);
    va_end(args);
    if (length < 0) {
        return -EINVAL;
    }
    const std::string head = LineHead(priority, tag);
    std::string entry;
    for (const char* line = text; line == text || *line != '\0';) {
        const char* const end = strchrnul(line, '\n');
        entry.append(head).append(line, end).append("\n");
        line = *end != '\0' ? end + 1 : end;
    }
    // One append, so that the lines of other processes never come between or inside.
    const ssize_t written = write(log, entry.data(), entry.size());
    return written < 0 ? -errno : static_cast<int>(written);
}
