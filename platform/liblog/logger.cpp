// For the platform's own liblog: its messages go to the device root's log, as those of log.cpp do.
#include <android/log.h>

#include "platform/log_file.h"

namespace {

void AppendMessage(const __android_logger_data* data, const char* message) {
    host::AppendLogEntry(data->priority, data->tag, message);
}

// Runs before main.
[[gnu::constructor]] void SetLogger() { __android_log_set_logger(AppendMessage); }

}  // namespace
