// What a run of the installer would do, and how it would end.
#pragma once

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

    unsigned long long blockSize = 0; ///< of the file system of home; 0: not measured

    /// Remembers why the run would fail; only the first reason counts.
    void fail(const std::string& reason);

    /// Remembers a file, or all files in a directory, that a rollback does not restore.
    void noteLoss(const std::string& path);

    /// Sets blockSize and spaceAvailable, once.
    void measureSpace();
};
