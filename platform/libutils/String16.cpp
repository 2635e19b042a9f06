#include <utils/String16.h>

#include <algorithm>
#include <cstring>

namespace android {

namespace {

std::u16string FromAscii(const char* text) {
    constexpr char16_t kReplacement = 0xFFFD;
    std::u16string units(text, text + strlen(text));
    std::replace_if(
            units.begin(), units.end(), [](char16_t unit) { return unit > 0x7F; }, kReplacement);
    return units;
}

}  // namespace

String16::String16() : String16(u"", 0) {}

String16::String16(const char* text)
    : mText(nullptr), mSize(0), mOwned(std::make_shared<const std::u16string>(FromAscii(text))) {
    mText = mOwned->c_str();
    mSize = mOwned->size();
}

bool String16::operator==(const String16& other) const {
    return std::equal(mText, mText + mSize, other.mText, other.mText + other.mSize);
}

}  // namespace android
