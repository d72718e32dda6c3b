// The command line of the installer: parsed once, left to right, into settings and a record.
//
// An option that prints its setting does so at once: lines of options before "-o" go to standard
// output, lines of options after it to the file.
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
/// Returns 0, or 1 if the run ends here: the reason was printed, for most errors with the usage
/// text.
[[nodiscard]] int parseCommandLine(int argc, char** argv, CommandLine& commandLine);

/// Sets the destination: `defaultDir` unless the command line names another, without a final
/// slash. Returns 0, or 1 if there is none: an error and the usage text were printed.
[[nodiscard]] int fixDestination(CommandLine& commandLine, const std::string& defaultDir);

/// Prints the usage text on standard output. Returns 1, the exit status of a usage error.
int printUsage();
