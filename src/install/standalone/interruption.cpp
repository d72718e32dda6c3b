#include "interruption.h"

#include "settings.h"

#include <csignal>
#include <iostream>

#include <sys/wait.h>

namespace {

constexpr int ShellSignalBase = 128; // a shell's exit status for a command that a signal killed

volatile std::sig_atomic_t noted = 0;
bool interruptible = false;

void note(int signal)
{
    if (noted == 0) // later ones are ignored
        noted = signal;
}

} // namespace

void watchForSignals()
{
    for (const int signal : {SIGINT, SIGQUIT, SIGTERM, SIGHUP}) {
        struct sigaction action = {};
        if (sigaction(signal, nullptr, &action) != 0 || action.sa_handler == SIG_IGN)
            continue;
        action = {};
        action.sa_handler = note;
        action.sa_flags = SA_RESTART;              // no step fails because of a signal
        (void)sigaction(signal, &action, nullptr); // cannot fail
    }
}

ScopedInterruptible::ScopedInterruptible()
{
    interruptible = true;
}

ScopedInterruptible::~ScopedInterruptible()
{
    interruptible = false;
}

bool isInterrupted()
{
    return interruptible && noted != 0;
}

void noteStatusOfCommand(int status)
{
    for (const int signal : {SIGINT, SIGQUIT}) {
        const bool killed = WIFSIGNALED(status) && WTERMSIG(status) == signal;
        if (killed || (WIFEXITED(status) && WEXITSTATUS(status) == ShellSignalBase + signal))
            note(signal);
    }
}

void endBySignal()
{
    if (noted == 0)
        return;
    std::cout.flush();
    logstream->flush();
    (void)std::signal(noted, SIG_DFL); // cannot fail
    (void)std::raise(noted);
}
