#include "log/Log.h"

#include <android/log.h>
#include <bounded_libc.h>

#include <cstdarg>
#include <utility>

namespace {

constexpr char kTag[] = "corvane_daemon";
constexpr int kDefaultLogLevel = LOG_INFO;
constexpr size_t kMessageBytes = 2048;

// Android log priorities, indexed by level - LOG_ERROR.
constexpr int kPriorities[] = {ANDROID_LOG_ERROR, ANDROID_LOG_WARN, ANDROID_LOG_INFO,
                               ANDROID_LOG_INFO};

}  // namespace

LogBase gSysLog("sys");

LogBase::LogBase(std::string name) : mName(std::move(name)) {}

LogBase::~LogBase() {
    const std::lock_guard<std::mutex> lock(mMutex);
    std::string().swap(mLog);
}

std::string LogBase::GetName() const { return mName; }

void LogBase::Printf(LogLevel level, std::string function, int line, ...) {
    if (GetLogLevel() < static_cast<int>(level)) {
        return;
    }
    // Zero-filled, so that the text is terminated even if formatting fails.
    char message[kMessageBytes] = {};
    va_list args;
    va_start(args, line);
    const char* format = va_arg(args, const char*);
    const int length = vsnprintf_s(message, sizeof(message), sizeof(message) - 1, format, args);
    va_end(args);
    if (length < 0) {
        __android_log_print(ANDROID_LOG_INFO, kTag, "over size 0");
        message[sizeof(message) - 1] = '\0';
    }
    AndroidLog(static_cast<unsigned int>(level), PrettyTrim(std::move(function)), line, message);
}

void LogBase::Append(std::string /* text */) const {}

std::string LogBase::GetLog() const {
    const std::lock_guard<std::mutex> lock(mMutex);
    return mLog;
}

std::string LogBase::GetLogClear() const {
    const std::lock_guard<std::mutex> lock(mMutex);
    std::string text;
    text.swap(mLog);
    return text;
}

int LogBase::GetLogLevel() const { return kDefaultLogLevel; }

void LogBase::AndroidLog(unsigned int level, const std::string& function, int line,
                         const std::string& message) {
    if (level < LOG_ERROR || level > LOG_DEBUG) {
        return;
    }
    if (GetLogLevel() < static_cast<int>(level)) {
        return;
    }
    __android_log_print(kPriorities[level - LOG_ERROR], kTag, "%s[%d] %s", function.c_str(), line,
                        message.c_str());
}

std::string LogBase::PrettyTrim(std::string signature) {
    const size_t parameters = signature.find('(');
    if (parameters != std::string::npos) {
        signature.erase(parameters);
    }
    const size_t space = signature.rfind(' ');
    if (space != std::string::npos) {
        signature.erase(0, space + 1);
    }
    return signature;
}
