// The daemon's binder interface as a client sees it: one operation, "execute this command with
// these parameters and answer with a string".
#pragma once

#include <string>
#include <vector>

#include <binder/IBinder.h>
#include <binder/IInterface.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String16.h>

class ICorvaneInterfaceClient : public android::IInterface {
  public:
    static const android::String16 descriptor;

    // The implementation itself when the binder lives in this process, otherwise a new proxy on it.
    // Null when the binder is null.
    static android::sp<ICorvaneInterfaceClient> asInterface(
            const android::sp<android::IBinder>& binder);

    ICorvaneInterfaceClient();
    ~ICorvaneInterfaceClient() override;

    virtual const android::String16& getInterfaceDescriptor() const;

    // Has the daemon execute `cmd` with `params`. A command that carries kTwoWayMarker is sent
    // without everything up to and including it, and always two-way; any other goes one-way when
    // the lists below name it. Two-way: returns 0 with the daemon's answer in `reply` (empty when
    // it answered without a string), or the transport's status with `reply` untouched. One-way:
    // `reply` is "OK" whatever the status is.
    virtual android::status_t ExecuteCommand(std::string& reply, std::string cmd,
                                             std::string params) = 0;
};

class BpCorvaneInterfaceClient : public android::BpInterface<ICorvaneInterfaceClient> {
  public:
    explicit BpCorvaneInterfaceClient(const android::sp<android::IBinder>& remote);
    ~BpCorvaneInterfaceClient() override;

    android::status_t ExecuteCommand(std::string& reply, std::string cmd,
                                     std::string params) override;
};

// Records the daemon's death in the log and ends its own registration. It repairs nothing: the next
// call on the dead binder fails, and the runner looks the service up again.
class MyDeathRecipient : public android::IBinder::DeathRecipient {
  public:
    explicit MyDeathRecipient(const android::sp<android::IBinder>& binder);
    ~MyDeathRecipient() override;

    void binderDied(const android::wp<android::IBinder>& who) override;

  private:
    android::sp<android::IBinder> mBinder;
};

// Whether any entry of `list` occurs in `text`, byte for byte; an empty entry occurs everywhere.
bool IsAsync(const std::vector<std::string>& list, std::string text);

// What is sent one-way: matched against the command and against the parameters. Read-only.
extern const std::vector<std::string> g_asyncCmds;
extern const std::vector<std::string> g_asyncThpCmds;

// The service binder that the last lookup found, null when there is none, and the one recipient
// linked to every service binder of this process.
extern android::sp<android::IBinder> g_thpBinder;
extern android::sp<MyDeathRecipient> g_deathRecipient;
