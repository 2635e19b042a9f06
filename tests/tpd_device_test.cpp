// Tests the proxy with a service in the same process. Also runs on a device.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>

#include "binder/ICorvaneInterfaceClient.h"

// Answers with the command and its parameters.
class EchoService : public android::BBinder {
    android::status_t onTransact(uint32_t /* code */, const android::Parcel& data,
                                 android::Parcel* reply, uint32_t /* flags */) override {
        if (!data.enforceInterface(ICorvaneInterfaceClient::descriptor)) {
            return android::PERMISSION_DENIED;
        }
        std::string text = data.readCString();
        if (data.readInt32() == 1) {
            text += std::string(" ") + data.readCString();
        }
        return reply->writeCString(text.c_str());
    }
};

TEST(TpdDeviceTest, DeliversACommandAndItsAnswer) {
    const auto daemon = ICorvaneInterfaceClient::asInterface(new EchoService);
    std::string reply;
    EXPECT_EQ(daemon->ExecuteCommand(reply, "[TPD]captest", "x"), android::OK);
    EXPECT_EQ(reply, "captest x");
}
