#include "installation_lock.h"

#include "locations.h"
#include "paths.h"
#include "shown_text.h"
#include "tool_output.h"

#include <cerrno>
#include <ctime>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr const char* SharedLock = "/run/wzorinst.lock";
constexpr const char* LocalLockName = ".wzorinst.lock";
constexpr mode_t LockMode = 0600; // whoever can open the file can hold the lock for ever

time_t now()
{
    timespec moment = {};
    (void)clock_gettime(CLOCK_MONOTONIC, &moment); // always there
    return moment.tv_sec;
}

void pauseShortly()
{
    const timespec moment = {0, 100'000'000};
    (void)nanosleep(&moment, nullptr); // a signal only shortens it
}

/// Closes an existing lock of our own, such as flock(1) makes, to other users.
void closeToOthers(const ScopedFd& file, const struct stat& status)
{
    if (status.st_uid == geteuid() && (status.st_mode & (S_IRWXG | S_IRWXO)) != 0)
        (void)fchmod(file.get(), LockMode); // the lock works all the same
}

} // namespace

std::string lockPath(bool local)
{
    if (!local)
        return SharedLock;
    const std::string home = homeDirectory();
    return home.empty() ? std::string() : joinPath(home, LocalLockName);
}

LockState takeLock(const std::string& path, bool exclusive, long waitSeconds, ScopedFd& lock)
{
    ScopedFd file(open(path.c_str(),
                       O_RDONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC,
                       LockMode));
    if (!file.isOpen()) // one of another user can be locked, too
        file =
            ScopedFd(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    struct stat status = {};
    if (!file.isOpen() || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode))
        return LockState::CannotLock;
    if (exclusive)
        closeToOthers(file, status);

    const time_t deadline = now() + waitSeconds;
    while (flock(file.get(), (exclusive ? LOCK_EX : LOCK_SH) | LOCK_NB) != 0) {
        if (errno != EWOULDBLOCK && errno != EINTR)
            return LockState::CannotLock;
        if (now() >= deadline)
            return LockState::Busy;
        pauseShortly();
    }
    lock = std::move(file);
    return LockState::Held;
}

ScopedFd lockForReading(bool local)
{
    const std::string path = lockPath(local);
    ScopedFd lock(-1);
    const LockState state = takeLock(path, false, 0, lock);
    if (state == LockState::Busy)
        complain("warning: another run holds " + shown(path) +
                 "; this may change while it is reported");
    else if (state != LockState::Held)
        complain("warning: cannot lock " + shown(path) + "; this may change while it is reported");
    return lock;
}
