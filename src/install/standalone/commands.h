// Running external commands through the shell.
#pragma once

#include <string>

/// Runs `program` with `arguments` (passed as they are, quoting included) through the shell, and
/// logs the command and its status. Its output is suppressed except in debug mode.
///
/// `directory` is where the program is: part of the interface, not used. Returns the raw status of
/// system(): 0 is success.
int runCommand(const std::string& program, const std::string& directory,
               const std::string& arguments);

/// `text` as one argument of a command: in double quotes if it contains a blank, otherwise as it
/// is.
[[nodiscard]] std::string quotedIfBlank(const std::string& text);

/// Puts the toolkit's libraries in `home` at the front of LD_LIBRARY_PATH, for the commands that
/// are run from now on. A second call adds them again. A failure is logged and ignored.
void setLibraryPath(const std::string& home);
