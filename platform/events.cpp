#include "platform/events.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>

#include "platform/device_root.h"
#include "platform/files.h"

namespace host {

namespace {

// Returns true if a recorder holds the lock on the trace file. Otherwise removes the file, unless
// another process has already done so: the name may then belong to a new recorder.
bool IsRecorded() {
    const UniqueFd trace = OpenFile(kTraceFile, O_RDONLY);
    if (!trace.ok()) {
        return false;
    }
    if (flock(trace.get(), LOCK_EX | LOCK_NB) != 0) {
        return errno == EWOULDBLOCK;
    }
    struct stat status = {};
    if (fstat(trace.get(), &status) == 0 && status.st_nlink > 0) {
        RemoveFile(kTraceFile);
    }
    return false;
}

// Whether tracing was on at the last check.
std::atomic<bool>& Tracing() {
    static std::atomic<bool> tracing{IsRecorded()};
    return tracing;
}

// Opens a regular file for appending. A write to a pipe without a reader would kill the process.
UniqueFd OpenForAppending(const char* name, int flags) {
    UniqueFd file = OpenFile(name, O_WRONLY | O_APPEND | flags);
    struct stat status = {};
    if (file.ok() && (fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode))) {
        file.reset();
        errno = EINVAL;
    }
    return file;
}

}  // namespace

bool IsTraced() { return Tracing(); }

void UpdateTracing() { Tracing() = IsRecorded(); }

int WriteLog(int priority, std::string_view tag, std::string_view text) {
    static const int log = OpenForAppending(kLogFile, O_CREAT).release();
    Event event("log", true);
    event.Add("priority", static_cast<uint8_t>(priority))
            .Add("tag", tag.substr(0, kMaxLogText))
            .Add("text", text.substr(0, kMaxLogText));
    return event.AppendTo(log);
}

Event::Event(const char* what, bool isLogged) {
    if (IsTraced() || isLogged) {
        const auto now = std::chrono::system_clock::now().time_since_epoch();
        mLine = "{\"time\":" + std::to_string(std::chrono::duration<double>(now).count());
        Add("pid", getpid()).Add("tid", syscall(SYS_gettid));
        Add("who", program_invocation_short_name).Add("what", what);
    }
}

Event::~Event() {
    if (mLine.empty() || !IsTraced()) {
        return;
    }
    const int error = errno;
    // Reopened for every event, because the file may have been removed.
    const UniqueFd trace = OpenForAppending(kTraceFile, 0);
    if (AppendTo(trace.get()) < 0) {
        fchmod(trace.get(), S_IRUSR);
        Tracing() = false;
    }
    errno = error;
}

// Returns the number of bytes written or a negative errno value.
int Event::AppendTo(int file) const {
    const std::string line = mLine + "}\n";
    const ssize_t written = write(file, line.data(), line.size());
    if (written < 0) {
        return -errno;
    }
    return written == static_cast<ssize_t>(line.size()) ? static_cast<int>(written) : -ENOSPC;
}

Event& Event::Add(const char* name, std::string_view value) {
    if (mLine.empty()) {
        return *this;
    }
    mLine.append(",\"").append(name).append("\":\"");
    for (const char c : value) {
        const auto byte = static_cast<unsigned char>(c);
        if (c == '"' || c == '\\') {
            mLine.append({'\\', c});
        } else if (c >= ' ' && c <= '~') {
            mLine += c;
        } else {
            constexpr char kHexDigits[] = "0123456789abcdef";
            mLine.append("\\u00").append({kHexDigits[byte >> 4], kHexDigits[byte & 0xF]});
        }
    }
    mLine += '"';
    return *this;
}

Event& Event::Add(const char* name, int64_t value) {
    if (!mLine.empty()) {
        mLine.append(",\"").append(name).append("\":").append(std::to_string(value));
    }
    return *this;
}

}  // namespace host
