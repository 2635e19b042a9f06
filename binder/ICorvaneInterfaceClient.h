// The client side of the daemon's binder interface. It has one operation: execute a command with
// parameters and return a string.
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

    // Returns the implementation if the binder is in this process, otherwise a new proxy. Null for
    // a null binder.
    static android::sp<ICorvaneInterfaceClient> asInterface(
            const android::sp<android::IBinder>& binder);

    ICorvaneInterfaceClient();
    ~ICorvaneInterfaceClient() override;

    virtual const android::String16& getInterfaceDescriptor() const;

    // Sends `cmd` with `params` to the daemon. A command that contains kTwoWayMarker is always
    // two-way; the marker and what precedes it are not sent. Any other command is one-way if it or
    // its parameters match the lists below.
    //
    // Two-way: on success returns 0 and the daemon's answer in `reply`, empty if the answer has no
    // string; otherwise returns the transport's status and leaves `reply` alone. One-way: `reply`
    // is "OK" regardless of the status.
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

// Logs the daemon's death and unlinks itself. Recovery is elsewhere: the next call on the dead
// binder fails, and RunCmdParms() looks the service up again.
class MyDeathRecipient : public android::IBinder::DeathRecipient {
  public:
    explicit MyDeathRecipient(const android::sp<android::IBinder>& binder);
    ~MyDeathRecipient() override;

    void binderDied(const android::wp<android::IBinder>& who) override;

  private:
    android::sp<android::IBinder> mBinder;
};

// Whether any entry of `list` is a substring of `text`.
bool IsAsync(const std::vector<std::string>& list, std::string text);

// Commands that are sent one-way. The first list is matched against the command, the second against
// the parameters. Read-only.
extern const std::vector<std::string> g_asyncCmds;
extern const std::vector<std::string> g_asyncThpCmds;

// The service's binder, null before the first lookup and after a failed call, and the death
// recipient that is linked to every such binder of this process.
extern android::sp<android::IBinder> g_thpBinder;
extern android::sp<MyDeathRecipient> g_deathRecipient;
