// Running a command through the shell without losing a signal.
#pragma once

#include <string>

/// Runs `command` by "/bin/sh -c" and waits for its end.
///
/// As system(), but the installer's own handling of INT and QUIT stays in force meanwhile: system()
/// ignores both, so a signal sent to the installer alone would be lost. The command gets the
/// default handling of every signal that the caller does not ignore. Returns the raw status of the
/// command, that of an exit with 127 if there is no shell, or -1 if no process can be started.
[[nodiscard]] int runShell(const std::string& command);
