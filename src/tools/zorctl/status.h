// The subcommand "status": what is installed, for whom, and whether it is intact.
#pragma once

#include <string>

struct StatusOptions {
    std::string format = "text"; ///< "text", "json" or "shell"
    bool allUsers = false;
    std::string type;      ///< "global" or "local": only these; empty: both
    std::string exploiter; ///< only installations that it uses; empty: all
};

/// Prints the report on standard output; changes nothing. Returns a ToolStatus: ToolDiffers if
/// an installation is damaged, ToolNotInstalled if there is none, ToolTrouble if the only
/// registries there are cannot be read.
[[nodiscard]] int showStatusReport(const StatusOptions& options);
