#include "property/Property.h"

#include <android/log.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>

namespace {

// The log lines are part of the interface. Every write is logged at ERROR with "retry:1", even if
// it succeeds at once. A value that only the second read returns is logged with "i = 1".
constexpr char kTag[] = "corvane_daemon";
constexpr int kWriteAttempts = 6;
constexpr useconds_t kPauseUs = 100;

// Not logged, because it is written at the rate of touch input.
constexpr char kSilentKey[] = "odm.thp.trigger_input";

struct Row {
    const char* alias;
    const char* key;
    const char* defaultValue;
};

constexpr Row kTable[] = {
        {"VerSys", "ro.build.display.id", ""},
        {"Holster", "ro.config.zelmor_smallwindow", ""},
        {"DebugOn", "persist.sys.zelmor.debug.on", ""},
        {"RawData", "thp.debug.raw", ""},
        {"QuillRecovery", "quill.recovery", ""},
        {"DoubleOs", "double.os", ""},
        {"DoubleOsRoot", "double.os.root", ""},
        {"ThplogEnable", "persist.odm.thp.thplog_enabled", ""},
        {"LogtofileOnBoot", "persist.odm.thp.logtofile_onboot", "false"},
        {"ThplogRemote", "persist.odm.thp.remotelog", "false"},
        {"PersistVerDae", "persist.odm.thp.ver_dae", ""},
        {"DebugOnSensitivity", "persist.odm.thp.debug.aft_diff", ""},
        {"ThplogExtended", "persist.odm.thp.thplog_extended", "false"},
        {"ServiceEnable", "odm.thp.service_enable", "false"},
        {"DaeAlive", "odm.thp.dae_alive", "false"},
        {"RebootTimes", "odm.thp.dae_reboot_times", "0"},
        {"Binder", "odm.thp.binder", "0"},
        {"TuiInit", "odm.thp.tui_init_done", "false"},
        {"UpdateFW", "odm.thp.is_updating_fw", "false"},
        {"LogLevel", "odm.thp.loglevel", "3"},
        {"BootFlag", "odm.thp.dae_bootflag", "false"},
        {"VerAlgo", "odm.thp.ver_algo", ""},
        {"VerAsa", "odm.thp.ver_asa", ""},
        {"VerDae", "odm.thp.ver_dae", ""},
        {"VerHal", "odm.thp.ver_hal", ""},
        {"VerAft", "odm.thp.ver_aft_algo", ""},
        {"VerLog", "odm.thp.ver_thplog", ""},
        {"VerApi", "odm.thp.ver_api", ""},
        {"VerFw", "odm.thp.ver_firmware", ""},
        {"AfeLog", "odm.thp.debug.afelog", "false"},
        {"Permissive", "odm.thp.debug.selinux.permissive", "null"},
        {"OsFlag", "odm.thp.os.flag", ""},
        {"UserType", "ro.logsystem.usertype", ""},
        {"Rotate", "odm.thp.rotate", "0"},
};

}  // namespace

Property::Property() {
    for (const Row& row : kTable) {
        mItems.push_back({row.alias, row.key, row.defaultValue});
    }
}

PropertyItem& Property::GetItem(std::string alias) {
    for (PropertyItem& item : mItems) {
        if (item.alias == alias) {
            return item;
        }
    }
    return mItems.front();
}

int Property::Get(std::string key, std::string& out, std::string defaultValue) {
    int length = __system_property_get(key.c_str(), mBuf);
    if (length <= 0) {
        usleep(kPauseUs);
        length = __system_property_get(key.c_str(), mBuf);
        if (length > 0) {
            __android_log_print(ANDROID_LOG_INFO, kTag, "ret = %d, i = %d, %s mBuf = %s", length, 1,
                                key.c_str(), mBuf);
        }
    }
    if (length > 0) {
        out = mBuf;
        return length;
    }
    if (defaultValue.empty()) {
        out = mBuf;
        return 0;
    }
    out = defaultValue;
    Set(key, out);
    return static_cast<int>(out.length()) + 1;
}

void Property::Set(std::string key, std::string value) {
    for (int i = 0; i < kWriteAttempts; ++i) {
        __system_property_get(key.c_str(), mBuf);
        if (value == mBuf) {
            return;
        }
        __system_property_set(key.c_str(), value.c_str());
        if (key != kSilentKey) {
            __android_log_print(ANDROID_LOG_ERROR, kTag, "retry:%d, i = %d, %s, [new]%s, [old]%s",
                                1, i, key.c_str(), value.c_str(), mBuf);
        }
        usleep(kPauseUs);
    }
}

void Property::SetText(const char* alias, const std::string& text) {
    const std::lock_guard<std::mutex> lock(mMutex);
    Set(GetItem(alias).key, text);
}

void Property::SetFlag(const char* alias, bool on) { SetText(alias, on ? "true" : "false"); }

int Property::GetText(const char* alias, std::string& out) {
    const std::lock_guard<std::mutex> lock(mMutex);
    const PropertyItem& row = GetItem(alias);
    return Get(row.key, out, row.defaultValue);
}

bool Property::GetFlag(const char* alias) {
    const PropertyItem row = GetItem(alias);
    if (GetText(alias, mValue) < 1) {
        return row.defaultValue == "true";
    }
    return mValue == "true" || mValue == "1";
}

void Property::SetDebugOn(bool on) { SetFlag("DebugOn", on); }
void Property::SetRawData(bool on) { SetFlag("RawData", on); }
void Property::SetThplogEnable(bool on) { SetFlag("ThplogEnable", on); }
void Property::SetPersistVerDae(bool on) { SetFlag("PersistVerDae", on); }
void Property::SetServiceEnable(int value) { SetText("ServiceEnable", std::to_string(value)); }
void Property::SetBootFlag(bool on) { SetFlag("BootFlag", on); }
void Property::SetVerDae(bool on) { SetFlag("VerDae", on); }
void Property::SetAfeLog(bool on) { SetFlag("AfeLog", on); }
void Property::SetPermissive(bool on) { SetFlag("Permissive", on); }

int Property::GetThplogEnable(std::string& out) { return GetText("ThplogEnable", out); }
int Property::GetServiceEnable(std::string& out) { return GetText("ServiceEnable", out); }
int Property::GetDaeAlive(std::string& out) { return GetText("DaeAlive", out); }
int Property::GetRebootTimes(std::string& out) { return GetText("RebootTimes", out); }
int Property::GetBinder(std::string& out) { return GetText("Binder", out); }
int Property::GetUpdateFW(std::string& out) { return GetText("UpdateFW", out); }
int Property::GetPermissive(std::string& out) { return GetText("Permissive", out); }

int Property::GetUserType(int& type) {
    const std::lock_guard<std::mutex> lock(mMutex);
    const PropertyItem& row = GetItem("UserType");
    const int length = Get(row.key, mValue, row.defaultValue);
    char* end = nullptr;
    const long long number = strtoll(mValue.c_str(), &end, 10);
    if (end != mValue.c_str() && number >= INT_MIN && number <= INT_MAX) {
        type = static_cast<int>(number);
    }
    return length;
}

bool Property::GetServiceEnable() { return GetFlag("ServiceEnable"); }
bool Property::GetDaeAlive() { return GetFlag("DaeAlive"); }
bool Property::GetRebootTimes() { return GetFlag("RebootTimes"); }
bool Property::GetBinder() { return GetFlag("Binder"); }
bool Property::GetUpdateFW() { return GetFlag("UpdateFW"); }
bool Property::GetPermissive() { return GetFlag("Permissive"); }
