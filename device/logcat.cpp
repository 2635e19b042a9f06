#include "logcat.h"

#include <fcntl.h>
#include <getopt.h>
#include <poll.h>
#include <regex.h>
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
#include <memory>
#include <optional>
#include <set>
#include <sstream>
#include <string>

#include "common.h"
#include "platform/files.h"
#include "platform/log_file.h"
#include "platform/unique_fd.h"

namespace device {

namespace {

constexpr int kFollowPauseMs = 50;
constexpr char kOtherTags[] = "*";

struct LogEntry {
    host::LogEntryHeader header;
    int priority;
    std::string tag;
    std::string text;
};

struct FreePattern {
    void operator()(regex_t* pattern) const {
        regfree(pattern);
        delete pattern;
    }
};

struct Options {
    bool follow = true;
    bool clear = false;
    size_t count = SIZE_MAX;
    const char* file = nullptr;
    std::string format = "threadtime";
    std::optional<int64_t> pid;
    std::unique_ptr<regex_t, FreePattern> pattern;
    // The lowest priority to show for each tag.
    std::map<std::string, int> filters = {{kOtherTags, ANDROID_LOG_VERBOSE}};
};

// Adds a filter TAG[:PRIORITY]. False when it is invalid.
bool AddFilter(const std::string& filter, Options& options) {
    const size_t colon = filter.rfind(':');
    const int priority = PriorityOf(colon == std::string::npos ? "V" : filter.substr(colon + 1));
    options.filters[filter.substr(0, colon)] = priority;
    return priority >= 0 && colon != 0;
}

// Whether the comma-separated names are all known buffers. They share one log.
bool AreBuffers(const std::string& names) {
    const std::set<std::string> buffers = {"all",    "crash", "default", "events",
                                           "kernel", "main",  "radio",   "system"};
    std::istringstream list(names);
    std::string name;
    bool known = !names.empty();
    while (std::getline(list, name, ',')) {
        known = known && buffers.count(name) > 0;
    }
    return known;
}

bool IsFormat(const std::string& name) {
    const std::set<std::string> formats = {"brief", "epoch", "raw", "tag", "threadtime", "time"};
    return formats.count(name) > 0;
}

// False when an option or a filter is invalid.
bool ParseOptions(int argc, char** argv, Options& options) {
    const option kLongOptions[] = {{"pid", required_argument, nullptr, 'p'},
                                   {"regex", required_argument, nullptr, 'e'},
                                   {nullptr, 0, nullptr, 0}};
    bool valid = true;
    for (int name = 0;
         valid && (name = getopt_long(argc, argv, "b:cde:f:st:v:", kLongOptions, nullptr)) != -1;) {
        switch (name) {
            case 'b':
                valid = AreBuffers(optarg);
                break;
            case 'c':
                options.clear = true;
                break;
            case 'd':
                options.follow = false;
                break;
            case 'e':
                options.pattern.reset(new regex_t());
                valid = regcomp(options.pattern.get(), optarg, REG_EXTENDED | REG_NOSUB) == 0;
                break;
            case 'f':
                options.file = optarg;
                break;
            case 'p':
                options.pid = strtoll(optarg, nullptr, 10);
                valid = IsNumberWithin(optarg, 1, INT32_MAX);
                break;
            case 's':
                options.filters[kOtherTags] = ANDROID_LOG_SILENT;
                break;
            case 't':
                options.follow = false;
                options.count = strtoul(optarg, nullptr, 10);
                valid = IsNumberWithin(optarg, 1, INT64_MAX);
                break;
            case 'v':
                options.format = optarg;
                valid = IsFormat(optarg);
                break;
            default:
                valid = false;
        }
    }
    for (; valid && optind < argc; ++optind) {
        valid = AddFilter(argv[optind], options);
    }
    return valid;
}

bool IsShown(const LogEntry& entry, const Options& options) {
    const auto filter = options.filters.find(entry.tag);
    const int lowest =
            filter != options.filters.end() ? filter->second : options.filters.at(kOtherTags);
    const bool passesFilter = entry.priority >= lowest && lowest != ANDROID_LOG_SILENT;
    const bool isOfProcess = !options.pid || *options.pid == entry.header.pid;
    return passesFilter && isOfProcess &&
           (!options.pattern ||
            regexec(options.pattern.get(), entry.text.c_str(), 0, nullptr, 0) == 0);
}

class LogReader {
  public:
    // Returns false with errno set on failure.
    bool Open() {
        mLog = host::OpenFile(host::kLogFile, O_RDONLY);
        struct stat status = {};
        if (!mLog.ok() || fstat(mLog.get(), &status) != 0) {
            return false;
        }
        errno = EINVAL;
        return S_ISREG(status.st_mode);  // a FIFO has no end
    }

