// Host implementation of the platform's UTF-16 string.
#pragma once

#include <cstring>
#include <string>

namespace android {

class String16 {
  public:
    explicit String16(const char* ascii) : mText(ascii, ascii + strlen(ascii)) {}
    String16(const char16_t* text, size_t size) : mText(text, size) {}

    const char16_t* string() const { return mText.c_str(); }  // zero-terminated
    size_t size() const { return mText.size(); }              // code units

  private:
    std::u16string mText;
};

// A constant String16. On a device, it needs no heap storage.
template <size_t N>
class StaticString16 : public String16 {
  public:
    StaticString16(const char16_t (&text)[N])  // NOLINT(google-explicit-constructor)
        : String16(text, N - 1) {}
};

}  // namespace android
