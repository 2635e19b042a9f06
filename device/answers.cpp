#include "answers.h"

#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "common.h"
#include "platform/events.h"
#include "platform/files.h"

namespace device {

namespace {

constexpr char kDirectory[] = "answers";
// The longest answer that, with its terminator, fits in a reply.
constexpr size_t kMaxAnswerBytes = (1 << 20) - 2 * 4096 - 1;

// Returns the path of the command's answer. Bytes other than letters, digits and '_' are written as
// %XX. CommandOf() is the inverse.
std::string AnswerPath(const std::string& command) {
    std::string path = std::string(kDirectory) + "/";
    for (const char c : command) {
        char escaped[4];
        snprintf(escaped, sizeof(escaped), "%%%02X", static_cast<unsigned char>(c));
        const bool isPlain = isalnum(static_cast<unsigned char>(c)) != 0 || c == '_';
        path += isPlain ? std::string(1, c) : escaped;
    }
    return path;
}

std::string CommandOf(const std::string& file) {
    std::string command;
    for (size_t i = 0; i < file.length(); ++i) {
        if (file[i] == '%') {
            command += static_cast<char>(strtol(file.substr(i + 1, 2).c_str(), nullptr, 16));
            i += 2;
        } else {
            command += file[i];
        }
    }
    return command;
}

std::optional<std::string> ReadAnswer(const std::string& command) {
    std::optional<std::string> answer = ReadFile(AnswerPath(command));
    if (answer.has_value()) {
        host::Event("recorded_answer").Add("command", command);
    }
    return answer;
}

// Returns standard input without its final newline, because the tool appends one to an answer.
std::string ReadInput() {
    std::string text(kMaxAnswerBytes + 2, '\0');
    text.resize(fread(text.data(), 1, text.size(), stdin));
    if (!text.empty() && text.back() == '\n') {
        text.pop_back();
    }
    return text;
}

int RecordAnswer(const std::string& command, const std::string& answer) {
    if (answer.length() > kMaxAnswerBytes) {
        return Fail("answer: the text is longer than " + std::to_string(kMaxAnswerBytes) +
                    " bytes");
    }
    if (answer.find('\0') != std::string::npos) {
        return Fail("answer: the text contains a NUL byte");
    }
    return host::ReplaceFile(AnswerPath(command), answer)
                   ? 0
                   : FailForErrno("answer '" + command + "'");
}

int RemoveAnswer(const std::string& command) {
    if (host::RemoveFile(AnswerPath(command))) {
        return 0;
    }
    return errno == ENOENT ? Fail("no recorded answer for '" + command + "'; " + Command("answer") +
                                  " lists them")
                           : FailForErrno("answer '" + command + "'");
}

}  // namespace

std::set<std::string> RecordedCommands() {
    std::set<std::string> commands;
    for (const std::string& file : FilesIn(kDirectory)) {
        commands.insert(CommandOf(file));
    }
    return commands;
}

std::optional<std::string> FindAnswer(const std::string& command, const std::string& params) {
    const std::optional<std::string> answer =
            params.empty() ? std::nullopt : ReadAnswer(command + " " + params);
    return answer.has_value() ? answer : ReadAnswer(command);
}

int ListOrRecordAnswers(int argc, char** argv) {
    if (argc == 0) {
        for (const std::string& command : RecordedCommands()) {
            puts(command.c_str());
        }
        return 0;
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
        return RemoveAnswer(argv[1]);
    }
    if (command.empty() || command.front() == '-') {
        return Fail("answer: invalid command '" + command + "'", kUsageError);
    }
    const bool isInput = strcmp(argv[1], "-") == 0;
    const std::string answer = isInput ? ReadInput() : argv[1];
    return ferror(stdin) == 0 ? RecordAnswer(command, answer)
                              : FailForErrno("cannot read standard input");
}

}  // namespace device
