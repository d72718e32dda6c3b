// The exit statuses of zorctl: one table for all subcommands.
#pragma once

enum ExitStatus : int {
    ExitAsAsked = 0,        ///< done, or everything is as it should be
    ExitDifferences = 1,    ///< differences or damage; of "run", also the installer's failure
    ExitCouldNotCheck = 2,  ///< could not check, or wrong usage
    ExitNoInstallation = 3, ///< there is no installation to speak of
    ExitBadPackage = 65,    ///< "run": the package cannot be installed
    ExitLocked = 75,        ///< "run": another run holds the lock
    ExitBadSignature = 77,  ///< "run": no valid signature of an allowed signer
};
