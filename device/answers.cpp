#include "answers.h"

#include <algorithm>

#include "platform/events.h"
#include "platform/files.h"

namespace device {

namespace {

constexpr char kDirectory[] = "answers";

// A file name cannot contain a slash, and a command contains no newline.
std::string WithReplaced(std::string text, char from, char to) {
    std::replace(text.begin(), text.end(), from, to);
    return text;
}

std::string AnswerPath(const std::string& command) {
    return std::string(kDirectory) + "/" + WithReplaced(command, '/', '\n');
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
        commands.insert(WithReplaced(file, '\n', '/'));
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
