// The subcommand "doctor": what an interrupted run left, and putting it right.
#pragma once

#include <string>

struct DoctorOptions {
    std::string type; ///< "global" or "local"; empty: as the installer chooses
    std::string home; ///< where an unregistered installation may be; empty: the usual place
    bool apply = false;
    bool json = false;
};

/// Prints what was interrupted and what to do; with `apply` does it. Returns a ToolStatus:
/// ToolDiffers if something is left to do, ToolLocked if another run holds the lock.
[[nodiscard]] int examine(const DoctorOptions& options);
