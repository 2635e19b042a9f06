// The log facility: printf-style lines made of the caller's name, the source line in brackets and
// the message, filtered by level, in the Android log.
#pragma once

#include <mutex>
#include <string>

enum LogLevel : int {
    LOG_ERROR = 1,
    LOG_WARNING = 2,
    LOG_INFO = 3,
    LOG_DEBUG = 4,  // written with the priority of LOG_INFO
};

// Any thread may log at any time. A specialised facility overrides GetLogLevel() for another
// threshold and Append() to keep texts in memory.
class LogBase {
  public:
    explicit LogBase(std::string name);
    LogBase(const LogBase&) = delete;
    LogBase& operator=(const LogBase&) = delete;
    virtual ~LogBase();

    virtual std::string GetName() const;

    // Writes one line unless `level` is above the threshold. `function` is the caller's full
    // signature or plain name; after `line` come the printf format (const char*) and its arguments.
    // A message is cut when it is longer than 2047 bytes, and a line in the log says so.
    virtual void Printf(LogLevel level, std::string function, int line, ...);

    // Hook for keeping `text` in mLog, under mMutex. Does nothing here.
    virtual void Append(std::string text) const;

    // The text kept in memory; GetLogClear() also empties it.
    virtual std::string GetLog() const;
    virtual std::string GetLogClear() const;

    // The highest level that is written.
    virtual int GetLogLevel() const;

    // Writes "function[line] message" when `level` is a LogLevel not above the threshold.
    void AndroidLog(unsigned int level, const std::string& function, int line,
                    const std::string& message);

    // The qualified name in a function signature: without return type and parameter list.
    std::string PrettyTrim(std::string signature);

  protected:
    std::string mName;
    mutable std::string mLog;  // guarded by mMutex
    mutable std::mutex mMutex;
};

// The process-wide facility, "sys".
extern LogBase gSysLog;
