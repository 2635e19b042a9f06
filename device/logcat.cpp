#include "logcat.h"

#include <android/log.h>
#include <fcntl.h>
#include <getopt.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <map>
#include <string>
#include <thread>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/log_entry.h"

namespace device {

namespace {

constexpr std::chrono::milliseconds kFollowPause(50);
// More than any entry has: a longer one is no entry.
constexpr size_t kMaxEntryBytes = 1 << 20;
constexpr size_t kTagWidth = 8;
constexpr char kAllTags[] = "*";

constexpr char kUsage[] =
        "usage: logcat [-d] [-c] [-t COUNT] [-f FILE] [-s] [-v FORMAT] [TAG[:PRIORITY]...]\n"
        "  -d  ends with the last entry instead of waiting for more\n"
        "  -c  empties the log and ends\n"
        "  -t  shows the last COUNT entries and ends\n"
        "  -f  appends to FILE instead of standard output\n"
        "  -s  shows only what a filter lets through\n"
        "  -v  threadtime (the default), brief, epoch or raw\n"
        "PRIORITY: the lowest to show, V D I W E F, or S for none. TAG *: all others.\n";

struct Entry {
    host::LogEntryHeader header;
    int priority;
    std::string tag;
    std::string text;
};

struct Options {
    bool follows = true;
    bool clears = false;
    size_t last = SIZE_MAX;  // how many entries to begin with
    const char* file = nullptr;
    std::string format = "threadtime";
    std::map<std::string, int> filters = {{kAllTags, ANDROID_LOG_VERBOSE}};  // lowest shown
};

// The priority of the letter, or -1.
int PriorityOf(const std::string& letter) {
    for (int priority = ANDROID_LOG_VERBOSE; priority <= ANDROID_LOG_SILENT; ++priority) {
        if (letter.length() == 1 &&
            toupper(static_cast<unsigned char>(letter[0])) == host::LogPriorityLetter(priority)) {
            return priority;
        }
    }
    return -1;
}

bool AddFilter(const std::string& filter, Options& options) {
    const size_t colon = filter.rfind(':');
    const int priority = colon == std::string::npos ? static_cast<int>(ANDROID_LOG_VERBOSE)
                                                    : PriorityOf(filter.substr(colon + 1));
    options.filters[filter.substr(0, colon)] = priority;
    return priority >= 0 && colon != 0 && !filter.empty();
}

bool ParseCount(const char* text, size_t& count) {
    char* end = nullptr;
    errno = 0;
    count = strtoul(text, &end, 10);
    return isdigit(static_cast<unsigned char>(*text)) != 0 && *end == '\0' && errno == 0;
}

// False for wrong use.
bool ParseOptions(int argc, char** argv, Options& options) {
    for (int option = 0; (option = getopt(argc, argv, "dct:f:sv:")) != -1;) {
        switch (option) {
            case 'd':
                options.follows = false;
                break;
            case 'c':
                options.clears = true;
                break;
            case 't':
                options.follows = false;
                if (!ParseCount(optarg, options.last)) {
                    return false;
                }
                break;
            case 'f':
                options.file = optarg;
                break;
            case 's':
                options.filters[kAllTags] = ANDROID_LOG_SILENT;
                break;
            case 'v':
                options.format = optarg;
                if (options.format != "threadtime" && options.format != "brief" &&
                    options.format != "epoch" && options.format != "raw") {
                    return false;
                }
                break;
            default:
                return false;
        }
    }
    for (; optind < argc; ++optind) {
        if (!AddFilter(argv[optind], options)) {
            return false;
        }
    }
    return true;
}

bool IsShown(const Entry& entry, const Options& options) {
    auto filter = options.filters.find(entry.tag);
    if (filter == options.filters.end()) {
        filter = options.filters.find(kAllTags);
    }
    return entry.priority >= filter->second && filter->second != ANDROID_LOG_SILENT;
}

// What stands before each line of the entry.
std::string LineHeader(const Entry& entry, const std::string& format) {
    const host::LogEntryHeader& header = entry.header;
    const char letter = host::LogPriorityLetter(entry.priority);
    const std::string tag =
            entry.tag + std::string(kTagWidth - std::min(kTagWidth, entry.tag.length()), ' ');
    char fields[96] = "";
    char when[32] = "";
    if (format == "brief") {
        snprintf(fields, sizeof(fields), "(%5d): ", header.pid);
        return std::string{letter, '/'} + tag + fields;
    }
    if (format == "epoch") {
        snprintf(when, sizeof(when), "%19u", header.seconds);
    } else {
        const time_t seconds = header.seconds;
        tm local = {};
        localtime_r(&seconds, &local);
        strftime(when, sizeof(when), "%m-%d %H:%M:%S", &local);
    }
    snprintf(fields, sizeof(fields), "%s.%03u %5d %5d %c ", when, header.nanoseconds / 1000000,
             header.pid, header.tid, letter);
    return fields + tag + ": ";
}

// An entry of several lines is shown as several lines with the same header.
void Print(const Entry& entry, const Options& options) {
    const std::string header =
            options.format == "raw" ? std::string() : LineHeader(entry, options.format);
    size_t begin = 0;
    do {
        const size_t end = std::min(entry.text.find('\n', begin), entry.text.length());
        printf("%s%s\n", header.c_str(), entry.text.substr(begin, end - begin).c_str());
        begin = end + 1;
    } while (begin < entry.text.length());
}

class LogReader {
  public:
    LogReader()
        : mFile(openat(host::DeviceRoot(), host::kLogFile,
                       O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)) {}
    LogReader(const LogReader&) = delete;
    LogReader& operator=(const LogReader&) = delete;
    ~LogReader() { close(mFile); }

