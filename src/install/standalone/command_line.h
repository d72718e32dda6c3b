// The command line of the installer: parsed once, left to right, into settings and a record.
//
// Settings that options print are printed at once, so what stands before "-o" goes to standard
// output and what stands behind it to the file.
#pragma once

#include "registry.h"

#include <string>

/// What one run was asked for, besides the settings.
struct CommandLine {
    char action = ' ';        ///< 'i' or 'r'
    std::string destDir;      ///< of the last "-d"; fixDestination() completes it
    std::string privatePath;  ///< of the last "-d", as it was given
    char privateAction = ' '; ///< the action if "-p" was given

    /// The installer's own record: its version and build date, the calling exploiter's identifier
    /// without a colon and, after fixDestination(), the destination.
    InstallRegistry request;
};

/// Parses the arguments into `commandLine` and the process-wide settings.
///
/// Returns 0, or 1 when the run ends here: the reason was printed, with the usage text where it
/// helps.
[[nodiscard]] int parseCommandLine(int argc, char** argv, CommandLine& commandLine);

/// Fixes the destination: `defaultDir` unless the command line names another, without a final
/// slash. Returns 0, or 1 when there is none: that and the usage text were printed.
[[nodiscard]] int fixDestination(CommandLine& commandLine, const std::string& defaultDir);

/// Prints the usage text on standard output and returns 1, the exit status that goes with it.
int printUsage();
