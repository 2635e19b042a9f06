// A record of what the device's processes do. Tracing is on while a recorder holds the file `trace`
// of the device root locked with flock(): every process appends one JSON object a line to the file:
//
//   {"time":12.345678,"pid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is when the event began, in seconds of CLOCK_MONOTONIC; the lines are in the order in
// which events ended. A byte that is not printable ASCII is written as \u00XX. The process that
// cannot append an event, on a full disk for example, takes the write permission from the file.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

// Whether tracing is on, as this process last saw it: at its first event or at the last
// LookForTrace().
bool IsTraced();

// Looks again, for processes that live longer than one command. Removes a file that a killed
// recorder left behind.
void LookForTrace();

// CLOCK_MONOTONIC in microseconds.
int64_t MonotonicUs();

// One event, appended when the object is destroyed. Does nothing while tracing is off; keeps
// errno.
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
