#include <android/log.h>

#include <fcntl.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <mutex>
#include <string>

#include "device_root.h"

namespace {

constexpr size_t kEntryBytes = 1024;   // with the terminator, as on the device
constexpr size_t kStreamBytes = 1024;  // gathered before an entry takes them
constexpr char kPriorityLetters[] = "??VDIWEFS";

int OpenLog() {
    const int root = host::DeviceRoot();
    if (root < 0) {
        return -1;
    }
    return openat(root, "log", O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                  0600);
}

struct Date {
    unsigned month;
    unsigned day;
};

// The date, from 1 to 12 and from 1 to 31, that many days after 1970-01-01. The C library's own
// answer costs a process the reading of the machine's time zone, which UTC has no use for.
Date MonthAndDay(int64_t days) {
    constexpr int64_t kDays400Years = 146097;
    constexpr int64_t kDaysCentury = 36524;
    constexpr int64_t kDays4Years = 1461;
    constexpr int64_t kDaysYear = 365;
    constexpr int64_t kMarch2000 = 11017;  // years from March on have their leap day at the end
    constexpr unsigned kMonthDays[] = {31, 30, 31, 30, 31, 31, 30, 31, 30, 31, 31, 29};
    int64_t left = (days - kMarch2000 + kDays400Years) % kDays400Years;
    left -= std::min<int64_t>(left / kDaysCentury, 3) * kDaysCentury;
    left %= kDays4Years;
    left -= std::min<int64_t>(left / kDaysYear, 3) * kDaysYear;
    unsigned month = 0;
    auto day = static_cast<unsigned>(left);
    while (day >= kMonthDays[month]) {
        day -= kMonthDays[month++];
    }
    return {(month + 2) % 12 + 1, day + 1};
}

void AppendNumber(std::string& text, int64_t value, size_t width, char fill) {
    char digits[24];
    const char* const end = std::to_chars(digits, digits + sizeof(digits), value).ptr;
    const auto length = static_cast<size_t>(end - digits);
    text.append(std::max(width, length) - length, fill).append(digits, length);
}

// What stands in front of every line of an entry: date, time (UTC), process, thread, priority, tag.
std::string LineHead(int priority, const char* tag) {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    const Date date = MonthAndDay(now.tv_sec / 86400);
    const struct {
        int64_t value;
        size_t width;
        char fill;
        char after;
    } fields[] = {
            {date.month, 2, '0', '-'},
            {date.day, 2, '0', ' '},
            {now.tv_sec / 3600 % 24, 2, '0', ':'},
            {now.tv_sec / 60 % 60, 2, '0', ':'},
            {now.tv_sec % 60, 2, '0', '.'},
            {now.tv_nsec / 1000000, 3, '0', ' '},
            {getpid(), 5, ' ', ' '},
            {syscall(SYS_gettid), 5, ' ', ' '},
    };
    std::string head;
    for (const auto& field : fields) {
        AppendNumber(head, field.value, field.width, field.fill);
        head += field.after;
    }
    const bool known = priority >= 0 && priority <= ANDROID_LOG_SILENT;
    head += known ? kPriorityLetters[priority] : '?';
    return head.append(" ").append(tag != nullptr ? tag : program_invocation_short_name) + ": ";
}

// Formats the texts of entries and drops what is beyond their size. Formatting straight into an
// array, the C library goes through all that does not fit byte by byte.
class EntryStream {
  public:
    EntryStream() : mStream(fopencookie(this, "w", {nullptr, Take, nullptr, nullptr})) {
        if (mStream != nullptr) {
            setvbuf(mStream, mBuffer, _IOFBF, sizeof(mBuffer));
        }
    }

    // Whether `text`, of kEntryBytes, holds the formatted text now.
    bool Format(char* text, const char* format, va_list args) {
        const std::lock_guard<std::mutex> lock(mMutex);
        mText = text;
        mLength = 0;
        const bool formatted =
                mStream != nullptr && vfprintf(mStream, format, args) >= 0 && fflush(mStream) == 0;
        text[mLength] = '\0';
        return formatted;
    }

  private:
    static ssize_t Take(void* stream, const char* bytes, size_t size) {
        auto* const self = static_cast<EntryStream*>(stream);
        const size_t taken = std::min(size, kEntryBytes - 1 - self->mLength);
        memcpy(self->mText + self->mLength, bytes, taken);
        self->mLength += taken;
        return static_cast<ssize_t>(size);
    }

    std::mutex mMutex;
    FILE* const mStream;
    char mBuffer[kStreamBytes];
    char* mText = nullptr;
    size_t mLength = 0;
};

}  // namespace

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    static const int log = OpenLog();
    if (log < 0) {
        return -EBADF;
    }
    static EntryStream stream;
    char text[kEntryBytes];
    va_list args;
    va_start(args, format);
    const bool formatted = stream.Format(text, format, args);
    va_end(args);
    if (!formatted) {
        return -EINVAL;
    }
    const std::string head = LineHead(priority, tag);
    std::string entry;
    entry.reserve(head.length() + strlen(text) + 1);
    for (const char* line = text; line == text || *line != '\0';) {
        const char* const end = strchrnul(line, '\n');
        entry.append(head).append(line, end).append("\n");
        line = *end != '\0' ? end + 1 : end;
    }
    // One append, so that the lines of other processes never come between or inside.
    const ssize_t written = write(log, entry.data(), entry.size());
    return written < 0 ? -errno : static_cast<int>(written);
}
