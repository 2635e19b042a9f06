// The device's shell commands in one program, which is found by the name that it is called by. They
// use the platform's own calls, so that the rules for names, sizes and access are one set.
#include <getopt.h>
#include <limits.h>
#include <poll.h>
#include <strings.h>
#include <sys/system_properties.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <fstream>
#include <map>
#include <set>
#include <string>

#include "common.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/log_file.h"

namespace {

constexpr int kWrongUse = -1;
constexpr int kFollowPauseMs = 50;
constexpr char kOtherTags[] = "*";

int Fail(const char* what) {
    fprintf(stderr, "%s: %s: %s\n", program_invocation_short_name, what, strerror(errno));
    return 1;
}

int Getprop(int argc, char** argv) {
    if (argc == 2) {
        puts(device::GetProperty(argv[1]).c_str());
        return 0;
    }
    for (const std::string& name : device::FilesIn("properties")) {
        printf("[%s]: [%s]\n", name.c_str(), device::GetProperty(name.c_str()).c_str());
    }
    return 0;
}

int Setprop(int /* argc */, char** argv) {
    const char* const name = argv[1];
    const std::string value = argv[2];
    // The value that the property has already is no change: init would act on it.
    if ((!value.empty() && device::GetProperty(name) == value) ||
        __system_property_set(name, value.c_str()) == 0) {
        return 0;
    }
    fprintf(stderr, "Failed to set property '%s' to '%s'.\n", name, value.c_str());
    return 1;
}

int Getenforce(int /* argc */, char** /* argv */) {
    puts(device::SelinuxMode().c_str());
    return 0;
}

int Setenforce(int /* argc */, char** argv) {
    const std::string mode = argv[1];
    const bool isPermissive = mode == "0" || strcasecmp(mode.c_str(), "permissive") == 0;
    if (!isPermissive && mode != "1" && strcasecmp(mode.c_str(), "enforcing") != 0) {
        return kWrongUse;
    }
    return host::ReplaceFile("selinux", isPermissive ? "Permissive" : "Enforcing")
                   ? 0
                   : Fail("cannot set the mode");
}

int Settings(int argc, char** argv) {
    const std::string verb = argv[1];
    const std::string space = argv[2];
    const std::string key = argc > 3 ? argv[3] : "";
    const std::string folder = "settings/" + space + "/";
    const std::string path = folder + key;
    if ((space != "system" && space != "secure" && space != "global") || key[0] == '.' ||
        (argc > 3 && key.empty()) || key.find('/') != std::string::npos) {
        return kWrongUse;
    }
    if (verb == "list" && argc == 3) {
        for (const std::string& name : device::FilesIn(folder)) {
            printf("%s=%s\n", name.c_str(), device::ReadText(folder + name, "null").c_str());
        }
    } else if (verb == "get" && argc == 4) {
        puts(device::ReadText(path, "null").c_str());
    } else if (verb == "delete" && argc == 4) {
        printf("Deleted %d rows\n", unlinkat(host::DeviceRoot(), path.c_str(), 0) == 0 ? 1 : 0);
    } else if (verb == "put" && argc == 5) {
        return host::ReplaceFile(path, argv[4]) ? 0 : Fail("cannot store the setting");
    } else {
        return kWrongUse;
    }
    return 0;
}

struct LogEntry {
    host::LogEntryHeader header;
    int priority;
    std::string tag;
    std::string text;
};

using LogFilters = std::map<std::string, int>;  // the lowest priority that is shown of a tag

bool AddLogFilter(const std::string& filter, LogFilters& filters) {
    const size_t colon = filter.rfind(':');
    const std::string letter = colon == std::string::npos ? "V" : filter.substr(colon + 1);
    for (int priority = ANDROID_LOG_VERBOSE; priority <= ANDROID_LOG_SILENT; ++priority) {
        if (letter.length() == 1 && toupper(letter[0]) == host::LogPriorityLetter(priority)) {
            filters[filter.substr(0, colon)] = priority;
            return colon != 0;
        }
    }
    return false;
}

bool IsShown(const LogEntry& entry, const LogFilters& filters) {
    const auto filter = filters.find(entry.tag);
    const int lowest = filter != filters.end() ? filter->second : filters.at(kOtherTags);
    return entry.priority >= lowest && lowest != ANDROID_LOG_SILENT;
}

// Reads the next entry. Without a whole one, stays where it is; a log that was emptied meanwhile is
// read from its beginning.
bool ReadLogEntry(std::ifstream& log, LogEntry& entry) {
    const std::streamoff begin = log.tellg();
    log.read(reinterpret_cast<char*>(&entry.header), sizeof(entry.header));
    entry.priority = log.get();
    std::getline(std::getline(log, entry.tag, '\0'), entry.text, '\0');
    if (log.good()) {
        return true;
    }
    log.clear();
    const std::streamoff end = log.seekg(0, std::ios::end).tellg();
    log.seekg(end < begin ? 0 : begin);
    return false;
}

void PrintLogHeader(const LogEntry& entry, const std::string& format) {
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
    } else if (format == "brief") {
        printf("%c/%-8s(%5d): ", letter, tag, header.pid);
    }
}

