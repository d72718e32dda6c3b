// The exit statuses of the companion tools.
#pragma once

/// What a tool's subcommand ends with, unless its manual page says otherwise.
enum ToolStatus : int {
    ToolOk = 0,            ///< done as asked; nothing differs, nothing is damaged
    ToolDiffers = 1,       ///< differences or damage were found
    ToolTrouble = 2,       ///< could not be done or found out, or the command line is wrong
    ToolNotInstalled = 3,  ///< there is no installation
    ToolBadPackage = 65,   ///< "zorctl run": the package cannot be installed
    ToolLocked = 75,       ///< "zorctl run": another run holds the lock
    ToolBadSignature = 77, ///< "zorctl run": no valid signature of an allowed signer
    ToolInterrupted = 130, ///< ended from the keyboard
};
