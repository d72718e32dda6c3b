// The directory for the toolkit's log and trace files, and the command that makes the toolkit use
// it.
#pragma once

#include <string>

struct FileTransaction;

/// The toolkit's log directory below the common directory `common`.
[[nodiscard]] std::string commonLogDir(const std::string& common);

/// Makes sure that the toolkit's log directory exists: `customPath` if `useCustomPath`, otherwise
/// the one in the common directory, which is created as well. `home` is part of the interface, not
/// used. Always returns 0.
int setupCommonLogDir(FileTransaction& transaction, const std::string& home, bool useCustomPath,
                      const std::string& customPath);

/// Calls setupCommonLogDir(), then runs the scanner control program to set the directory of the
/// toolkit's trace files. Returns the status of that program, or RunInterrupted (14).
[[nodiscard]] int updateCommonTracePath(FileTransaction& transaction, const std::string& home,
                                        bool useCustomPath, const std::string& customPath);
