#include "shell_command.h"

#include <cerrno>

#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr int NoShell = 127; // the exit status that shells give for a command they cannot find

} // namespace

int runShell(const std::string& command)
{
    std::string shell = "sh";
    std::string option = "-c";
    std::string text = command;
    char* const arguments[] = {shell.data(), option.data(), text.data(), nullptr};
    pid_t child = 0;
    const int error = posix_spawn(&child, "/bin/sh", nullptr, nullptr, arguments, environ);
    if (error != 0)
        return error == EAGAIN || error == ENOMEM ? -1 : W_EXITCODE(NoShell, 0);

    int status = -1;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR)
            return -1;
    }
    return status;
}
