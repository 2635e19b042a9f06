#include "logcat.h"

#include <fcntl.h>
#include <getopt.h>
#include <poll.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
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

constexpr int kFollowPauseMs = 50;
constexpr uint32_t kMaxEntryBytes = 1 << 20;  // what is longer is no entry
constexpr size_t kTagWidth = 8;               // columns, as on a device
constexpr char kOtherTags[] = "*";

constexpr char kUsage[] =
        "usage: logcat [-d] [-c] [-t COUNT] [-f FILE] [-s] [-v threadtime|brief|epoch|raw]\n"
        "              [TAG[:V|D|I|W|E|F|S]...]   tag * is for all others\n";

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

// The priority that readers show as this letter; ANDROID_LOG_UNKNOWN when there is none.
int PriorityOf(const std::string& letter) {
    for (int priority = ANDROID_LOG_SILENT; priority >= ANDROID_LOG_VERBOSE; --priority) {
        if (letter.length() == 1 && toupper(letter[0]) == host::LogPriorityLetter(priority)) {
            return priority;
        }
    }
    return ANDROID_LOG_UNKNOWN;
}

bool AddFilter(const std::string& filter, Options& options) {
    const size_t colon = filter.find_last_of(':');
    const std::string letter = colon == std::string::npos ? "V" : filter.substr(colon + 1);
    const int priority = PriorityOf(letter);
    options.filters[filter.substr(0, colon)] = priority;
    return colon != 0 && priority != ANDROID_LOG_UNKNOWN;
}

// False for wrong use.
bool ParseOptions(int argc, char** argv, Options& options) {
    const std::set<std::string> formats = {"threadtime", "brief", "epoch", "raw"};
    bool isRight = true;
    for (int option = 0; (option = getopt(argc, argv, "dct:f:sv:")) != -1;) {
        isRight &= option != '?';
        options.clears |= option == 'c';
        options.follows &= option != 'd' && option != 't';
        if (option == 't') {
            char* end = nullptr;
            options.last = strtoul(optarg, &end, 10);
            isRight &= isdigit(*optarg) != 0 && *end == '\0';
        } else if (option == 'f') {
            options.file = optarg;
        } else if (option == 's') {
            options.filters[kOtherTags] = ANDROID_LOG_SILENT;
        } else if (option == 'v') {
            options.format = optarg;
            isRight &= formats.count(options.format) > 0;
        }
    }
    return isRight && std::all_of(argv + optind, argv + argc, [&options](const char* filter) {
               return AddFilter(filter, options);
           });
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
    const char letter = host::LogPriorityLetter(entry.priority);
    const std::string padding(kTagWidth - std::min(kTagWidth, entry.tag.length()), ' ');
    char fields[96] = "";
    char when[32] = "";
    if (format == "raw") {
        return "";
    }
    if (format == "brief") {
        snprintf(fields, sizeof(fields), "(%5d): ", header.pid);
        return std::string{letter, '/'} + entry.tag + padding + fields;
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
    return fields + entry.tag + padding + ": ";
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
    entry.priority = static_cast<unsigned char>(content[0]);
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
    pollfd output = {STDOUT_FILENO, 0, 0};  // ready when its reader goes
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
    } while (fflush(stdout) == 0 && options.follows && poll(&output, 1, kFollowPauseMs) == 0);
    return 0;
}

}  // namespace device
