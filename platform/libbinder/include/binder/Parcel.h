// Host implementation of the platform's message buffer, with the same bytes as on the wire.
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
    size_t dataPosition() const { return mPosition; }
    void setDataPosition(size_t position) const;

    // Sets the size of the content and returns the content for the caller to fill. A host
    // extension: it lets a transport receive without another copy.
    uint8_t* resize(size_t size);

    // Writers return 0, or BAD_VALUE for a null string.
    status_t writeInterfaceToken(const String16& interface);
    status_t writeInt32(int32_t value);
    status_t writeCString(const char* text);

    // Whether the next value is the token of this interface.
    bool enforceInterface(const String16& interface) const;
    // The next number; 0 at the end.
    int32_t readInt32() const;
    // The next string, which the parcel owns; null when no terminator is left.
    const char* readCString() const;

  private:
    status_t write(const void* bytes, size_t size);
    const uint8_t* take(size_t size) const;

    std::vector<uint8_t> mData;
    mutable size_t mPosition = 0;  // always at most the size
};

}  // namespace android
