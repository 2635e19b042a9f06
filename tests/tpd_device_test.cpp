// The proxy and the platform's binder objects within one process: a device can run this as it is.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>

#include "binder/ICorvaneInterfaceClient.h"

class EchoService : public android::BBinder {
    android::status_t onTransact(uint32_t, const android::Parcel& data, android::Parcel* reply,
                                 uint32_t) override {
        const bool isOurs = data.enforceInterface(ICorvaneInterfaceClient::descriptor);
        std::string text = data.readCString();
        text += data.readInt32() == 1 ? data.readCString() : "";
        return isOurs ? reply->writeCString(text.c_str()) : android::PERMISSION_DENIED;
    }
};

TEST(OwnProcess, CarriesACommandAndItsAnswer) {
    std::string reply;
    const auto daemon = ICorvaneInterfaceClient::asInterface(new EchoService);
    EXPECT_EQ(daemon->ExecuteCommand(reply, "[TPD]captest ", "x"), android::OK);
    EXPECT_EQ(reply, "captest x");
}
