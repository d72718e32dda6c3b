#include "interruption.h"

#include "settings.h"

#include <csignal>
#include <iostream>

#include <sys/wait.h>

namespace {

constexpr int WatchedSignals[] = {SIGINT, SIGQUIT, SIGTERM, SIGHUP};

constexpr int ShellSignalBase = 128; // a shell's exit status for a command that a signal killed

volatile std::sig_atomic_t noted = 0;
bool interruptible = false;

bool isIgnored(int signal)
{
    struct sigaction action = {};
    return sigaction(signal, nullptr, &action) == 0 && action.sa_handler == SIG_IGN;
}

void note(int signal)
{
    if (noted == 0) // later ones are ignored
        noted = signal;
}

} // namespace

void watchForSignals()
{
    for (const int signal : WatchedSignals) {
        if (isIgnored(signal))
            continue;
        struct sigaction action = {};
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
        const bool reported = WIFEXITED(status) && WEXITSTATUS(status) == ShellSignalBase + signal;
        if ((killed || reported) && !isIgnored(signal))
            note(signal);
    }
}

void endBySignal()
{
    std::cout.flush();
    logstream->flush();
    // From here on a signal ends the process by itself, so that none gets lost.
    for (const int signal : WatchedSignals) {
        if (!isIgnored(signal))
            (void)std::signal(signal, SIG_DFL); // cannot fail
    }
    if (noted != 0)
        (void)std::raise(noted);
}
