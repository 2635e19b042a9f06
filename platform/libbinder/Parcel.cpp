#include <binder/Parcel.h>

#include <algorithm>
#include <cstring>

namespace android {

namespace {

constexpr int32_t kNoStrictModePolicy = INT32_MIN;  // 0x80000000
constexpr int32_t kNoWorkSource = -1;
constexpr int32_t kVendorHeader = 'V' << 24 | 'N' << 16 | 'D' << 8 | 'R';

constexpr size_t Padded(size_t size) { return (size + 3) & ~size_t{3}; }

}  // namespace

void Parcel::setDataPosition(size_t position) const {
    mPosition = std::min(position, mData.size());
}

status_t Parcel::setData(const uint8_t* buffer, size_t size) {
    mData.assign(buffer, buffer + size);
    mPosition = 0;
    return OK;
}

void Parcel::freeData() { setData(nullptr, 0); }

// Consumes the next `size` bytes and their padding, which may be missing at the end. Returns the
// bytes, or null if fewer are left.
const uint8_t* Parcel::take(size_t size) const {
    if (size > mData.size() - mPosition) {
        return nullptr;
    }
    const uint8_t* const bytes = mData.data() + mPosition;
    mPosition += std::min(Padded(size), mData.size() - mPosition);
    return bytes;
}

status_t Parcel::write(const void* bytes, size_t size) {
    const size_t end = mData.size();
    mData.resize(end + Padded(size));
    memcpy(mData.data() + end, bytes, size);
    return OK;
}

status_t Parcel::writeInt32(int32_t value) { return write(&value, sizeof(value)); }

status_t Parcel::writeCString(const char* text) {
    return text != nullptr ? write(text, strlen(text) + 1) : BAD_VALUE;
}

status_t Parcel::writeInterfaceToken(const String16& interface) {
    writeInt32(kNoStrictModePolicy);
    writeInt32(kNoWorkSource);
    writeInt32(kVendorHeader);
    writeInt32(static_cast<int32_t>(interface.size()));
    return write(interface.string(), (interface.size() + 1) * sizeof(char16_t));
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
    const size_t left = mData.size() - mPosition;
    const auto* const text = reinterpret_cast<const char*>(mData.data() + mPosition);
    const size_t length = left > 0 ? strnlen(text, left) : 0;
    if (length == left) {
        return nullptr;
    }
    take(length + 1);
    return text;
}

}  // namespace android
