#include "daemon_verbs.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "answers.h"
#include "faults.h"
#include "messages.h"

namespace device {

namespace {

// The longest answer that, with its terminator, fits in a reply.
constexpr size_t kMaxAnswerBytes = (1 << 20) - 2 * 4096 - 1;

int ListAnswers() {
    for (const std::string& command : RecordedCommands()) {
        puts(command.c_str());
    }
    return 0;
}

int Record(const std::string& command, const std::string& answer) {
    if (answer.length() > kMaxAnswerBytes) {
        return Fail("answer: the text is longer than " + std::to_string(kMaxAnswerBytes) +
                    " bytes");
    }
    if (answer.find('\0') != std::string::npos) {
        return Fail("answer: the text contains a NUL byte");
    }
    if (RecordAnswer(command, answer)) {
        return 0;
    }
    return errno == ENAMETOOLONG ? Fail("answer: the command is too long; see tpd-device(1)")
                                 : FailForErrno("answer '" + command + "'");
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

int Remove(const std::string& command) {
    if (RemoveAnswer(command)) {
        return 0;
    }
    return errno == ENOENT ? Fail("no recorded answer for '" + command + "'; " + Command("answer") +
                                  " lists them")
                           : FailForErrno("answer '" + command + "'");
}

int ListFaults() {
    for (const FaultType& type : kFaultTypes) {
        printf("%-16s the daemon %s", type.name, type.effect);
        if (type.argument.name != nullptr) {
            printf("; %s: %jd to %jd", type.argument.name, intmax_t{type.argument.min},
                   intmax_t{type.argument.max});
        }
        puts("");
    }
    return 0;
}

}  // namespace

int ManageAnswers(int argc, char** argv) {
    if (argc == 0) {
        return ListAnswers();
    }
    const std::string command = argv[0];
    if (argc == 1) {
        return Fail("answer: missing argument after '" + command + "'", kUsageError);
    }
    if (argc > 2) {
        return Fail("answer: unexpected argument '" + std::string(argv[2]) +
                            "'; quote the command and its parameters",
                    kUsageError);
    }
    if (command == "--remove") {
        return Remove(argv[1]);
    }
    if (command.empty() || command.front() == '-') {
        return Fail("answer: invalid command '" + command + "'", kUsageError);
    }
    return strcmp(argv[1], "-") == 0 ? RecordInput(command) : Record(command, argv[1]);
}

int ManageFaults(int argc, char** argv) {
    if (argc == 0) {
        return ListFaults();
    }
    const std::string text = Join(argc, argv);
    Fault fault;
    if (const std::string error = ParseFault(text, fault); !error.empty()) {
        return Fail(error + "; see " + Command("fault"), kUsageError);
    }
    return SetFault(text) ? 0 : FailForErrno("cannot set the fault");
}

}  // namespace device
