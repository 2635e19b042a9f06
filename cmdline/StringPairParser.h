// A lookup table of the key/value pairs in a string, such as the kernel command line.
#pragma once

#include <map>
#include <string>
#include <vector>

// Splits `text` at every `delimiter` and returns the non-empty fields in order. If the delimiter is
// empty, returns `text` as the only field, even if it is empty.
std::vector<std::string> Split(std::string text, std::string delimiter);

class StringPairParser {
  public:
    // Adds the pairs found in `text`. The first occurrence of a key wins. Ignores a field that does
    // not split into exactly one key and one value.
    void Init(const std::string& text, const std::string& pairSeparator,
              const std::string& keyValueSeparator);

    // The getters return false and leave `value` unchanged if the key is not found.
    bool GetValue(std::string key, std::string& value) const;

    // Parses a decimal number with optional leading white space and sign. Ignores characters after
    // the digits. Also returns false if there is no number or it does not fit in an int.
    bool GetIntValue(std::string key, int& value) const;

    // Like GetIntValue(). Any number other than 0 is true.
    bool GetBoolValue(std::string key, bool& value) const;

  private:
    std::map<std::string, std::string> mPairs;
};
