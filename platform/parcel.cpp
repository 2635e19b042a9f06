#include <binder/Parcel.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <new>

namespace android {

namespace {

constexpr int32_t kNoStrictModePolicy = std::numeric_limits<int32_t>::min();  // 0x80000000
constexpr int32_t kNoWorkSource = -1;
constexpr int32_t kVendorHeader = 'V' << 24 | 'N' << 16 | 'D' << 8 | 'R';
constexpr size_t kMinCapacity = 256;

constexpr size_t Padded(size_t size) { return (size + 3) & ~size_t{3}; }

}  // namespace

Parcel::Parcel() = default;

void Parcel::setDataPosition(size_t position) const { mPosition = std::min(position, mSize); }

status_t Parcel::setData(const uint8_t* buffer, size_t size) {
    uint8_t* const bytes = resizeForOverwrite(size);
    if (bytes == nullptr) {
        return NO_MEMORY;
    }
    std::copy_n(buffer, size, bytes);
    return OK;
}

uint8_t* Parcel::resizeForOverwrite(size_t size) {
    mSize = 0;
    mPosition = 0;
    if (size > mCapacity || mData == nullptr) {
        mCapacity = std::max(size, kMinCapacity);
        mData.reset(new (std::nothrow) uint8_t[mCapacity]);
        if (mData == nullptr) {
            mCapacity = 0;
            return nullptr;
        }
    }
    mSize = size;
    return mData.get();
}

// Adds `size` bytes to the end for the caller to fill, padded with zeros; null when there is no
// memory.
uint8_t* Parcel::append(size_t size) {
    const size_t padded = Padded(size);
    if (padded < size || padded > std::numeric_limits<size_t>::max() / 2 - mSize) {
        return nullptr;
    }
    const size_t needed = mSize + padded;
    if (needed > mCapacity) {
        const size_t capacity = std::max({needed, mCapacity * 2, kMinCapacity});
        std::unique_ptr<uint8_t[]> grown(new (std::nothrow) uint8_t[capacity]);
        if (grown == nullptr) {
            return nullptr;
        }
        std::copy_n(mData.get(), mSize, grown.get());
        mData = std::move(grown);
        mCapacity = capacity;
    }
    uint8_t* const end = mData.get() + mSize;
    memset(end + size, 0, padded - size);
    mSize = needed;
    return end;
}

// The next `size` bytes and their padding, as far as the content has it; null when it is too short.
const uint8_t* Parcel::take(size_t size) const {
    if (size > mSize - mPosition) {
        return nullptr;
    }
    const uint8_t* const bytes = mData.get() + mPosition;
    mPosition += std::min(Padded(size), mSize - mPosition);
    return bytes;
}

status_t Parcel::write(const void* bytes, size_t size) {
    uint8_t* const end = append(size);
    if (end == nullptr) {
        return NO_MEMORY;
    }
    memcpy(end, bytes, size);
    return OK;
}

status_t Parcel::writeInt32(int32_t value) { return write(&value, sizeof(value)); }

status_t Parcel::writeCString(const char* text) {
    return text != nullptr ? write(text, strlen(text) + 1) : BAD_VALUE;
}

status_t Parcel::writeString16(const String16& text) {
    const status_t status = writeInt32(static_cast<int32_t>(text.size()));
    return status == OK ? write(text.string(), (text.size() + 1) * sizeof(char16_t)) : status;
}

status_t Parcel::writeInterfaceToken(const String16& interface) {
    for (const int32_t word : {kNoStrictModePolicy, kNoWorkSource, kVendorHeader}) {
        const status_t status = writeInt32(word);
        if (status != OK) {
            return status;
        }
    }
    return writeString16(interface);
}

bool Parcel::enforceInterface(const String16& interface) const {
    readInt32();  // strict-mode policy
    readInt32();  // work source
    if (readInt32() != kVendorHeader || readInt32() != static_cast<int32_t>(interface.size())) {
        return false;
    }
    const size_t bytes = interface.size() * sizeof(char16_t);
    const uint8_t* const units = take(bytes + sizeof(char16_t));
    return units != nullptr && memcmp(units, interface.string(), bytes) == 0;
}

int32_t Parcel::readInt32() const {
    int32_t value = 0;
    const uint8_t* const bytes = take(sizeof(value));
    if (bytes != nullptr) {
        memcpy(&value, bytes, sizeof(value));
    }
    return value;
}

const char* Parcel::readCString() const {
    if (mPosition == mSize) {
        return nullptr;
    }
    const uint8_t* const text = mData.get() + mPosition;
    const void* const end = memchr(text, 0, mSize - mPosition);
    if (end == nullptr) {
        return nullptr;
    }
    return reinterpret_cast<const char*>(take(static_cast<const uint8_t*>(end) - text + 1));
}

}  // namespace android
