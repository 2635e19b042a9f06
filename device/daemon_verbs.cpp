#include "daemon_verbs.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "answers.h"
#include "faults.h"
#include "messages.h"
#include "platform/libbinder/vndbinder.h"

namespace device {

namespace {

// The longest answer that, with its terminator, fits in a reply.
constexpr size_t kMaxAnswerBytes = host::kMaxTransactionBytes - 1;

int Record(const std::string& command, const std::string& answer) {
    if (answer.length() > kMaxAnswerBytes) {
        return Fail("answer: the text is longer than " + std::to_string(kMaxAnswerBytes) +
                    " bytes");
    }
    if (answer.find('\0') != std::string::npos) {
        return Fail("answer: the text contains a NUL byte");
    }
    return RecordAnswer(command, answer) ? 0 : FailForErrno("answer '" + command + "'");
}

// Records standard input without its final newline, because the tool appends one to an answer.
int RecordInput(const std::string& command) {
    std::string text(kMaxAnswerBytes + 2, '\0');
    text.resize(fread(text.data(), 1, text.size(), stdin));
    if (ferror(stdin) != 0) {
        return FailForErrno("cannot read standard input");
    }
    if (text.empty()) {
        return Fail("answer: nothing was recorded, because standard input is empty");
    }
    if (text.back() == '\n') {
        text.pop_back();
    }
    return Record(command, text);
}

int ListFaults() {
    for (const FaultType& type : kFaultTypes) {
        printf("%-16s the daemon %s", type.name, type.effect);
        if (type.argument != nullptr) {
            printf("; %s: %jd to %jd", type.argument, intmax_t{type.min}, intmax_t{type.max});
        }
        puts("");
    }
    return 0;
}

}  // namespace

int ManageAnswers(int argc, char** argv) {
    if (argc == 0) {
        for (const std::string& command : RecordedCommands()) {
            puts(command.c_str());
        }
        return 0;
    }
    const std::string command = argv[0];
    if (argc != 2) {
        return Fail("answer: expected two arguments; quote the command with its parameters",
                    kUsageError);
    }
    if (command == "--remove") {
        return RemoveAnswer(argv[1]) ? 0 : FailForErrno(std::string("answer '") + argv[1] + "'");
    }
    const bool isPadded = command.empty() || command.front() == ' ' || command.back() == ' ';
    if (isPadded || command.front() == '-' || command.find('\n') != std::string::npos) {
        return Fail("answer: invalid command '" + command + "'", kUsageError);
    }
    return strcmp(argv[1], "-") == 0 ? RecordInput(command) : Record(command, argv[1]);
}

int ManageFaults(int argc, char** argv) {
    if (argc == 0) {
        return ListFaults();
    }
    const std::string text = Join(argc, argv);
    if (!ParseFault(text).has_value()) {
        return Fail("fault: invalid fault '" + text + "'; see " + Command("fault"), kUsageError);
    }
    return SetFault(text) ? 0 : FailForErrno("cannot set the fault");
}

}  // namespace device