    bool IsOpen() const { return mFile >= 0; }

    // Whether there was a next entry. A log that was emptied meanwhile is read from its beginning.
    bool Next(Entry& entry) {
        if (lseek(mFile, 0, SEEK_END) < mOffset) {
            mOffset = 0;
        }
        host::LogEntryHeader& header = entry.header;
        if (pread(mFile, &header, sizeof(header), mOffset) != sizeof(header) ||
            header.size > kMaxEntryBytes) {
            return false;
        }
        std::string content(header.size, '\0');
        const off_t at = mOffset + static_cast<off_t>(sizeof(header));
        if (pread(mFile, content.data(), content.size(), at) !=
            static_cast<ssize_t>(content.size())) {
            return false;
        }
        mOffset = at + static_cast<off_t>(content.size());
        entry.priority = static_cast<unsigned char>(content[0]);
        entry.tag = content.c_str() + std::min<size_t>(1, content.size());
        entry.text = content.c_str() + std::min(2 + entry.tag.length(), content.size());
        return true;
    }

  private:
    const int mFile;
    off_t mOffset = 0;
};

void PrintLast(LogReader& log, const Options& options) {
    std::deque<Entry> last;
    for (Entry entry = {}; log.Next(entry);) {
        if (IsShown(entry, options)) {
            last.push_back(entry);
        }
        if (last.size() > options.last) {
            last.pop_front();
        }
    }
    for (const Entry& entry : last) {
        Print(entry, options);
    }
}

int Fail(const char* what) {
    fprintf(stderr, "logcat: %s: %s\n", what, strerror(errno));
    return 1;
}

}  // namespace

int Logcat(int argc, char** argv) {
    Options options;
    if (!ParseOptions(argc, argv, options)) {
        fputs(kUsage, stderr);
        return 1;
    }
    if (options.clears) {
        return host::WriteFile(host::kLogFile, "") ? 0 : Fail("cannot empty the log");
    }
    if (options.file != nullptr && freopen(options.file, "a", stdout) == nullptr) {
        return Fail(options.file);
    }
    LogReader log;
    if (!log.IsOpen()) {
        return Fail("no log");
    }
    PrintLast(log, options);
    while (options.follows && fflush(stdout) == 0) {
        std::this_thread::sleep_for(kFollowPause);
        for (Entry entry = {}; log.Next(entry);) {
            if (IsShown(entry, options)) {
                Print(entry, options);
            }
        }
    }
    return 0;
}

}  // namespace device
