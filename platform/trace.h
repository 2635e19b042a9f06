// A record of what the device's processes do. Tracing is on while a recorder holds a flock() lock
// on the file `trace` in the device root. Every process appends its events, one JSON object per
// line:
//
//   {"time":12.345678,"pid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is the start of the event in seconds of CLOCK_MONOTONIC. Lines are in the order in which
// events ended. Bytes other than printable ASCII are written as \u00XX. A process that cannot
// append an event, for example on a full disk, makes the file read-only.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

// Returns true if tracing was on at this process's last check, at its first event or in
// LookForTrace().
bool IsTraced();

// Checks again whether tracing is on, for long-running processes. Removes the file of a killed
// recorder.
void LookForTrace();

// CLOCK_MONOTONIC in microseconds.
int64_t MonotonicUs();

// An event, which the destructor appends to the trace. Does nothing while tracing is off. Preserves
// errno.
class TraceEvent {
  public:
    explicit TraceEvent(const char* what);
    TraceEvent(const TraceEvent&) = delete;
    TraceEvent& operator=(const TraceEvent&) = delete;
    ~TraceEvent();

    TraceEvent& Add(const char* name, std::string_view value);
    TraceEvent& Add(const char* name, int64_t value);
    // Adds the bytes as hexadecimal digits.
    TraceEvent& AddHex(const char* name, const uint8_t* bytes, size_t size);

  private:
    std::string mLine;  // empty while tracing is off
};

}  // namespace host
