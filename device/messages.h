// Messages and exit statuses of the device's programs.
#pragma once

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

namespace device {

constexpr int kFailure = 1;
constexpr int kUsageError = 2;

// Prints the program's name and the message to standard error.
inline void PrintMessage(const std::string& message) {
    fprintf(stderr, "%s: %s\n", program_invocation_short_name, message.c_str());
}

// Prints an error like PrintMessage(). Returns `status`.
inline int Fail(const std::string& error, int status = kFailure) {
    PrintMessage(error);
    return status;
}

// Like Fail(), with the reason from errno.
inline int FailForErrno(const std::string& what) { return Fail(what + ": " + strerror(errno)); }

// Returns the command that the user would type to run this program with these arguments, quoted.
inline std::string Command(const std::string& arguments) {
    return std::string("'") + program_invocation_name + " " + arguments + "'";
}

// Returns the arguments, at least one, separated by spaces.
inline std::string Join(int argc, char** argv) {
    std::string text = argv[0];
    for (int i = 1; i < argc; ++i) {
        text.append(" ").append(argv[i]);
    }
    return text;
}

}  // namespace device
