// Host implementation of the platform's message buffer, identical on the wire.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include <utils/Errors.h>
#include <utils/String16.h>

namespace android {

// Every value starts at a multiple of 4 bytes; the padding is zero.
class Parcel {
  public:
    Parcel() = default;
    Parcel(const Parcel&) = delete;
    Parcel& operator=(const Parcel&) = delete;

    const uint8_t* data() const { return mData.data(); }
    size_t dataSize() const { return mData.size(); }
    void setDataPosition(size_t position) const;

    // Replaces the content with a copy of the buffer, to be read from the beginning. Returns 0.
    status_t setData(const uint8_t* buffer, size_t size);
    void freeData();

    // Writers return 0, or BAD_VALUE for a null string.
    status_t writeInterfaceToken(const String16& interface);
    status_t writeInt32(int32_t value);
    status_t writeCString(const char* text);

    // Returns true if the next value is the token of this interface.
    bool enforceInterface(const String16& interface) const;
    // Returns the next number, or 0 at the end.
    int32_t readInt32() const;
    // Returns the next string, owned by the parcel, or null if it is not terminated.
    const char* readCString() const;

  private:
    status_t write(const void* bytes, size_t size);
    const uint8_t* take(size_t size) const;

    std::vector<uint8_t> mData;
    mutable size_t mPosition = 0;  // at most the size
};

}  // namespace android
