// Reading a parcel of hostile bytes: the input's first half says what is read, the rest is read.
#include <binder/Parcel.h>

#include <cstring>

#include "fuzz.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const size_t steps = size / 2;
    android::Parcel parcel;
    Check(parcel.setData(data + steps, size - steps) == android::OK);
    for (size_t i = 0; i < steps; ++i) {
        if (data[i] % 4 == 0) {
            parcel.enforceInterface(android::String16("android.Some"));
        } else if (data[i] % 4 == 1) {
            parcel.readInt32();
        } else if (data[i] % 4 == 2) {
            parcel.setDataPosition(data[i]);
        } else if (const char* const text = parcel.readCString(); text != nullptr) {
            Check(reinterpret_cast<const uint8_t*>(text) + strlen(text) <
                  parcel.data() + parcel.dataSize());
        }
        Check(parcel.dataPosition() <= parcel.dataSize());
    }
    return 0;
}
