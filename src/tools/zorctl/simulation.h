// What a run of the installer would do, worked out on a SimulatedTree.
//
// The decisions are the library's own: the parsing of the command line, the look at the registry,
// the steps of an extraction and of a removal. External commands are not run: a scanner control
// that is there is taken to succeed.
#pragma once

#include "command_line.h"
#include "simulated_tree.h"

#include <string>
#include <vector>

/// What a run would do, and how it would end.
struct Forecast {
    std::string type;   ///< "global" or "local"
    std::string action; ///< "i" or "r"
    std::string exploiter;
    std::string home;
    /// "fresh", "upgrade", "registration", "removal" (of the toolkit), "unregistration" (others
    /// remain), "none" (nothing to do) or "refused".
    std::string operation;
    std::string privateOperation; ///< "", "fresh" or "removal"
    std::string privateHome;
    std::string failure;    ///< why it would fail; empty if it would succeed
    bool unchanged = false; ///< the machine would be as it is now
    std::string package;    ///< the SPB; empty if none is read
    bool stopsScanners = false;
    std::vector<std::string> commands; ///< external programs it would run, of the toolkit

    SimulatedTree tree;
    std::vector<std::string> edited;      ///< files whose lines would be changed in place
    std::vector<std::string> ownerFiles;  ///< those of `tree`'s deleted files that nobody installed
    std::vector<std::string> notRestored; ///< what a rollback would not bring back
    unsigned long long spaceNeeded = 0;   ///< at most, in bytes, while old and new files are there
    unsigned long long spaceAvailable = 0; ///< for this user, where home is
};

/// A run of the installer, as its command line asks for it.
struct PlannedRun {
    CommandLine commandLine;
    std::string error; ///< why the installer would refuse the command line; empty if it would not
};

/// Parses the command line "wzorinst `arguments`", also into the process-wide settings, so it can
/// be called once.
[[nodiscard]] PlannedRun parseRun(const std::vector<std::string>& arguments);

/// Works out the run, which parseRun() accepted. The settings are those of the run afterwards.
[[nodiscard]] Forecast forecastRun(const PlannedRun& run);

/// `arguments` without "-o" and its file, as the installer's own parser would find them.
[[nodiscard]] std::vector<std::string> withoutLogFile(const std::vector<std::string>& arguments);
