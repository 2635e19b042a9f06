#include "service.h"

#include <android/log.h>
#include <sys/prctl.h>
#include <sys/system_properties.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>

#include "platform/device_root.h"
#include "platform/events.h"
#include "programs.h"
#include "properties.h"

namespace device {

namespace {

constexpr int kMinPauseMs = 50;
constexpr int kMaxPauseMs = 5000;

}  // namespace

Service::Service(const Program& program) : mProgram(program) {}

void Service::Start() {
    if (!mIsEnabled) {
        mIsEnabled = true;
        mPauseMs = 0;
        mDue = Clock::now();
        PublishState();
    }
}

void Service::Stop() {
    Kill();
    if (mIsEnabled) {
        mIsEnabled = false;
        PublishState();
    }
}

void Service::Restart() {
    Kill();
    mIsEnabled = false;
    Start();
}

void Service::Kill() {
    if (mProcess > 0) {
        host::Event("service_stop").Add("service", name()).Add("process", mProcess);
        kill(mProcess, SIGKILL);
        waitpid(mProcess, nullptr, 0);
        mProcess = -1;
        mProgram.onExit(false);
    }
}

void Service::Reap() {
    int status = 0;
    if (mProcess < 0 || waitpid(mProcess, &status, WNOHANG) != mProcess) {
        return;
    }
    host::Event("service_exit")
            .Add("service", name())
            .Add("process", mProcess)
            .Add(WIFSIGNALED(status) ? "signal" : "status",
                 WIFSIGNALED(status) ? WTERMSIG(status) : WEXITSTATUS(status));
    mPauseMs = mProgram.isUp() ? kMinPauseMs : std::clamp(mPauseMs * 2, kMinPauseMs, kMaxPauseMs);
    mDue = Clock::now() + std::chrono::milliseconds(mPauseMs);
    mProcess = -1;
    mProgram.onExit(true);
    mIsEnabled = status != 0;
    PublishState();
    if (!mIsEnabled) {
        return;
    }
    host::Event("restart_pause").Add("service", name()).Add("ms", mPauseMs);
    if (mPauseMs == kMinPauseMs * 2) {
        __android_log_print(ANDROID_LOG_ERROR, nullptr,
                            "%s exits before it is alive; retrying with increasing pauses", name());
    }
}

int Service::StartIfDue() {
    if (!mIsEnabled || mProcess > 0) {
        return -1;
    }
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(mDue - Clock::now());
    if (left.count() > 0) {
        return static_cast<int>(left.count());
    }
    const pid_t init = getpid();
    mProcess = fork();
    if (mProcess == 0) {
        Run(init);
    }
    if (mProcess < 0) {
        return kMinPauseMs;
    }
    host::Event("service_start").Add("service", name()).Add("process", mProcess);
    PublishState();
    return -1;
}

// The process dies with init, even if init dies before prctl(). Its argument and TPD_DEVICE_ROOT
// refer to a descriptor of the device root, because the root may have been renamed.
void Service::Run(pid_t init) const {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
    if (getppid() == init) {
        const std::string root = std::to_string(dup(host::DeviceRoot()));
        setenv("TPD_DEVICE_ROOT", ("/proc/self/fd/" + root + "/.").c_str(), 1);
        const std::string file = PathBesideProgram(mProgram.file);
        execl(file.c_str(), file.c_str(), root.c_str(), nullptr);
    }
    _exit(127);
}

void Service::PublishState() const {
    const char* const state = mProcess > 0 ? "running" : mIsEnabled ? "restarting" : "stopped";
    __system_property_set((std::string(kServiceStatePrefix) + name()).c_str(), state);
}

}  // namespace device
