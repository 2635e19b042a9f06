#include "cmdline/StringPairParser.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <utility>

std::vector<std::string> Split(std::string text, std::string delimiter) {
    if (delimiter.empty()) {
        return {text};
    }
    std::vector<std::string> fields;
    size_t begin = 0;
    while (begin < text.length()) {
        const size_t end = std::min(text.find(delimiter, begin), text.length());
        if (end > begin) {
            fields.emplace_back(text, begin, end - begin);
        }
        begin = end + delimiter.length();
    }
    return fields;
}

void StringPairParser::Init(const std::string& text, const std::string& pairSeparator,
                            const std::string& keyValueSeparator) {
    for (std::string& piece : Split(text, pairSeparator)) {
        std::vector<std::string> fields = Split(std::move(piece), keyValueSeparator);
        if (fields.size() == 2) {
            mPairs.try_emplace(std::move(fields[0]), std::move(fields[1]));
        }
    }
}

bool StringPairParser::GetValue(std::string key, std::string& value) const {
    const auto pair = mPairs.find(key);
    if (pair == mPairs.end()) {
        return false;
    }
    value = pair->second;
    return true;
}

bool StringPairParser::GetIntValue(std::string key, int& value) const {
    std::string text;
    if (!GetValue(key, text)) {
        return false;
    }
    char* end = nullptr;
    const long long number = strtoll(text.c_str(), &end, 10);
    if (end == text.c_str() || number < INT_MIN || number > INT_MAX) {
        return false;
    }
    value = static_cast<int>(number);
    return true;
}

bool StringPairParser::GetBoolValue(std::string key, bool& value) const {
    int number = 0;
    if (!GetIntValue(key, number)) {
        return false;
    }
    value = number != 0;
    return true;
}
