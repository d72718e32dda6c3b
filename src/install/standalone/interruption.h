// Signals that ask a run to stop: INT, QUIT, TERM and HUP.
//
// A run must not leave an installation half changed. After watchForSignals(), the first such signal
// is only recorded. While an installation or upgrade can still be undone (a ScopedInterruptible
// exists), each step checks for it, and the run stops like any run that fails at that point.
// Everything else, such as a commit or a removal, is finished first. At the end of the run,
// endBySignal() ends the process by the signal, as its caller expects. Signals that the caller
// ignores stay ignored.
#pragma once

/// Starts recording signals. Commands that are run have the default handling.
void watchForSignals();

/// While one of these exists, a signal stops the run at its next step.
class ScopedInterruptible {
public:
    ScopedInterruptible();
    ScopedInterruptible(const ScopedInterruptible&) = delete;
    ScopedInterruptible& operator=(const ScopedInterruptible&) = delete;
    ~ScopedInterruptible();
};

/// True if a signal was recorded and the run is interruptible: the caller must stop.
[[nodiscard]] bool isInterrupted();

/// Notes a signal if `status`, the raw status of a command, says that INT or QUIT killed it, or
/// that a shell reports so (exit status 130 or 131). The key for it was pressed to stop the run.
void noteStatusOfCommand(int status);

/// If a signal was recorded, flushes all output and ends the process by that signal.
void endBySignal();
