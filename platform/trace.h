// A record of what the device's processes do. Tracing is on while a recorder holds a flock() on the
// file `trace` in the device root. Every process appends its events, one JSON object a line:
//
//   {"time":12.345678,"pid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is when the event began, in seconds of CLOCK_MONOTONIC; the lines are in the order in
// which events ended. A byte that is not printable ASCII is written as \u00XX. A process that
// cannot append an event, for example on a full disk, removes the file's write permission.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

// Whether tracing was on when this process last checked: at its first event or in LookForTrace().
bool IsTraced();

// Checks again, for processes that outlive one command. Removes the file of a killed recorder.
void LookForTrace();

// CLOCK_MONOTONIC in microseconds.
int64_t MonotonicUs();

// One event. The destructor appends it. Does nothing while tracing is off; preserves errno.
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
    std::string mLine;  // empty while tracing is off
};

}  // namespace host
