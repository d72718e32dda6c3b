// Running other programs without a shell.
#pragma once

#include <string>
#include <vector>

/// The program `name` as the tools use it: next to the tool's own file, else in a directory of PATH
/// that is absolute. Empty if there is none.
[[nodiscard]] std::string findProgram(const std::string& name);

/// What a child is started with, in addition to its arguments.
struct ChildSetup {
    int input = -1;  ///< its standard input; -1: /dev/null
    int output = -1; ///< its standard output; -1: ours
    int error = -1;  ///< its standard error; -1: ours
    int kept = -1;   ///< one more descriptor that it inherits; -1: none
};

/// runProgram() whose standard output goes to the descriptors `first` and `second`.
[[nodiscard]] int runProgramTwofold(const std::vector<std::string>& arguments, ChildSetup setup,
                                    int first, int second);

/// Runs the program `arguments[0]` and waits for it; TERM and HUP that reach us meanwhile are
/// passed on. Returns its wait status, or -1 if it could not be started.
[[nodiscard]] int runProgram(const std::vector<std::string>& arguments, const ChildSetup& setup);
