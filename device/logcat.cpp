#include "logcat.h"

#include <fcntl.h>
#include <getopt.h>
#include <strings.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <map>
#include <set>
#include <string>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/log_entry.h"

namespace device {

namespace {

constexpr timespec kFollowPause = {0, 50'000'000};
constexpr uint32_t kMaxEntryBytes = 1 << 20;  // what is longer is no entry
constexpr size_t kTagWidth = 8;               // columns, as on a device
constexpr char kOtherTags[] = "*";

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
    std::map<std::string, int> filters = {{kOtherTags, ANDROID_LOG_VERBOSE}};  // lowest shown
};

bool AddFilter(const std::string& filter, Options& options) {
    const size_t colon = std::min(filter.rfind(':'), filter.length());
    const std::string letter = colon < filter.length() ? filter.substr(colon + 1) : "V";
    int priority = ANDROID_LOG_VERBOSE;
    while (priority <= ANDROID_LOG_SILENT &&
           strcasecmp(letter.c_str(), std::string(1, host::LogPriorityLetter(priority)).c_str())) {
        ++priority;
    }
    options.filters[filter.substr(0, colon)] = priority;
    return colon > 0 && priority <= ANDROID_LOG_SILENT;
}

// False for wrong use.
bool ParseOptions(int argc, char** argv, Options& options) {
    const std::set<std::string> formats = {"threadtime", "brief", "epoch", "raw"};
    char* end = argv[0] + strlen(argv[0]);
    for (int option = 0; (option = getopt(argc, argv, "dct:f:sv:")) != -1;) {
        options.clears |= option == 'c';
        options.follows &= option != 'd' && option != 't';
        if (option == 't') {
            options.last = strtoul(optarg, &end, 10);
        } else if (option == 'f') {
            options.file = optarg;
        } else if (option == 's') {
            options.filters[kOtherTags] = ANDROID_LOG_SILENT;
        } else if (option == 'v') {
            options.format = optarg;
        }
        if (option == '?' || *end != '\0' || end == optarg || formats.count(options.format) == 0) {
            return false;
        }
    }
    return std::all_of(argv + optind, argv + argc,
                       [&options](const char* filter) { return AddFilter(filter, options); });
}

bool IsShown(const Entry& entry, const Options& options) {
    const auto filter = options.filters.find(entry.tag);
    const int lowest =
            filter != options.filters.end() ? filter->second : options.filters.at(kOtherTags);
    return entry.priority >= lowest && lowest != ANDROID_LOG_SILENT;
}

// What stands before each line of the entry.
std::string LineHeader(const Entry& entry, const std::string& format) {
    const host::LogEntryHeader& header = entry.header;
    const std::string tag =
            entry.tag + std::string(kTagWidth - std::min(kTagWidth, entry.tag.length()), ' ');
    const char letter = host::LogPriorityLetter(entry.priority);
    char fields[96] = "";
    char when[32] = "";
    if (format == "raw") {
        return "";
    }
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
    const std::string header = LineHeader(entry, options.format);
    size_t begin = 0;
    do {
        const size_t end = std::min(entry.text.find('\n', begin), entry.text.length());
        printf("%s%s\n", header.c_str(), entry.text.substr(begin, end - begin).c_str());
        begin = end + 1;
    } while (begin < entry.text.length());
}

// Reads the entry at `offset` and moves that behind it. False when there is no whole one yet. A log
// that was emptied meanwhile is read from its beginning.
bool ReadEntry(int log, off_t& offset, Entry& entry) {
    struct stat status = {};
    if (fstat(log, &status) == 0 && status.st_size < offset) {
        offset = 0;
    }
    constexpr ssize_t kHeaderBytes = sizeof(entry.header);
    if (pread(log, &entry.header, kHeaderBytes, offset) != kHeaderBytes ||
        entry.header.size > kMaxEntryBytes) {
        return false;
    }
    const ssize_t size = entry.header.size;
    // Two more zeros end whatever a damaged entry does not.
    std::string content(static_cast<size_t>(size) + 2, '\0');
    if (pread(log, content.data(), static_cast<size_t>(size), offset + kHeaderBytes) != size) {
        return false;
    }
    offset += kHeaderBytes + size;
    entry.priority = content[0];
    entry.tag = content.c_str() + 1;
    entry.text = content.c_str() + std::min(content.size() - 1, 2 + entry.tag.length());
    return true;
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
    const int log = openat(host::DeviceRoot(), host::kLogFile,
                           O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (log < 0) {
        return Fail("no log");
    }
    if (options.file != nullptr && freopen(options.file, "a", stdout) == nullptr) {
        return Fail(options.file);
    }
    off_t offset = 0;
    do {
        std::deque<Entry> entries;
        for (Entry entry = {}; ReadEntry(log, offset, entry);) {
            if (IsShown(entry, options)) {
                entries.push_back(entry);
            }
            if (entries.size() > options.last) {
                entries.pop_front();
            }
        }
        for (const Entry& entry : entries) {
            Print(entry, options);
        }
    } while (fflush(stdout) == 0 && options.follows && nanosleep(&kFollowPause, nullptr) == 0);
    return 0;
}

}  // namespace device
