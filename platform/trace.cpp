#include "platform/trace.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>

#include "platform/device_root.h"
#include "platform/files.h"

namespace host {

namespace {

std::atomic<int> gTraced{-1};  // negative until the first check

constexpr char kHexDigits[] = "0123456789abcdef";

// Returns true if a recorder holds the lock on the trace file. Otherwise removes the file, unless
// another process has already done so: the name may then belong to a new recorder.
bool IsRecorded() {
    const UniqueFd trace = OpenFileAt(DeviceRoot(), kTraceFile, O_RDONLY);
    if (!trace.ok()) {
        return false;
    }
    if (flock(trace.get(), LOCK_EX | LOCK_NB) != 0) {
        return errno == EWOULDBLOCK;
    }
    struct stat status = {};
    if (fstat(trace.get(), &status) == 0 && status.st_nlink > 0) {
        unlinkat(DeviceRoot(), kTraceFile, 0);
    }
    return false;
}

}  // namespace

bool IsTraced() {
    if (gTraced < 0) {
        LookForTrace();
    }
    return gTraced == 1;
}

void LookForTrace() { gTraced = IsRecorded() ? 1 : 0; }

int64_t MonotonicUs() {
    return std::chrono::steady_clock::now().time_since_epoch() / std::chrono::microseconds(1);
}

TraceEvent::TraceEvent(const char* what) {
    const int error = errno;
    if (IsTraced()) {
        mLine = "{\"time\":" + std::to_string(static_cast<double>(MonotonicUs()) / 1e6);
        Add("pid", getpid()).Add("who", program_invocation_short_name).Add("what", what);
    }
    errno = error;
}

TraceEvent::~TraceEvent() {
    if (mLine.empty()) {
        return;
    }
    const int error = errno;
    mLine += "}\n";
    // Reopened for every event, because the file may have been removed.
    const UniqueFd file(OpenForAppending(kTraceFile, 0));
    const ssize_t written = write(file.get(), mLine.data(), mLine.size());
    if (written != static_cast<ssize_t>(mLine.size())) {
        fchmod(file.get(), S_IRUSR);
        gTraced = 0;
    }
    errno = error;
}

TraceEvent& TraceEvent::Add(const char* name, std::string_view value) {
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
            mLine.append("\\u00").append({kHexDigits[byte >> 4], kHexDigits[byte & 0xF]});
        }
    }
    mLine += '"';
    return *this;
}

TraceEvent& TraceEvent::Add(const char* name, int64_t value) {
    if (!mLine.empty()) {
        mLine.append(",\"").append(name).append("\":").append(std::to_string(value));
    }
    return *this;
}

TraceEvent& TraceEvent::AddHex(const char* name, const uint8_t* bytes, size_t size) {
    std::string digits;
    for (size_t i = 0; i < size && !mLine.empty(); ++i) {
        digits.append({kHexDigits[bytes[i] >> 4], kHexDigits[bytes[i] & 0xF]});
    }
    return Add(name, digits);
}

}  // namespace host
