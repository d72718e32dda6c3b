// The subcommand "verify": does an installation hold what the package put there?
#pragma once

#include <string>

struct VerifyOptions {
    std::string spb;  ///< the package; empty: compare with the index alone
    std::string type; ///< "global" or "local"; empty: as the installer chooses
    bool json = false;
    bool noForeign = false;    ///< leave files out that the package did not bring
    bool noCustomised = false; ///< leave settings out that the owner changed
    bool strict = false;       ///< these two count as differences, too
};

/// Prints what differs; changes nothing. Returns a ToolStatus.
[[nodiscard]] int verifyInstallation(const VerifyOptions& options);
