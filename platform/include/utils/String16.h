// Host stand-in for the platform's UTF-16 text.
#pragma once

#include <cstddef>
#include <memory>
#include <string>

namespace android {

// An unchanging text; copies share it.
class String16 {
  public:
    String16();
    // From UTF-8; what is not valid becomes U+FFFD.
    explicit String16(const char* text);

    const char16_t* string() const { return mText; }
    size_t size() const { return mSize; }  // code units

    bool operator==(const String16& other) const;
    bool operator!=(const String16& other) const { return !(*this == other); }

  protected:
    constexpr String16(const char16_t* text, size_t size) : mText(text), mSize(size) {}

  private:
    const char16_t* mText;
    size_t mSize;
    std::shared_ptr<const std::u16string> mOwned;  // null for a constant text
};

// A constant text without heap storage, to construct String16 objects from.
template <size_t N>
class StaticString16 : public String16 {
  public:
    constexpr StaticString16(const char16_t (&text)[N])  // NOLINT(google-explicit-constructor)
        : String16(text, N - 1) {}
};

}  // namespace android
