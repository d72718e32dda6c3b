// The subcommand "plan": what a run of the installer would do.
#pragma once

#include <string>
#include <vector>

struct Forecast;

struct PlanOptions {
    std::vector<std::string> arguments; ///< of wzorinst
    bool json = false;
    bool files = false;    ///< name every file, not only the owner's
    int unchangedExit = 0; ///< the exit status if nothing would change
};

/// Prints what "wzorinst `arguments`" would do; changes nothing. Returns a ToolStatus:
/// ToolDiffers if the run would fail, ToolNotInstalled if it would find nothing to remove.
[[nodiscard]] int planRun(const PlanOptions& options);

/// Prints `forecast` for people.
void printForecast(const Forecast& forecast, bool files);
