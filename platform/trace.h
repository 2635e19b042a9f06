// A record of what the device's processes do. While the file `trace` exists in the device root, the
// device is watched: every process appends one JSON object a line to the file:
//
//   {"time":12.345678,"pid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is when the event began, in seconds of CLOCK_MONOTONIC; the lines are in the order in
// which events ended. A byte that is not printable ASCII is written as \u00XX.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

constexpr char kTraceFile[] = "trace";

// Whether the device is watched, as this process last saw it: at its first event or at the last
// LookForTrace().
bool IsTraced();

// Looks again. For processes that live longer than one command.
void LookForTrace();

// CLOCK_MONOTONIC in microseconds.
int64_t MonotonicUs();

// One event, appended when the object is destroyed. Does nothing while the device is not watched;
// keeps errno.
class TraceEvent {
  public:
    explicit TraceEvent(const char* what);
    TraceEvent(const TraceEvent&) = delete;
    TraceEvent& operator=(const TraceEvent&) = delete;
    ~TraceEvent();

    TraceEvent& Add(const char* name, std::string_view value);
    TraceEvent& Add(const char* name, int64_t value);
    // The bytes as hexadecimal digits.
    TraceEvent& AddHex(const char* name, const uint8_t* bytes, size_t size);

  private:
    std::string mLine;  // empty while the device is not watched
};

}  // namespace host
