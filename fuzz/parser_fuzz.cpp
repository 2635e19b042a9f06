// Key/value parsing, beside a model that reads byte after byte. The input begins with its
// separators; its first byte gives their lengths.
#include <climits>

#include "cmdline/StringPairParser.h"
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
    std::vector<std::string> kept;
    for (const std::string& field : fields) {
        if (!field.empty()) {
            kept.push_back(field);
        }
    }
    return kept;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string input = ToString(data, size);
    const size_t lengths = size > 0 ? data[0] : 0;
    const std::string pairSeparator = input.substr(0, lengths % 3 + 1);
    const std::string keyValueSeparator = input.substr(pairSeparator.size(), lengths / 3 % 3 + 1);
    const std::string text = input.substr(pairSeparator.size() + keyValueSeparator.size());
    if (keyValueSeparator.empty()) {
        return 0;
    }
    const std::vector<std::string> pieces = NaiveSplit(text, pairSeparator);
    Check(Split(text, pairSeparator) == pieces);

    StringPairParser parser;
    parser.Init(text, pairSeparator, keyValueSeparator);
    for (const std::string& piece : pieces) {
        const std::vector<std::string> fields = NaiveSplit(piece, keyValueSeparator);
        std::string value;
        Check(fields.size() != 2 || parser.GetValue(fields[0], value));
        int number = 77;
        char* end = nullptr;
        const long expected = strtol(value.c_str(), &end, 10);
        const bool isNumber = end != value.c_str() && expected >= INT_MIN && expected <= INT_MAX;
        Check(fields.size() != 2 || parser.GetIntValue(fields[0], number) == isNumber);
        Check(number == (isNumber ? expected : 77));
    }
    return 0;
}
