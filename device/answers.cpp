#include "answers.h"

#include <cctype>
#include <cstdio>
#include <cstdlib>

#include "platform/events.h"
#include "platform/files.h"

namespace device {

namespace {

constexpr char kDirectory[] = "answers";

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
    std::optional<std::string> answer = host::ReadFile(AnswerPath(command));
    if (answer.has_value()) {
        host::Event("recorded_answer").Add("command", command);
    }
    return answer;
}

}  // namespace

std::set<std::string> RecordedCommands() {
    std::set<std::string> commands;
    for (const std::string& file : host::FilesIn(kDirectory)) {
        commands.insert(CommandOf(file));
    }
    return commands;
}

std::optional<std::string> FindAnswer(const std::string& command, const std::string& params) {
    if (command.find(' ') != std::string::npos) {
        return std::nullopt;  // the space would be read as the end of the command name
    }
    const std::optional<std::string> answer =
            params.empty() ? std::nullopt : ReadAnswer(command + " " + params);
    return answer.has_value() ? answer : ReadAnswer(command);
}

bool RecordAnswer(const std::string& command, const std::string& answer) {
    return host::ReplaceFile(AnswerPath(command), answer);
}

bool RemoveAnswer(const std::string& command) { return host::RemoveFile(AnswerPath(command)); }

}  // namespace device
