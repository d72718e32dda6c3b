// Private mode: the last step of a run with "-p", which installs into, or removes, a directory of
// the caller without using a registry.
#pragma once

#include "command_line.h"

/// Carries out the private action of `commandLine` on its private path; logs its steps.
///
/// Nothing is committed or rolled back. Returns the status of the run: 0 after a removal, the
/// result of the fresh installation, or `status` as it was for any other action.
[[nodiscard]] int performPrivateAction(const CommandLine& commandLine, int status);