    // Restarts at the beginning when the log was cleared since the last call. Its first entry has
    // changed then, even if the log has grown past the old position.
    void RewindIfCleared() {
        host::LogEntryHeader first = {};
        const bool hasFirst = pread(mLog.get(), &first, sizeof(first), 0) == sizeof(first);
        if (!hasFirst || memcmp(&first, &mFirst, sizeof(first)) != 0) {
            mFirst = first;
            mNext = 0;
        }
    }

    // Reads the next entry. Returns false when there is no complete entry.
    bool Read(LogEntry& entry) {
        if (pread(mLog.get(), &entry.header, sizeof(entry.header), mNext) != sizeof(entry.header)) {
            return false;
        }
        const off_t body = mNext + static_cast<off_t>(sizeof(entry.header));
        struct stat status = {};
        fstat(mLog.get(), &status);
        const size_t size = entry.header.size;
        if (size < 3 || status.st_size - body < static_cast<off_t>(size)) {
            return false;
        }
        std::string bytes(size, '\0');
        if (pread(mLog.get(), bytes.data(), size, body) != static_cast<ssize_t>(size)) {
            return false;
        }
        entry.priority = static_cast<unsigned char>(bytes[0]);
        entry.tag = bytes.c_str() + 1;
        entry.text = bytes.c_str() + std::min(size - 1, entry.tag.length() + 2);
        mNext = body + static_cast<off_t>(size);
        return true;
    }

  private:
    host::UniqueFd mLog;
    host::LogEntryHeader mFirst = {};
    off_t mNext = 0;
};

void PrintHeader(const LogEntry& entry, const std::string& format) {
    const host::LogEntryHeader& header = entry.header;
    const char letter = host::LogPriorityLetter(entry.priority);
    const char* const tag = entry.tag.c_str();
    const time_t seconds = header.seconds;
    tm local = {};
    char when[32] = "";
    strftime(when, sizeof(when), "%m-%d %H:%M:%S", localtime_r(&seconds, &local));
    const unsigned ms = header.nanoseconds / 1000000;
    if (format == "threadtime") {
        printf("%s.%03u %5d %5d %c %-8s: ", when, ms, header.pid, header.tid, letter, tag);
    } else if (format == "epoch") {
        printf("%19u.%03u %5d %5d %c %-8s: ", header.seconds, ms, header.pid, header.tid, letter,
               tag);
    } else if (format == "time") {
        printf("%s.%03u %c/%-8s(%5d): ", when, ms, letter, tag, header.pid);
    } else if (format == "brief") {
        printf("%c/%-8s(%5d): ", letter, tag, header.pid);
    } else if (format == "tag") {
        printf("%c/%-8s: ", letter, tag);
    }
}

// Prints the header before every line of the entry.
void PrintEntry(const LogEntry& entry, const std::string& format) {
    size_t begin = 0;
    do {
        const size_t end = std::min(entry.text.find('\n', begin), entry.text.length());
        PrintHeader(entry, format);
        puts(entry.text.substr(begin, end - begin).c_str());
        begin = end + 1;
    } while (begin < entry.text.length());
}

// Prints the entries since the last call, at most the last `options.count`.
void PrintNewEntries(LogReader& log, const Options& options) {
    log.RewindIfCleared();
    std::deque<LogEntry> entries;
    for (LogEntry entry = {}; log.Read(entry);) {
        if (IsShown(entry, options)) {
            entries.push_back(entry);
        }
        if (entries.size() > options.count) {
            entries.pop_front();
        }
    }
    for (const LogEntry& entry : entries) {
        PrintEntry(entry, options.format);
    }
}

int Fail(const char* what) {
    fprintf(stderr, "logcat: %s: %s\n", what, strerror(errno));
    return 1;
}

}  // namespace

int PriorityOf(const std::string& letter) {
    for (int priority = ANDROID_LOG_VERBOSE; priority <= ANDROID_LOG_SILENT; ++priority) {
        if (letter.length() == 1 && toupper(letter[0]) == host::LogPriorityLetter(priority)) {
            return priority;
        }
    }
    return -1;
}

int Logcat(int argc, char** argv) {
    Options options;
    if (!ParseOptions(argc, argv, options)) {
        return kUsageError;
    }
    LogReader log;
    if (!log.Open()) {
        return Fail("cannot read the log");
    }
    if (options.clear) {
        return host::WriteFile(host::kLogFile, "") ? 0 : Fail("cannot clear the log");
    }
    if (options.file != nullptr && freopen(options.file, "a", stdout) == nullptr) {
        return Fail(options.file);
    }
    pollfd output = {STDOUT_FILENO, 0, 0};  // ready when the reader closes the pipe
    do {
        PrintNewEntries(log, options);
    } while (fflush(stdout) == 0 && options.follow && poll(&output, 1, kFollowPauseMs) == 0);
    return 0;
}

}  // namespace device
