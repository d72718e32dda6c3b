// A command line of the installer, parsed by the installer's own parser.
#pragma once

#include "command_line.h"

#include <string>
#include <vector>

/// A run of the installer, as its command line asks for it.
struct PlannedRun {
    CommandLine commandLine;
    std::string error; ///< why the installer would refuse the command line; empty if it would not
};

/// Parses the command line "wzorinst `arguments`", also into the process-wide settings, so it can
/// be called once.
[[nodiscard]] PlannedRun parseRun(const std::vector<std::string>& arguments);
