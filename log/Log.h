// The log facility: writes printf-style messages to the Android log, filtered by level and prefixed
// with the caller's name and source line.
#pragma once

#include <mutex>
#include <string>

enum LogLevel : int {
    LOG_ERROR = 1,
    LOG_WARNING = 2,
    LOG_INFO = 3,
    LOG_DEBUG = 4,  // written with the priority of LOG_INFO
};

// Any thread may log at any time. A derived facility overrides GetLogLevel() to set another
// threshold and Append() to keep texts in memory.
class LogBase {
  public:
    explicit LogBase(std::string name);
    LogBase(const LogBase&) = delete;
    LogBase& operator=(const LogBase&) = delete;
    virtual ~LogBase();

    virtual std::string GetName() const;

    // Writes one line unless `level` is above the threshold. `function` is the caller's name or
    // full signature; the printf format (const char*) and its arguments follow `line`. A message
    // longer than 2047 bytes is cut, and an extra log line says so.
    virtual void Printf(LogLevel level, std::string function, int line, ...);

    // Hook that keeps `text` in mLog, under mMutex. Does nothing by default.
    virtual void Append(std::string text) const;

    // The text kept in memory; GetLogClear() also empties it.
    virtual std::string GetLog() const;
    virtual std::string GetLogClear() const;

    // The threshold: the highest level that is written.
    virtual int GetLogLevel() const;

    // Writes "function[line] message" when `level` is a LogLevel not above the threshold.
    void AndroidLog(unsigned int level, const std::string& function, int line,
                    const std::string& message);

    // Returns the qualified name in a function signature, without return type and parameters.
    std::string PrettyTrim(std::string signature);

  protected:
    std::string mName;
    mutable std::string mLog;  // guarded by mMutex
    mutable std::mutex mMutex;
};

// The process-wide facility, named "sys".
extern LogBase gSysLog;
