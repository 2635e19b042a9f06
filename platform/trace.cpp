#include "trace.h"

#include <time.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cinttypes>
#include <cstdio>

#include "device_root.h"
#include "files.h"

namespace host {

namespace {

enum class Traced { kUnknown, kNo, kYes };
std::atomic<Traced> gTraced{Traced::kUnknown};

constexpr char kHexDigits[] = "0123456789abcdef";

}  // namespace

bool IsTraced() {
    if (gTraced == Traced::kUnknown) {
        LookForTrace();
    }
    return gTraced == Traced::kYes;
}

void LookForTrace() {
    const int root = DeviceRoot();
    const bool exists = root >= 0 && faccessat(root, kTraceFile, F_OK, 0) == 0;
    gTraced = exists ? Traced::kYes : Traced::kNo;
}

int64_t MonotonicUs() {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return int64_t{now.tv_sec} * 1000000 + now.tv_nsec / 1000;
}

TraceEvent::TraceEvent(const char* what) {
    const int error = errno;
    if (IsTraced()) {
        const int64_t now = MonotonicUs();
        char start[64];
        snprintf(start, sizeof(start), "{\"time\":%" PRId64 ".%06" PRId64, now / 1000000,
                 now % 1000000);
        mLine = start;
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
    // Opened for each event: whoever watches may be gone by now, and threads share no descriptor.
    const int file = OpenForAppending(kTraceFile, 0);
    if (file < 0 || write(file, mLine.data(), mLine.size()) < 0) {
        gTraced = Traced::kNo;
    }
    if (file >= 0) {
        close(file);
    }
    errno = error;
}

void TraceEvent::AddName(const char* name) { mLine.append(",\"").append(name).append("\":"); }

TraceEvent& TraceEvent::Add(const char* name, std::string_view value) {
    if (mLine.empty()) {
        return *this;
    }
    AddName(name);
    mLine += '"';
    for (const char c : value) {
        if (c == '"' || c == '\\') {
            mLine.append({'\\', c});
        } else if (c >= ' ' && c <= '~') {
            mLine += c;
        } else {
            const auto byte = static_cast<unsigned char>(c);
            mLine.append("\\u00").append({kHexDigits[byte >> 4], kHexDigits[byte & 0xF]});
        }
    }
    mLine += '"';
    return *this;
}

TraceEvent& TraceEvent::Add(const char* name, int64_t value) {
    if (!mLine.empty()) {
        AddName(name);
        mLine += std::to_string(value);
    }
    return *this;
}

TraceEvent& TraceEvent::AddHex(const char* name, const uint8_t* bytes, size_t size) {
    if (mLine.empty()) {
        return *this;
    }
    std::string digits;
    for (size_t i = 0; i < size; ++i) {
        digits.append({kHexDigits[bytes[i] >> 4], kHexDigits[bytes[i] & 0xF]});
    }
    return Add(name, digits);
}

}  // namespace host
