// Replaces the library's runShell(): the installer without the cost of its external commands.
//
// SELinux is not there, everything else succeeds.
#include "shell_command.h"

#include <sys/wait.h>

int runShell(const std::string& command)
{
    constexpr int NotFound = 127;
    const bool asksForSelinux = command.rfind("/usr/sbin/selinuxenabled", 0) == 0;
    return asksForSelinux ? W_EXITCODE(NotFound, 0) : 0;
}
