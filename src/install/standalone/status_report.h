// The report of what is installed: the action "t".
#pragma once

/// Prints the report on standard output, changing nothing on disk. Returns 0.
int showStatus();

/// Prints the block of the current user's (`local`) or the shared installation.
void showInstallation(bool local);
