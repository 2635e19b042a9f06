// Key/value parsing beside a naive model. The input begins with its separators, whose lengths its
// first byte gives.
#include <climits>

#include "cmdline/StringPairParser.h"
#include "fuzz.h"

namespace {

// Reads character by character instead of searching.
std::vector<std::string> NaiveSplit(const std::string& text, const std::string& delimiter) {
    std::vector<std::string> fields(1);
    for (size_t at = 0; at < text.size();) {
        if (!delimiter.empty() && text.compare(at, delimiter.size(), delimiter) == 0) {
            fields.emplace_back();
            at += delimiter.size();
        } else {
            fields.back() += text[at++];
        }
    }
    std::vector<std::string> kept;
    for (const std::string& field : fields) {
        if (!field.empty() || delimiter.empty()) {
            kept.push_back(field);
        }
    }
    return kept;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    const size_t kind = size > 0 ? data[0] : 0;
    const std::string pair = input.substr(0, kind % 4);
    const std::string keyValue = input.substr(pair.size(), kind / 4 % 4);
    const std::string text = input.substr(pair.size() + keyValue.size());
    Check(Split(text, pair) == NaiveSplit(text, pair));

    StringPairParser parser;
    parser.Init(text, pair, keyValue);
    for (const std::string& piece : NaiveSplit(text, pair)) {
        const std::vector<std::string> fields = NaiveSplit(piece, keyValue);
        std::string value;
        if (fields.size() != 2) {
            continue;
        }
        Check(parser.GetValue(fields[0], value));
        int number = 77;
        char* end = nullptr;
        const long expected = strtol(value.c_str(), &end, 10);
        const bool decimal = end != value.c_str() && expected >= INT_MIN && expected <= INT_MAX;
        Check(parser.GetIntValue(fields[0], number) == decimal);
        Check(number == (decimal ? expected : 77));
    }
    return 0;
}
