// Key/value parsing, beside a model that reads byte after byte. The input's first two bytes are the
// separators, the second of which counts twice.
#include "cmdline/StringPairParser.h"

#include <algorithm>

#include "fuzz.h"

namespace {

std::vector<std::string> NaiveSplit(const std::string& text, const std::string& delimiter) {
    std::vector<std::string> fields = {""};
    for (size_t at = 0; at < text.size();) {
        if (text.compare(at, delimiter.size(), delimiter) == 0) {
            fields.emplace_back();
            at += delimiter.size();
        } else {
            fields.back() += text[at++];
        }
    }
    fields.erase(std::remove(fields.begin(), fields.end(), ""), fields.end());
    return fields;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 2) {
        return 0;
    }
    const std::string pairSeparator(1, static_cast<char>(data[0]));
    const std::string keyValueSeparator(2, static_cast<char>(data[1]));
    const std::string text = ToString(data + 2, size - 2);
    const std::vector<std::string> pieces = NaiveSplit(text, pairSeparator);
    Check(Split(text, pairSeparator) == pieces);

    StringPairParser parser;
    parser.Init(text, pairSeparator, keyValueSeparator);
    for (const std::string& piece : pieces) {
        const std::vector<std::string> fields = NaiveSplit(piece, keyValueSeparator);
        std::string value;
        int number = 0;
        if (fields.size() == 2) {
            Check(parser.GetValue(fields[0], value));
            Check(!parser.GetIntValue(fields[0], number) || number == atoll(value.c_str()));
        }
    }
    return 0;
}
