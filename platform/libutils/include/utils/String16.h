// Host implementation of the platform's UTF-16 string.
#pragma once

#include <cstddef>
#include <memory>
#include <string>

namespace android {

// A constant string, with a terminating zero unit; copies share it.
class String16 {
  public:
    String16();
    // From ASCII; any other byte becomes U+FFFD.
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
    std::shared_ptr<const std::u16string> mOwned;  // null for a StaticString16
};

// A constant without heap storage, to construct String16 objects from.
template <size_t N>
class StaticString16 : public String16 {
  public:
    constexpr StaticString16(const char16_t (&text)[N])  // NOLINT(google-explicit-constructor)
        : String16(text, N - 1) {}
};

}  // namespace android
