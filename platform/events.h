// What the device's processes log and do. An event is one line, a JSON object:
//
//   {"time":1700000000.123456,"pid":7,"tid":7,"who":"tpd","what":"pause","us":100}
//
// "time" is the start of the event in seconds since 1970-01-01 UTC. Bytes other than printable
// ASCII are written as \u00XX, so that `{"time":` occurs only at the start of an event.
//
// The file `log` in the device root contains the "log" events. The file `trace` contains all events
// while tracing is on, that is, while a recorder holds a flock() lock on it; its lines are in the
// order in which events ended. Processes append a line with a single write. On a full disk, a line
// may be incomplete and the next one then follows it without a newline.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace host {

constexpr size_t kMaxLogText = 1023;  // bytes of a text or tag, as of a text on a device

// Returns true if tracing was on at this process's last check, at its first event or in
// UpdateTracing().
bool IsTraced();

// Checks again whether tracing is on, for long-running processes. Removes the trace of a killed
// recorder.
void UpdateTracing();

// Appends an event to the log. Returns the number of bytes written or a negative errno value.
int WriteLog(int priority, std::string_view tag, std::string_view text);

// An event, which the destructor appends to the trace without changing errno. Does nothing while
// tracing is off. A process that cannot append an event makes the trace read-only.
class Event {
  public:
    explicit Event(const char* what) : Event(what, false) {}
    Event(const Event&) = delete;
    Event& operator=(const Event&) = delete;
    ~Event();

    Event& Add(const char* name, std::string_view value);
    Event& Add(const char* name, int64_t value);

  private:
    friend int WriteLog(int priority, std::string_view tag, std::string_view text);

    Event(const char* what, bool isLogged);
    int AppendTo(int file) const;

    std::string mLine;  // without "}\n"; empty if the event is neither traced nor logged
};

}  // namespace host
