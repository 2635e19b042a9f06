// A lookup table of the key/value pairs in a string, such as the kernel command line.
#pragma once

#include <map>
#include <string>
#include <vector>

// Splits `text` at every `delimiter` and returns the non-empty fields in order. An empty delimiter
// returns `text` as the only field, even if it is empty.
std::vector<std::string> Split(std::string text, std::string delimiter);

class StringPairParser {
  public:
    // Adds the pairs found in `text`. The first occurrence of a key wins. A field that is not
    // exactly one non-empty key and one non-empty value is ignored.
    void Init(const std::string& text, const std::string& pairSeparator,
              const std::string& keyValueSeparator);

    // The getters return whether the key was found, and leave `value` alone if not.
    bool GetValue(std::string key, std::string& value) const;

    // The value as a decimal number, with optional leading white space and sign. Characters after
    // the digits are ignored. A value that does not begin with a number, or whose number does not
    // fit in an int, counts as not found.
    bool GetIntValue(std::string key, int& value) const;

    // As GetIntValue(); `value` becomes whether the number is not 0.
    bool GetBoolValue(std::string key, bool& value) const;

  private:
    std::map<std::string, std::string> mPairs;
};
