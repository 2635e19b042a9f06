#include "answers.h"

#include <algorithm>
#include <cstring>

#include "common.h"

namespace device {

namespace {

// The daemon's commands that act and have nothing to tell, each between spaces.
constexpr char kActions[] =
        " THP_ASA_EnableFreqShift THP_ASA_ForceSetToNewFreq THP_ASA_SetTpPenMatchCode"
        " THP_DisableBaselineUpdate THP_DisableFeature THP_DisableScenario"
        " THP_EnableBaselineUpdate THP_EnableFeature THP_EnableScenario THP_InformTypingStatus"
        " THP_InformUserAppCrash THP_Log_Commander THP_Log_GhostTouch THP_ResetBaseline"
        " THP_Ring_AddSideGesture THP_Ring_EnterBetaTask THP_Ring_EnterSpecialBeta"
        " THP_Ring_ExitBetaTask THP_Ring_ExitSpecialBeta THP_Ring_ExposeSideArea"
        " THP_Ring_MapSideArea THP_Ring_MapSideGestureToKeyCode THP_Ring_MapSideGestureToTPEvent"
        " THP_Ring_RemoveSideArea THP_Ring_ResetSideGesture THP_Ring_SetGestureTag"
        " THP_Ring_SetVolumeGUIInfo THP_SetAccData THP_SetEnvironmentTemperature THP_SetFoldState"
        " THP_SetPressureGesture THP_SetRunTimePrmt THP_SetSensorData THP_SetSensorGesture"
        " THP_SetSensorGestureWithTimeStamp THP_SetSupportedSensorGesture THP_SetTuneTimePrmt"
        " THP_SetVirtualKey THP_SetVolumeGUIInfo THP_SetXCoreArea THP_UpdateViewsLocation aftouch ";

std::string GetOrUnset(const char* key) {
    const std::string value = GetProperty(key);
    return value.empty() ? "unset" : value;
}

std::string Status(const std::string& /* params */) {
    return "thplog: " + GetOrUnset("persist.odm.thp.thplog_enabled") +
           "\nafelog: " + GetOrUnset("odm.thp.debug.afelog") +
           "\nraw data: " + GetOrUnset("thp.debug.raw") +
           "\nrestarts: " + GetOrUnset("odm.thp.dae_reboot_times");
}

std::string ScreenState(const std::string& /* params */) {
    return "screen state: " + GetOrUnset("odm.thp.screen_status");
}

std::string Version(const std::string& /* params */) {
    return "corvane_daemon of " + GetOrUnset("ro.build.display.id") + ", firmware " +
           GetOrUnset("odm.thp.ver_firmware");
}

std::string Captest(const std::string& params) {
    return "captest " + (params.empty() ? "idle_test" : params) + ": PASS";
}

// The parameters are a command of their own: its name, then a space and its parameters.
std::string ExecuteSubCommand(const std::string& params) {
    const size_t space = params.find(' ');
    const std::string name = params.substr(0, space);
    if (name.empty() || name == "TSA_ExecuteCommand") {
        return "TSA_ExecuteCommand: which command?";
    }
    return Answer(name, space == std::string::npos ? "" : params.substr(space + 1));
}

std::string Help(const std::string& params);

constexpr struct {
    const char* name;
    bool isSimulated;  // unknown to a phone's daemon
    std::string (*answer)(const std::string& params);
} kQueries[] = {
        {"THP_GetScreenState", true, ScreenState},
        {"THP_GetStatus", true, Status},
        {"THP_GetVersion", true, Version},
        {"TSA_ExecuteCommand", false, ExecuteSubCommand},
        {"captest", false, Captest},
        {"help", false, Help},
};

std::string Help(const std::string& /* params */) {
    std::string text = "corvane_daemon commands:";
    for (const auto& query : kQueries) {
        text += std::string("\n") + query.name +
                (query.isSimulated ? " (virtual device only)" : "");
    }
    std::string actions = kActions;
    std::replace(actions.begin(), actions.end(), ' ', '\n');
    text.append(actions, 0, actions.length() - 1);
    return text;
}

}  // namespace

std::string Answer(const std::string& command, const std::string& params) {
    for (const auto& query : kQueries) {
        if (command == query.name) {
            return query.answer(params);
        }
    }
    const bool isName = !command.empty() && command.find(' ') == std::string::npos;
    if (isName && strstr(kActions, (" " + command + " ").c_str()) != nullptr) {
        return command + ": done" + (params.empty() ? "" : " (" + params + ")");
    }
    return "unknown command: " + command;
}

}  // namespace device
