// The codes that every operation on files and directories returns, and their texts.
#pragma once

#include <string>

/// Result of a file operation. The numbers are printed and therefore fixed.
enum FileCode : int {
    FileOk = 0,
    CannotOpenForReading = 1,
    CannotOpenForWriting = 2,
    CannotCreateFile = 3,
    CannotRead = 4,
    CannotWrite = 5,
    OutOfSpace = 6,
    AccessDenied = 7,
    CannotClose = 8,
    CannotRename = 9,
    CannotDelete = 10,
    CannotCreateDirectory = 11,
    CannotRemoveDirectory = 12,
    CannotChangeMode = 13,
    RunInterrupted = 14, ///< a signal asked the run to stop; not one of the texts below
};

/// The text of `code`; "Unknown error" for a number above 13.
[[nodiscard]] std::string fileErrorText(unsigned code);

/// The code of a failed write with the `errno` `error`. EACCES is AccessDenied (7),
/// ENOSPC is OutOfSpace (6), everything else CannotWrite (5).
[[nodiscard]] int writeErrorCode(int error);
