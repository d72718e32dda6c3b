#include "file_replacement.h"

#include "file_codes.h"
#include "file_writing.h"
#include "safe_path.h"
#include "scoped.h"

#include <cerrno>
#include <cstring>
#include <utility>
#include <vector>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

const std::string TemporarySuffix = ".wzorinst-new";

namespace {

constexpr int MaxTries = 1000;
constexpr useconds_t PauseMicroseconds = 10000;
constexpr const char* AccessList = "system.posix_acl_access";

std::string temporaryName(const Place& place)
{
    return place.name + TemporarySuffix;
}

/// Fills `names` with the extended attributes of `file`, each ended by a NUL; none if unsupported.
/// Returns false if they cannot be read.
bool readAttributeNames(int file, std::vector<char>& names)
{
    const ssize_t size = flistxattr(file, nullptr, 0);
    if (size < 0)
        return errno == ENOTSUP || errno == ENOSYS;
    names.resize(static_cast<std::size_t>(size));
    return size == 0 || flistxattr(file, names.data(), names.size()) == size;
}

/// The value of an extended attribute; false if it cannot be read.
bool readAttribute(int file, const char* name, std::vector<char>& value)
{
    const ssize_t size = fgetxattr(file, name, nullptr, 0);
    if (size < 0)
        return false;
    value.resize(static_cast<std::size_t>(size));
    return fgetxattr(file, name, value.data(), value.size()) == size;
}

bool copyExtendedAttributes(int from, int to)
{
    bool hasAccessList = false;
    std::vector<char> names;
    if (!readAttributeNames(from, names))
        return false;
    for (std::size_t at = 0; at < names.size(); at += std::strlen(&names[at]) + 1) {
        const char* const name = &names[at];
        hasAccessList = hasAccessList || std::strcmp(name, AccessList) == 0;
        std::vector<char> wanted;
        std::vector<char> present;
        if (!readAttribute(from, name, wanted))
            return false;
        // The new file may already have it, such as a security label, which a user cannot always
        // set.
        if (readAttribute(to, name, present) && present == wanted)
            continue;
        if (fsetxattr(to, name, wanted.data(), wanted.size(), 0) != 0)
            return false;
    }
    if (!hasAccessList)
        (void)fremovexattr(to, AccessList); // inherited from the directory, if at all
    return true;
}

/// True if `file` is what the temporary name of `place` leads to.
bool isTemporary(const Place& place, const ScopedFd& file)
{
    struct stat open = {};
    struct stat named = {};
    return fstat(file.get(), &open) == 0 &&
           fstatat(place.fd(), temporaryName(place).c_str(), &named, AT_SYMLINK_NOFOLLOW) == 0 &&
           identityOf(open) == identityOf(named);
}

/// Waits until the run that is writing the temporary file of `place` has finished; deletes the file
/// if that run was killed, or if somebody else planted it. Returns 0, or EAGAIN if it takes too
/// long.
int waitForOtherRun(const Place& place)
{
    const std::string name = temporaryName(place);
    const ScopedFd other(openat(place.fd(), name.c_str(),
                                O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    struct stat status = {};
    const bool isOfARun = other.isOpen() && fstat(other.get(), &status) == 0 &&
                          S_ISREG(status.st_mode) && isTrustedOwner(status.st_uid);
    for (int tries = 0; isOfARun && flock(other.get(), LOCK_EX | LOCK_NB) != 0; ++tries) {
        if (tries == MaxTries)
            return EAGAIN;
        (void)usleep(PauseMicroseconds);
    }
    if (!other.isOpen() || isTemporary(place, other))
        (void)unlinkat(place.fd(), name.c_str(), 0); // if it remains, creating fails again
    return 0;
}

/// Creates the temporary file of `place` and locks it, so that no other run takes it for that of a
/// killed one. Returns 0 or an `errno`.
int createTemporary(const Place& place, ScopedFd& file)
{
    const std::string name = temporaryName(place);
    for (int tries = 0; tries < MaxTries; ++tries) {
        file = ScopedFd(openat(place.fd(), name.c_str(),
                               O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, UnfinishedMode));
        int error = file.isOpen() ? 0 : errno;
        if (file.isOpen() && flock(file.get(), LOCK_EX | LOCK_NB) == 0 && isTemporary(place, file))
            return 0;
        if (error == EEXIST)
            error = waitForOtherRun(place);
        if (error != 0)
            return error;
    }
    return EAGAIN;
}

void deleteTemporary(const Place& place)
{
    (void)unlinkat(place.fd(), temporaryName(place).c_str(), 0);
}

/// True if the file must be written in place when creating a temporary file fails with `error`.
bool needsWritingInPlace(int error)
{
    return error == EACCES || error == EPERM || error == EROFS || error == ENAMETOOLONG;
}

/// Lets `write` fill `file`. Returns 0 or the `errno` of the first failed write.
int fill(int file, const ContentWriter& write)
{
    ScopedFd own(fcntl(file, F_DUPFD_CLOEXEC, 0));
    if (!own.isOpen())
        return errno;
    ScopedFile stream(fdopen(own.get(), "w"));
    if (!stream)
        return errno;
    (void)own.release(); // the stream owns it now

    errno = 0;
    write(stream.get());
    int error = errno;
    const bool flushed = std::fflush(stream.get()) == 0;
    if (!flushed)
        error = errno;
    const bool written = flushed && std::ferror(stream.get()) == 0;
    if (std::fclose(stream.release()) == 0 && written)
        return 0;
    return error != 0 ? error : EIO;
}

/// Reads which file is open. Returns 0 or an `errno`.
int readIdentity(const ScopedFd& file, FileIdentity& identity)
{
    struct stat status = {};
    if (fstat(file.get(), &status) != 0)
        return errno;
    identity = identityOf(status);
    return 0;
}

int truncated(int file)
{
    struct stat status = {};
    if (fstat(file, &status) == 0 && S_ISREG(status.st_mode) && ftruncate(file, 0) != 0)
        return errno;
    return 0;
}

int writeInPlace(ScopedFd& existing, const ContentWriter& write, FileIdentity* written)
{
    FileIdentity identity;
    int error = readIdentity(existing, identity);
    if (error == 0)
        error = truncated(existing.get());
    if (error == 0)
        error = fill(existing.get(), write);
    if (error == 0 && written != nullptr)
        *written = identity;
    return error == 0 ? closeWritten(existing) : writeErrorCode(error);
}

/// What finish() returns if the temporary file cannot get the attributes that it needs.
constexpr int CannotPassOn = -1;

/// Writes the temporary file and gives it its attributes, only then, since these may let others
/// write to it; puts it in place. Returns 0, CannotPassOn (-1) or an `errno`.
int finish(const Place& place, ScopedFd& temporary, const ContentWriter& write,
           const std::function<bool(int)>& setAttributes, FileIdentity* written)
{
    int error = fill(temporary.get(), write);
    if (error == 0 && !setAttributes(temporary.get()))
        error = CannotPassOn;
    if (error == 0)
        error = syncFile(temporary.get());
    FileIdentity identity;
    if (error == 0)
        error = readIdentity(temporary, identity);
    const ScopedFd lock(fcntl(temporary.get(), F_DUPFD_CLOEXEC, 0)); // held until the renaming
    if (error == 0 && close(temporary.release()) != 0)
        error = errno;
    if (error == 0 &&
        renameat(place.fd(), temporaryName(place).c_str(), place.fd(), place.name.c_str()) != 0)
        error = errno;
    if (error != 0)
        deleteTemporary(place);
    else if (written != nullptr)
        *written = identity;
    return error;
}

int createNew(const Place& place, mode_t mode, const ContentWriter& write, FileIdentity* written)
{
    ScopedFd temporary(-1);
    if (createTemporary(place, temporary) != 0)
        return CannotOpenForWriting;
    const int error = finish(
        place, temporary, write,
        [&](int file) {
            (void)fchmod(file, underUmask(mode)); // the content is what counts
            return true;
        },
        written);
    return error == 0 ? FileOk : writeErrorCode(error);
}

int replaceExisting(const Place& place, ScopedFd& existing, const ContentWriter& write,
                    FileIdentity* written)
{
    ScopedFd temporary(-1);
    int error = createTemporary(place, temporary);
    if (error != 0)
        return needsWritingInPlace(error) ? writeInPlace(existing, write, written)
                                          : writeErrorCode(error);

    error = finish(
        place, temporary, write, [&](int file) { return copyAttributes(existing.get(), file); },
        written);
    if (error == CannotPassOn || error == EBUSY) // EBUSY: something is mounted on it
        return writeInPlace(existing, write, written);
    return error == 0 ? FileOk : writeErrorCode(error);
}

} // namespace

bool copyAttributes(int from, int to)
{
    struct stat wanted = {};
    struct stat present = {};
    if (fstat(from, &wanted) != 0 || fstat(to, &present) != 0)
        return false;
    const bool isOwned = wanted.st_uid == present.st_uid && wanted.st_gid == present.st_gid;
    if (!isOwned && fchown(to, wanted.st_uid, wanted.st_gid) != 0)
        return false;
    // After the owner, whose change clears bits; an access list then refines the mode.
    return fchmod(to, wanted.st_mode & ALLPERMS) == 0 && copyExtendedAttributes(from, to);
}

int replaceFile(const std::string& path, mode_t mode, const ContentWriter& write,
                FileIdentity* written)
{
    Place place;
    const int found = findPlace(path, LastLink::Follow, place);
    if (found != 0) {
        errno = found == StrangersLink ? ENOENT : found;
        return CannotOpenForWriting;
    }

    ScopedFd existing = openPlace(place, O_WRONLY);
    if (!existing.isOpen())
        return errno == ENOENT ? createNew(place, mode, write, written) : CannotOpenForWriting;

    struct stat status = {};
    if (!place.isMagic && fstat(existing.get(), &status) == 0 && S_ISREG(status.st_mode))
        return replaceExisting(place, existing, write, written);
    return writeInPlace(existing, write, written);
}

void deleteTemporaryFile(const std::string& path)
{
    Place place;
    if (findPlace(path, LastLink::Follow, place) == 0)
        deleteTemporary(place);
}
