// Redirects the platform's own liblog to the device root's log.
#include <android/log.h>

#include "platform/events.h"

namespace {

void AppendMessage(const __android_logger_data* data, const char* message) {
    host::WriteLog(data->priority, data->tag, message);
}

[[gnu::constructor]] void SetLogger() { __android_log_set_logger(AppendMessage); }

}  // namespace
