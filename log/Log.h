// The log facility: writes printf-style messages to the Android log, filtered by level and prefixed
// with the caller's name and source line.
#pragma once

#include <mutex>
#include <string>

enum LogLevel : int {
    LOG_ERROR = 1,
    LOG_WARNING = 2,
    LOG_INFO = 3,
    LOG_DEBUG = 4,  // logged with the priority of LOG_INFO
};

// Thread-safe. A derived class can override GetLogLevel() to change the threshold.
class LogBase {
  public:
    explicit LogBase(std::string name);
    LogBase(const LogBase&) = delete;
    LogBase& operator=(const LogBase&) = delete;
    virtual ~LogBase();

    virtual std::string GetName() const;

    // Logs a message unless `level` is above the threshold. `function` is the caller's name or full
    // signature; the printf format (const char*) and its arguments follow `line`. Truncates a
    // message longer than 2047 bytes and logs an extra line that says so.
    virtual void Printf(LogLevel level, std::string function, int line, ...);

    // Does nothing; no function of this class calls it. A derived class can override it to keep
    // `text` in mLog, guarded by mMutex, for its own callers.
    virtual void Append(std::string text) const;

    // Return the text kept in memory. GetLogClear() also clears it.
    virtual std::string GetLog() const;
    virtual std::string GetLogClear() const;

    // Returns the threshold: the highest level that is logged.
    virtual int GetLogLevel() const;

    // Logs "function[line] message" if `level` is a valid LogLevel and not above the threshold.
    void AndroidLog(unsigned int level, const std::string& function, int line,
                    const std::string& message);

    // Returns the function signature without its return type and parameters.
    std::string PrettyTrim(std::string signature);

  protected:
    std::string mName;
    mutable std::string mLog;  // guarded by mMutex
    mutable std::mutex mMutex;
};

// The process-wide instance, named "sys".
extern LogBase gSysLog;
