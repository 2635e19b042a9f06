// What the device's processes do, for somebody who watches. While the file `trace` exists in the
// device root, every process appends one JSON object a line to it:
//
//   {"time":12.345678,"pid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is when the event began, in seconds of CLOCK_MONOTONIC; lines stand in the order in which
// events ended. Bytes that are not printable ASCII are written \u00XX.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

constexpr char kTraceFile[] = "trace";

// Whether somebody watches, as far as this process has looked: at its first event and at each
// LookForTrace().
bool IsTraced();

// Looks again. For processes that live longer than one command.
void LookForTrace();

// CLOCK_MONOTONIC in microseconds.
int64_t MonotonicUs();

// One event, appended when the object goes. Does nothing while nobody watches; keeps errno.
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
    std::string mLine;  // empty while nobody watches
};

}  // namespace host
