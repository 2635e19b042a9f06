#include "answers.h"

#include <sys/system_properties.h>

namespace device {

namespace {

// The daemon's commands that act and have nothing to tell, with what each has done.
struct Action {
    const char* name;
    const char* done;
};

constexpr Action kActions[] = {
        {"THP_ASA_EnableFreqShift", "frequency shift enabled"},
        {"THP_ASA_ForceSetToNewFreq", "scan frequency changed"},
        {"THP_ASA_SetTpPenMatchCode", "pen match code set"},
        {"THP_DisableBaselineUpdate", "baseline update disabled"},
        {"THP_DisableFeature", "feature disabled"},
        {"THP_DisableScenario", "scenario disabled"},
        {"THP_EnableBaselineUpdate", "baseline update enabled"},
        {"THP_EnableFeature", "feature enabled"},
        {"THP_EnableScenario", "scenario enabled"},
        {"THP_InformTypingStatus", "typing status noted"},
        {"THP_InformUserAppCrash", "application crash noted"},
        {"THP_Log_Commander", "log command carried out"},
        {"THP_Log_GhostTouch", "ghost touch logged"},
        {"THP_ResetBaseline", "baseline reset"},
        {"THP_Ring_AddSideGesture", "side gesture added"},
        {"THP_Ring_EnterBetaTask", "beta task entered"},
        {"THP_Ring_EnterSpecialBeta", "special beta entered"},
        {"THP_Ring_ExitBetaTask", "beta task left"},
        {"THP_Ring_ExitSpecialBeta", "special beta left"},
        {"THP_Ring_ExposeSideArea", "side area exposed"},
        {"THP_Ring_MapSideArea", "side area mapped"},
        {"THP_Ring_MapSideGestureToKeyCode", "side gesture mapped to key code"},
        {"THP_Ring_MapSideGestureToTPEvent", "side gesture mapped to touch event"},
        {"THP_Ring_RemoveSideArea", "side area removed"},
        {"THP_Ring_ResetSideGesture", "side gestures reset"},
        {"THP_Ring_SetGestureTag", "gesture tag set"},
        {"THP_Ring_SetVolumeGUIInfo", "side volume display noted"},
        {"THP_SetAccData", "acceleration taken over"},
        {"THP_SetEnvironmentTemperature", "temperature taken over"},
        {"THP_SetFoldState", "fold state set"},
        {"THP_SetPressureGesture", "pressure gesture set"},
        {"THP_SetRunTimePrmt", "run-time parameter set"},
        {"THP_SetSensorData", "sensor data taken over"},
        {"THP_SetSensorGesture", "sensor gesture set"},
        {"THP_SetSensorGestureWithTimeStamp", "timed sensor gesture set"},
        {"THP_SetSupportedSensorGesture", "supported sensor gestures set"},
        {"THP_SetTuneTimePrmt", "tuning parameter set"},
        {"THP_SetVirtualKey", "virtual key set"},
        {"THP_SetVolumeGUIInfo", "volume display noted"},
        {"THP_SetXCoreArea", "core area set"},
        {"THP_UpdateViewsLocation", "view locations updated"},
        {"aftouch", "touch filter command taken over"},
};

std::string PropertyText(const char* key) {
    char value[PROP_VALUE_MAX];
    return __system_property_get(key, value) > 0 ? value : "unset";
}

std::string Help(const std::string& params);

std::string Status(const std::string& /* params */) {
    return "thplog: " + PropertyText("persist.odm.thp.thplog_enabled") +
           "\nafelog: " + PropertyText("odm.thp.debug.afelog") +
           "\nraw data: " + PropertyText("thp.debug.raw") +
           "\nrestarts: " + PropertyText("odm.thp.dae_reboot_times");
}

std::string ScreenState(const std::string& /* params */) {
    return "screen state: " + PropertyText("odm.thp.screen_status");
}

std::string Version(const std::string& /* params */) {
    return "corvane_daemon of " + PropertyText("ro.build.display.id") + ", firmware " +
           PropertyText("odm.thp.ver_firmware");
}

std::string Captest(const std::string& params) {
    return "captest " + (params.empty() ? "idle_test" : params) + ": PASS";
}

// The parameter text is a command of its own: its name, then a blank and its parameters.
std::string ExecuteSubCommand(const std::string& params) {
    const size_t blank = params.find(' ');
    const std::string name = params.substr(0, blank);
    if (name.empty() || name == "TSA_ExecuteCommand") {
        return "TSA_ExecuteCommand: which command?";
    }
    return Answer(name, blank == std::string::npos ? "" : params.substr(blank + 1));
}

struct Query {
    const char* name;
    std::string (*answer)(const std::string& params);
};

constexpr Query kQueries[] = {
        {"THP_GetScreenState", ScreenState},
        {"THP_GetStatus", Status},
        {"THP_GetVersion", Version},
        {"TSA_ExecuteCommand", ExecuteSubCommand},
        {"captest", Captest},
        {"help", Help},
};

std::string Help(const std::string& /* params */) {
    std::string text = "corvane_daemon commands:";
    for (const Query& query : kQueries) {
        text += std::string("\n") + query.name;
    }
    for (const Action& action : kActions) {
        text += std::string("\n") + action.name;
    }
    return text;
}

}  // namespace

std::string Answer(const std::string& command, const std::string& params) {
    for (const Query& query : kQueries) {
        if (command == query.name) {
            return query.answer(params);
        }
    }
    for (const Action& action : kActions) {
        if (command == action.name) {
            return command + ": " + action.done + (params.empty() ? "" : " (" + params + ")");
        }
    }
    return "unknown command: " + command;
}

}  // namespace device
