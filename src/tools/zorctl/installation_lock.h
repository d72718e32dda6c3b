// The lock under which installations are changed: /run/wzorinst.lock, per user ~/.wzorinst.lock.
//
// It is the one of flock(1) in the documents, so that scripts and "zorctl run" keep each other out.
#pragma once

#include "scoped.h"

#include <string>

/// The lock file of the shared installation, or of the current user's; empty if there is none.
[[nodiscard]] std::string lockPath(bool local);

enum class LockState {
    Held,
    Busy,       ///< another run holds it
    CannotLock, ///< the file cannot be created or opened
};

/// Takes the lock `path`, exclusively or together with other readers, and gives up after
/// `waitSeconds`. `lock` holds it until it is closed.
[[nodiscard]] LockState takeLock(const std::string& path, bool exclusive, long waitSeconds,
                                 ScopedFd& lock);

/// takeLock() for a subcommand that only looks: without waiting, and with a warning on standard
/// error if it is not held. Returns the lock, or -1.
[[nodiscard]] ScopedFd lockForReading(bool local);
