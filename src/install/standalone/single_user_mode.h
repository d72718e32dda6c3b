// The single-user flag: an empty file in an installation that turns single-user mode on for every
// later run.
#pragma once

#include <string>

struct FileTransaction;

/// The flag of the installation in `home`.
[[nodiscard]] std::string singleUserFlagPath(const std::string& home);

/// Turns single-user mode on if the installation in `home` has the flag.
void detectSingleUserMode(const std::string& home);

/// Creates the flag in the installation in `home` and adds its path to the file index at
/// `indexPath` (null: no index). A failure is logged and has no other consequence. The flag is not
/// journalled.
void createSingleUserModeFlag(FileTransaction& transaction, const std::string& home,
                              const std::string* indexPath);
