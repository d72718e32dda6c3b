// Signals that ask a run to stop: INT, QUIT, TERM and HUP.
//
// A run that changes an installation must not end in the middle of it. From watchForSignals() on,
// the first such signal is only noted. While an installation or upgrade can still be undone (a
// ScopedInterruptible lives), its steps look at it, and the run stops like any failed run at that
// point. Everything else, such as a commit or a removal, is finished first. endBySignal(), at the
// end of the run, lets the signal end the process as the caller expects. Signals that the caller
// ignores stay ignored.
#pragma once

/// Starts to note signals. Commands that are run get the default handling back.
void watchForSignals();

/// While it lives, a signal stops the run at its next step.
class ScopedInterruptible {
public:
    ScopedInterruptible();
    ScopedInterruptible(const ScopedInterruptible&) = delete;
    ScopedInterruptible& operator=(const ScopedInterruptible&) = delete;
    ~ScopedInterruptible();
};

/// True if a signal was noted and the run is interruptible: the caller's step is not made.
[[nodiscard]] bool isInterrupted();

/// Notes a signal if `status`, the raw status of a command, says that INT or QUIT killed it, or
/// that a shell reports so (exit status 130 or 131). The key for it was pressed to stop the run.
void noteStatusOfCommand(int status);

/// If a signal was noted, flushes all output and ends the process by that signal.
void endBySignal();
