// The client side of the daemon's binder interface. Its only operation executes a command with
// parameters and returns a string.
#pragma once

#include <string>
#include <vector>

#include <binder/IBinder.h>
#include <binder/IInterface.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String16.h>

// Marks a command as two-way. The marker is removed before the command is sent.
constexpr char kTwoWayMarker[] = "[TPD]";

class ICorvaneInterfaceClient : public android::IInterface {
  public:
    static const android::String16 descriptor;

    // Returns the implementation if `binder` is local to this process, otherwise a new proxy. Null
    // for a null binder.
    static android::sp<ICorvaneInterfaceClient> asInterface(
            const android::sp<android::IBinder>& binder);

    ICorvaneInterfaceClient();
    ~ICorvaneInterfaceClient() override;

    virtual const android::String16& getInterfaceDescriptor() const;

    // Sends `cmd` with `params` to the daemon and returns the status of the transaction.
    //
    // A command that contains kTwoWayMarker is sent two-way, without the marker and anything before
    // it. Any other command is sent one-way if it or its parameters match the lists below.
    //
    // Two-way: stores the daemon's answer in `reply`, empty if the daemon sent no string; leaves
    // `reply` unchanged on failure. One-way: sets `reply` to "OK" regardless of the status.
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

// Logs the daemon's death and unlinks itself. It does not reconnect: the next call on the dead
// binder fails, and RunCmdParms() then looks the service up again.
class MyDeathRecipient : public android::IBinder::DeathRecipient {
  public:
    explicit MyDeathRecipient(const android::sp<android::IBinder>& binder);
    ~MyDeathRecipient() override;

    void binderDied(const android::wp<android::IBinder>& who) override;

  private:
    android::sp<android::IBinder> mBinder;
};

// Returns true if any entry of `list` is a substring of `text`.
bool IsAsync(const std::vector<std::string>& list, std::string text);

// Substrings that make an unmarked command one-way: the first list applies to the command, the
// second to its parameters.
extern const std::vector<std::string> g_asyncCmds;
extern const std::vector<std::string> g_asyncThpCmds;
