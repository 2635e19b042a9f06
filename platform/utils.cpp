#include <utils/RefBase.h>
#include <utils/String16.h>

#include <algorithm>

namespace android {

RefBase::RefBase() : mRefs(new weakref_type(this)) {}

RefBase::~RefBase() { mRefs->decWeak(this); }

void RefBase::incStrong(const void* /* id */) const {
    mRefs->mStrong.fetch_add(1, std::memory_order_relaxed);
}

void RefBase::decStrong(const void* /* id */) const {
    if (mRefs->mStrong.fetch_sub(1, std::memory_order_acq_rel) == 1) {
        delete this;
    }
}

int32_t RefBase::getStrongCount() const { return mRefs->mStrong.load(std::memory_order_relaxed); }

RefBase::weakref_type* RefBase::createWeak(const void* id) const {
    mRefs->incWeak(id);
    return mRefs;
}

void RefBase::weakref_type::incWeak(const void* /* id */) {
    mWeak.fetch_add(1, std::memory_order_relaxed);
}

void RefBase::weakref_type::decWeak(const void* /* id */) {
    if (mWeak.fetch_sub(1, std::memory_order_acq_rel) == 1) {
        delete this;
    }
}

bool RefBase::weakref_type::attemptIncStrong(const void* /* id */) {
    int32_t strong = mStrong.load(std::memory_order_relaxed);
    while (strong > 0) {
        if (mStrong.compare_exchange_weak(strong, strong + 1, std::memory_order_acq_rel)) {
            return true;
        }
    }
    return false;
}

namespace {

constexpr char16_t kReplacement = 0xFFFD;

// Takes one code point off the front of UTF-8 `text`, one byte of it when that is not valid.
char32_t NextCodePoint(const char*& text) {
    const auto lead = static_cast<unsigned char>(*text++);
    if (lead < 0x80) {
        return lead;
    }
    const int trailing = lead >= 0xF0 ? 3 : lead >= 0xE0 ? 2 : 1;
    char32_t point = lead & (0x3F >> trailing);
    for (int i = 0; i < trailing; ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        if ((byte & 0xC0) != 0x80) {
            return kReplacement;
        }
        point = point << 6 | (byte & 0x3F);
    }
    constexpr char32_t kSmallest[] = {0, 0x80, 0x800, 0x10000};
    if (lead < 0xC0 || lead > 0xF4 || point < kSmallest[trailing] || point > 0x10FFFF ||
        (point >= 0xD800 && point < 0xE000)) {
        return kReplacement;
    }
    text += trailing;
    return point;
}

std::u16string ToUtf16(const char* text) {
    std::u16string units;
    while (*text != '\0') {
        const char32_t point = NextCodePoint(text);
        if (point < 0x10000) {
            units += static_cast<char16_t>(point);
        } else {
            units += static_cast<char16_t>(0xD7C0 + (point >> 10));
            units += static_cast<char16_t>(0xDC00 + (point & 0x3FF));
        }
    }
    return units;
}

}  // namespace

String16::String16() : String16(u"", 0) {}

String16::String16(const char* text)
    : mText(nullptr), mSize(0), mOwned(std::make_shared<const std::u16string>(ToUtf16(text))) {
    mText = mOwned->c_str();
    mSize = mOwned->size();
}

bool String16::operator==(const String16& other) const {
    return std::equal(mText, mText + mSize, other.mText, other.mText + other.mSize);
}

}  // namespace android
