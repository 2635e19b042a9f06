#include "platform/log_file.h"

#include <fcntl.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "platform/files.h"
#include "platform/trace.h"

namespace host {

namespace {

// Returns the bytes of a string and its terminator. The cast is safe: writev() only reads them.
iovec Bytes(const char* text) { return {const_cast<char*>(text), strlen(text) + 1}; }

}  // namespace

int AppendLogEntry(int priority, const char* tag, const char* text) {
    static const int log = OpenForAppending(kLogFile, O_CREAT);
    const char letter = LogPriorityLetter(priority);
    TraceEvent("log").Add("priority", {&letter, 1}).Add("tag", tag).Add("text", text);

    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    auto level = static_cast<uint8_t>(priority);
    LogEntryHeader header = {0, getpid(), static_cast<int32_t>(syscall(SYS_gettid)),
                             static_cast<uint32_t>(now.tv_sec), static_cast<uint32_t>(now.tv_nsec)};
    const iovec parts[] = {
            {&header, sizeof(header)}, {&level, sizeof(level)}, Bytes(tag), Bytes(text)};
    header.size = static_cast<uint32_t>(parts[1].iov_len + parts[2].iov_len + parts[3].iov_len);
    // A single write, because other processes append, too.
    const ssize_t written = writev(log, parts, std::size(parts));
    return written < 0 ? -errno : static_cast<int>(written);
}

}  // namespace host