// An entry of several lines is shown as several lines with the same header.
void PrintLogEntry(const LogEntry& entry, const std::string& format) {
    size_t begin = 0;
    do {
        const size_t end = std::min(entry.text.find('\n', begin), entry.text.length());
        PrintLogHeader(entry, format);
        puts(entry.text.substr(begin, end - begin).c_str());
        begin = end + 1;
    } while (begin < entry.text.length());
}

// Prints what was logged since the last call, but not more than the last `count` entries.
void PrintLog(std::ifstream& log, const LogFilters& filters, const std::string& format,
              size_t count) {
    std::deque<LogEntry> entries;
    for (LogEntry entry = {}; ReadLogEntry(log, entry);) {
        if (IsShown(entry, filters)) {
            entries.push_back(entry);
        }
        if (entries.size() > count) {
            entries.pop_front();
        }
    }
    for (const LogEntry& entry : entries) {
        PrintLogEntry(entry, format);
    }
}

int Logcat(int argc, char** argv) {
    bool follows = true;
    bool clears = false;
    size_t count = SIZE_MAX;
    const char* file = nullptr;
    std::string format = "threadtime";
    LogFilters filters = {{kOtherTags, ANDROID_LOG_VERBOSE}};
    bool isRight = true;
    for (int option = 0; (option = getopt(argc, argv, "cdf:st:v:")) != -1;) {
        isRight &= option != '?';
        clears |= option == 'c';
        follows &= option != 'd' && option != 't';
        file = option == 'f' ? optarg : file;
        format = option == 'v' ? optarg : format;
        if (option == 't') {
            isRight &= device::IsNumberWithin(optarg, 1, INT64_MAX);
            count = strtoul(optarg, nullptr, 10);
        }
        if (option == 's') {
            filters[kOtherTags] = ANDROID_LOG_SILENT;
        }
    }
    const std::set<std::string> formats = {"threadtime", "brief", "epoch", "raw"};
    isRight &= formats.count(format) > 0;
    for (; optind < argc; ++optind) {
        isRight &= AddLogFilter(argv[optind], filters);
    }
    if (!isRight) {
        return kWrongUse;
    }
    if (clears) {
        return host::WriteFile(host::kLogFile, "") ? 0 : Fail("cannot empty the log");
    }
    // What nobody can log to is no log. A FIFO, for example, would never end.
    const int writable = host::OpenForAppending(host::kLogFile, 0);
    if (writable < 0) {
        return Fail("no log");
    }
    close(writable);
    std::ifstream log(host::DeviceRootPath() + "/" + host::kLogFile, std::ios::binary);
    if (file != nullptr && freopen(file, "a", stdout) == nullptr) {
        return Fail(file);
    }
    pollfd output = {STDOUT_FILENO, 0, 0};  // ready when its reader goes
    do {
        PrintLog(log, filters, format, count);
    } while (fflush(stdout) == 0 && follows && poll(&output, 1, kFollowPauseMs) == 0);
    return 0;
}

constexpr struct {
    const char* name;
    int minArguments;  // with the name
    int maxArguments;
    int (*run)(int argc, char** argv);
    const char* arguments;
} kCommands[] = {
        {"getenforce", 1, 1, Getenforce, ""},
        {"getprop", 1, 2, Getprop, "[NAME]"},
        {"logcat", 1, INT_MAX, Logcat,
         "[-d] [-c] [-t COUNT] [-f FILE] [-s] [-v threadtime|brief|epoch|raw]\n"
         "              [TAG[:V|D|I|W|E|F|S]...]   tag * is for all others"},
        {"setenforce", 2, 2, Setenforce, "enforcing|permissive|1|0"},
        {"setprop", 3, 3, Setprop, "NAME VALUE"},
        {"settings", 3, 5, Settings, "put|get|delete|list system|secure|global [KEY [VALUE]]"},
};

}  // namespace

int main(int argc, char** argv) {
    signal(SIGPIPE, SIG_IGN);
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    for (const auto& command : kCommands) {
        if (strcmp(program_invocation_short_name, command.name) != 0) {
            continue;
        }
        const bool isRight = argc >= command.minArguments && argc <= command.maxArguments;
        const int status = isRight ? command.run(argc, argv) : kWrongUse;
        if (status == kWrongUse) {
            fprintf(stderr, "usage: %s %s\n", command.name, command.arguments);
            return 1;
        }
        // A reader that has gone needs nothing more and is no error.
        const bool isWritten = fflush(stdout) == 0 && ferror(stdout) == 0;
        return isWritten || errno == EPIPE ? status : Fail("cannot write");
    }
    fputs("toolbox: run it by the name of one of its commands\n", stderr);
    return 1;
}
