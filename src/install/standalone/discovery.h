// Finds the registered installation, checks whether it is intact, and decides what to do.
#pragma once

#include "command_line.h"
#include "registry.h"

#include <string>

/// What a run found and decided, before it changes anything.
struct Discovery {
    InstallRegistry registry; ///< of the registered installation; partly filled if not found
    int status = 0;           ///< a RegistryCode (0 to 3), HomeNotWritable or ScannerControlBroken
    bool registryFound = false;
    bool homeExists = false;    ///< the home directory, before this run
    bool upgradeNeeded = false; ///< the registered installation is not newer than this installer
    bool installAction = false; ///< install or upgrade; otherwise remove
    std::string indexPath;      ///< the file index
    std::string currentZorHome;
    std::string currentCfgHome;
};

/// Statuses that the verification adds to those of the registry. Printed and therefore fixed.
enum VerificationCode : int {
    HomeNotWritable = 5,
    ScannerControlBroken = 6, ///< missing or empty
};

/// Reads and verifies the registry of this run's install type and decides; logs each step.
///
/// Installing over a broken installation becomes an upgrade that tolerates failures to stop the
/// scanners. The home directory is probed by creating and deleting a file; with `readOnly`, by
/// asking the system, which changes nothing.
[[nodiscard]] Discovery discoverInstallation(const CommandLine& commandLine, bool readOnly = false);
