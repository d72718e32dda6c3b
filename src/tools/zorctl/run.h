// The subcommand "run": the installer under a lock, on a package that was checked.
//
// What is verified is what is installed: the package is copied once into a directory that nobody
// else can enter, and signature, check, plan and installer all read that copy.
#pragma once

#include <string>
#include <vector>

struct RunOptions {
    std::vector<std::string> arguments; ///< of wzorinst
    std::string signers;      ///< file of allowed signers; empty: no signature is asked for
    std::string signature;    ///< its file; empty: that of the package with ".sig"
    std::string logDirectory; ///< empty: the usual one
    int wait = 600;           ///< seconds to wait for the lock
};

/// Runs the installer. Returns its exit status (0 or 1), or ToolTrouble, ToolBadPackage,
/// ToolLocked or ToolBadSignature: it was not started then.
[[nodiscard]] int runInstaller(const RunOptions& options);
