// Stopping and restarting the toolkit's scanners, through the toolkit's own control programs.
#pragma once

#include <string>

/// Result of stopScanners() if a step failed. The number is part of exit codes and fixed.
inline constexpr int ScannersNotStopped = 7;

/// True if `status` is 0 or failures of commands are tolerated.
[[nodiscard]] bool isAcceptable(int status);

/// Stops the scanners of the installation in `home`; `disable` also keeps them from being started,
/// `stopFileScanner` also stops the service of the file-system scanner.
///
/// Returns 0, or ScannersNotStopped (7) at the first step whose status is not acceptable; with
/// `ignoreUpdateErrors`, the default, statuses are ignored and the result is 0.
[[nodiscard]] int stopScanners(const std::string& home, bool disable, bool stopFileScanner);

/// Enables the scanners of the installation in `home` again. Returns the command's status.
[[nodiscard]] int restartScanners(const std::string& home);
