// The command line of the generators: an optional or required folder and one
// flag (--check, --list). Parsed with CLI11 in one place, so that its
// header-only parser is compiled once for all of them.
#pragma once

#include <optional>
#include <string>

struct ToolArguments {
    const char* description; // what the program does, for --help
    const char* folderHelp;  // what the folder is
    bool folderRequired;     // whether the folder must be given
    const char* flagName;    // e.g. "--check"
    const char* flagHelp;    // what the flag does
};

// Fills `folder` and `flag` from argv. Returns the exit code when the program
// should stop at once (--help, or a usage error, already printed), nothing
// when it should go on.
std::optional<int> parseToolArguments(int argc, char** argv, const ToolArguments& arguments, std::string& folder,
                                      bool& flag);
