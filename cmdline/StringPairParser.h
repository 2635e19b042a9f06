// Strings of key/value pairs, such as the kernel command line, as a lookup table.
#pragma once

#include <map>
#include <string>
#include <vector>

// The non-empty fields of `text` between occurrences of the whole `delimiter`, in order. An empty
// delimiter yields `text` itself as the one field, even when it is empty.
std::vector<std::string> Split(std::string text, std::string delimiter);

class StringPairParser {
  public:
    // Adds the pairs found in `text` to those already held; the first occurrence of a key stays.
    // A piece that is not exactly one key and one value, both non-empty, adds nothing.
    void Init(const std::string& text, const std::string& pairSeparator,
              const std::string& keyValueSeparator);

    // The queries answer whether the key was found; otherwise `value` is left untouched.
    bool GetValue(std::string key, std::string& value) const;

    // The value as a decimal number with optional leading white space and sign; what follows the
    // digits is ignored. A value that does not begin with a number, or whose number is outside the
    // range of int, counts as not found.
    bool GetIntValue(std::string key, int& value) const;

    // Whether the value, read as by GetIntValue, is not 0.
    bool GetBoolValue(std::string key, bool& value) const;

  private:
    std::map<std::string, std::string> mPairs;
};
