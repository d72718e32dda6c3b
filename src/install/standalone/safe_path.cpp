#include "safe_path.h"

#include <array>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string_view>
#include <utility>

#include <linux/magic.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <sys/vfs.h>
#include <unistd.h>

namespace {

constexpr int MaxLinks = 40; // as the kernel
constexpr uid_t OverflowUid = 65534;
constexpr int DirectoryFlags = O_PATH | O_DIRECTORY | O_CLOEXEC;
constexpr int ComponentFlags = O_PATH | O_NOFOLLOW | O_CLOEXEC;

/// Keeps a name that was planted meanwhile from being followed, from blocking, and from becoming
/// our terminal.
constexpr int CautiousFlags = O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;

struct Reuse {
    int guards = 0;
    std::string path;
    std::shared_ptr<const ScopedFd> directory;
};

Reuse& reuse()
{
    static Reuse state;
    return state;
}

/// True if the user namespace maps every user, so that no owner is shown as OverflowUid in place of
/// an unmapped one.
bool namespaceMapsEverybody()
{
    const ScopedFile map(std::fopen("/proc/self/uid_map", "re"));
    char line[64] = {};
    if (!map || std::fgets(line, sizeof line, map.get()) == nullptr)
        return false;
    char* rest = line; // "inside outside count": everybody is 0, 0 and the largest number
    const unsigned long inside = std::strtoul(rest, &rest, 10);
    const unsigned long outside = std::strtoul(rest, &rest, 10);
    const unsigned long count = std::strtoul(rest, &rest, 10);
    return inside == 0 && outside == 0 && count == UINT_MAX;
}

/// Opens `path` in one system call, provided that no link is on it; see takesWalk().
ScopedFd openWithoutLinks(const std::string& path, int flags)
{
    struct open_how how = {};
    how.flags = static_cast<unsigned>(flags);
    how.resolve = RESOLVE_NO_SYMLINKS;
    return ScopedFd(
        static_cast<int>(syscall(SYS_openat2, AT_FDCWD, path.c_str(), &how, sizeof how)));
}

/// True if openWithoutLinks() failed with `error` because of a link, or because the system does not
/// have or does not allow the call. Any other error would also end a walk.
bool takesWalk(int error)
{
    return error == ELOOP || error == ENOSYS || error == EPERM;
}

std::shared_ptr<const ScopedFd> shared(ScopedFd fd)
{
    return std::make_shared<const ScopedFd>(std::move(fd));
}

/// The directory `path` if no link leads to it; null, with `errno`, otherwise.
std::shared_ptr<const ScopedFd> directoryWithoutLinks(std::string_view path)
{
    Reuse& last = reuse();
    if (last.directory && last.path == path)
        return last.directory;

    ScopedFd fd = openWithoutLinks(std::string(path), DirectoryFlags);
    if (!fd.isOpen())
        return nullptr;
    auto directory = shared(std::move(fd));
    if (last.guards != 0) {
        last.path = path;
        last.directory = directory;
    }
    return directory;
}

/// What `link`, a symbolic link opened with O_PATH, points to; nothing, with `errno`, on failure.
std::optional<std::string> targetOf(int link)
{
    std::array<char, PATH_MAX> target; // NOLINT(cppcoreguidelines-pro-type-member-init)
    const ssize_t size = readlinkat(link, "", target.data(), target.size());
    if (size < 0)
        return std::nullopt;
    return std::string(target.data(), static_cast<std::size_t>(size));
}

bool isOnProc(int fd)
{
    struct statfs status = {};
    return fstatfs(fd, &status) == 0 && status.f_type == PROC_SUPER_MAGIC;
}

/// One walk along a path. `rest_` is what is not resolved yet, relative to `directory_`.
class Walk {
public:
    Walk(std::string_view path, LastLink lastLink) : rest_(path), lastLink_(lastLink) {}

    /// See findPlace().
    int run(Place& place)
    {
        if (rest_.empty())
            return ENOENT;
        int code = enter(rest_[0] == '/' ? "/" : ".");
        while (code == 0 && !arrived_)
            code = step();
        if (code == 0)
            place = {shared(std::move(directory_)), rest_, isMagic_};
        return code;
    }

private:
    int enter(const char* start)
    {
        directory_ = ScopedFd(open(start, DirectoryFlags));
        return directory_.isOpen() ? 0 : errno;
    }

    /// Resolves the next component.
    int step()
    {
        rest_.erase(0, std::min(rest_.find_first_not_of('/'), rest_.size()));
        if (rest_.empty())
            return arriveAt(".");
        const std::size_t end = std::min(rest_.find('/'), rest_.size());
        const bool isLast = rest_.find_first_not_of('/', end) == std::string::npos;
        if (isLast && lastLink_ == LastLink::Keep)
            return arriveAt(rest_);

        const std::string name = rest_.substr(0, end);
        ScopedFd component(openat(directory_.get(), name.c_str(), ComponentFlags));
        if (!component.isOpen()) {
            const int error = errno;
            return isLast && error == ENOENT ? arriveAt(rest_) : error;
        }
        struct stat status = {};
        if (fstat(component.get(), &status) != 0)
            return errno;
        if (S_ISLNK(status.st_mode))
            return followLink(component, status, name, isLast);
        if (isLast && end != rest_.size() && !S_ISDIR(status.st_mode))
            return ENOTDIR;
        if (isLast)
            return arriveAt(name);         // without trailing slashes, which would follow a link
        directory_ = std::move(component); // if it is no directory, the next component fails
        rest_.erase(0, end);
        return 0;
    }

    int followLink(const ScopedFd& link, const struct stat& status, const std::string& name,
                   bool isLast)
    {
        if (++links_ > MaxLinks)
            return ELOOP;
        if (isOnProc(link.get()))
            return followMagicLink(name, isLast);
        if (!isTrustedOwner(status.st_uid))
            return StrangersLink;

        const auto target = targetOf(link.get());
        if (!target)
            return errno;
        rest_.replace(0, name.size(), *target);
        return !target->empty() && target->front() == '/' ? enter("/") : 0;
    }

    /// Links of /proc are the kernel's own; their text does not always lead anywhere.
    int followMagicLink(const std::string& name, bool isLast)
    {
        if (isLast) {
            isMagic_ = true;
            return arriveAt(name);
        }
        ScopedFd target(openat(directory_.get(), name.c_str(), O_PATH | O_CLOEXEC));
        if (!target.isOpen())
            return errno;
        directory_ = std::move(target);
        rest_.erase(0, name.size());
        return 0;
    }

    int arriveAt(std::string name)
    {
        rest_ = std::move(name);
        arrived_ = true;
        return 0;
    }

    std::string rest_;
    LastLink lastLink_;
    ScopedFd directory_{-1};
    int links_ = 0;
    bool arrived_ = false;
    bool isMagic_ = false;
};

bool isLink(const Place& place)
{
    struct stat status = {};
    return fstatat(place.fd(), place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISLNK(status.st_mode);
}

/// findPlace() for a path without any link, in one or two system calls. Returns ELOOP or another
/// code for which takesWalk() is true if the path must be walked.
int findPlaceWithoutLinks(std::string_view path, LastLink lastLink, Place& place)
{
    const std::size_t slash = path.rfind('/');
    if (slash == std::string_view::npos || slash == 0)
        return ELOOP;
    const std::string_view name = path.substr(slash + 1);
    if (name.empty() || name == "." || name == "..")
        return ELOOP;
    auto directory = directoryWithoutLinks(path.substr(0, slash));
    if (!directory)
        return errno;
    place = {std::move(directory), std::string(name)};
    return lastLink == LastLink::Follow && isLink(place) ? ELOOP : 0;
}

/// Sets `errno` to a result of findPlace(), a refused path being a missing one; returns -1.
int failed(int code)
{
    errno = code == StrangersLink ? ENOENT : code;
    return -1;
}

bool othersCanPlantIn(const Place& place)
{
    struct stat status = {};
    return fstat(place.fd(), &status) != 0 || othersCanPlant(status);
}

bool isPlainFile(const struct stat& status)
{
    return S_ISREG(status.st_mode) || S_ISDIR(status.st_mode);
}

/// Opens the FIFO, socket or device at `place` as the caller asked, even if that blocks.
ScopedFd openSpecialFile(const Place& place, int flags)
{
    if (othersCanPlantIn(place)) {
        errno = ENXIO;
        return ScopedFd(-1);
    }
    return ScopedFd(
        openat(place.fd(), place.name.c_str(), flags | O_NOFOLLOW | O_NOCTTY | O_CLOEXEC));
}

bool isPlantedHardLink(const Place& place, const struct stat& status)
{
    return S_ISREG(status.st_mode) && status.st_nlink > 1 && othersCanPlantIn(place);
}

/// Opens what exists at `place` for writing. Returns 0 or an `errno`.
int openExisting(const Place& place, Existing existing, int access, ScopedFd& file)
{
    ScopedFd fd = openPlace(place, access | (existing == Existing::Append ? O_APPEND : 0));
    if (!fd.isOpen())
        return errno;
    struct stat status = {};
    if (fstat(fd.get(), &status) != 0)
        return errno;
    if (isPlantedHardLink(place, status))
        return EPERM;
    if (existing == Existing::Truncate && S_ISREG(status.st_mode) && status.st_size != 0 &&
        ftruncate(fd.get(), 0) != 0)
        return errno;
    file = std::move(fd);
    return 0;
}

/// Sets the mode of what `fd`, opened with O_PATH at `place`, refers to; false if that fails.
bool setModeOf(const ScopedFd& fd, const Place& place, const struct stat& status, mode_t mode)
{
    const std::string path = "/proc/self/fd/" + std::to_string(fd.get());
    if (chmod(path.c_str(), mode) == 0)
        return true;
    if (errno != ENOENT && errno != ENOTDIR)
        return false;

    // There is no /proc.
    const ScopedFd opened(openat(place.fd(), place.name.c_str(), O_RDONLY | CautiousFlags));
    struct stat again = {};
    return fstat(opened.get(), &again) == 0 && identityOf(again) == identityOf(status) &&
           fchmod(opened.get(), mode) == 0;
}

/// A stream that owns `fd`; null, with `errno`, if `fd` is not open or there is no memory.
ScopedFile streamOn(ScopedFd fd, const char* mode)
{
    if (!fd.isOpen())
        return nullptr;
    ScopedFile file(fdopen(fd.get(), mode));
    if (file)
        (void)fd.release(); // the stream owns it now
    return file;
}

int unlinkAt(const std::string& path, int flags)
{
    Place place;
    const int found = findPlace(path, LastLink::Keep, place);
    return found == 0 ? unlinkat(place.fd(), place.name.c_str(), flags) : failed(found);
}

} // namespace

ScopedDirectoryReuse::ScopedDirectoryReuse()
{
    ++reuse().guards;
}

ScopedDirectoryReuse::~ScopedDirectoryReuse()
{
    if (--reuse().guards == 0)
        reuse().directory.reset();
}

FileIdentity identityOf(const struct stat& status)
{
    return {status.st_dev, status.st_ino};
}

bool isTrustedOwner(uid_t owner)
{
    if (owner == 0)
        return true;
    return owner == getuid() && (owner != OverflowUid || namespaceMapsEverybody());
}

bool othersCanPlant(const struct stat& status)
{
    return !isTrustedOwner(status.st_uid) || (status.st_mode & (S_IWGRP | S_IWOTH)) != 0;
}

int findPlace(const std::string& path, LastLink lastLink, Place& place)
{
    const std::string_view text = path.c_str(); // to the first NUL, as the system reads it
    if (text.size() >= PATH_MAX)
        return ENAMETOOLONG;
    const int code = findPlaceWithoutLinks(text, lastLink, place);
    return takesWalk(code) ? Walk(text, lastLink).run(place) : code;
}

bool isPlainDirectory(const std::string& path)
{
    return path.size() < PATH_MAX && directoryWithoutLinks(path) != nullptr;
}

int statPath(const std::string& path, struct stat& status)
{
    for (const LastLink lastLink : {LastLink::Keep, LastLink::Follow}) {
        Place place;
        const int found = findPlace(path, lastLink, place);
        if (found != 0)
            return failed(found);
        const int flags = place.isMagic ? 0 : AT_SYMLINK_NOFOLLOW;
        if (fstatat(place.fd(), place.name.c_str(), &status, flags) != 0)
            return -1;
        if (!S_ISLNK(status.st_mode))
            return 0;
    }
    return failed(ENOENT); // a link that was planted just now
}

bool pathExists(const std::string& path)
{
    struct stat status = {};
    return statPath(path, status) == 0;
}

bool pathIsMissing(const std::string& path)
{
    if (pathExists(path))
        return false;
    // A failing disk can return EACCES once. Only if the second lookup fails with it as well does
    // it come from the mode of a directory, so that nothing there could be moved or opened.
    // cppcheck-suppress knownConditionTrueFalse // the second lookup may give another result
    if (errno == EACCES && pathExists(path))
        return false;
    return errno == ENOENT || errno == ENOTDIR || errno == ELOOP || errno == ENAMETOOLONG ||
           errno == EACCES;
}

ScopedFd openPlace(const Place& place, int flags)
{
    if (place.isMagic || (flags & O_PATH) != 0)
        return ScopedFd(openat(place.fd(), place.name.c_str(),
                               flags | O_CLOEXEC | (place.isMagic ? 0 : O_NOFOLLOW)));

    ScopedFd fd(openat(place.fd(), place.name.c_str(), flags | CautiousFlags));
    if (!fd.isOpen()) {
        if (errno == ENXIO) // a FIFO without a reader
            return openSpecialFile(place, flags);
        if (errno == ELOOP) // a link that was planted just now
            errno = ENOENT;
        return fd;
    }
    struct stat status = {};
    if (fstat(fd.get(), &status) != 0)
        return ScopedFd(-1);
    return isPlainFile(status) ? std::move(fd) : openSpecialFile(place, flags);
}

ScopedFd openPath(const std::string& path, int flags)
{
    if ((flags & O_PATH) == 0) {
        ScopedFd fd = openWithoutLinks(path, flags | CautiousFlags | O_LARGEFILE);
        struct stat status = {};
        if (fd.isOpen() && fstat(fd.get(), &status) == 0 && isPlainFile(status))
            return fd;
        if (!fd.isOpen() && errno == ENOENT) // no link comes before what is missing
            return fd;
    }

    Place place;
    const int found = findPlace(path, LastLink::Follow, place);
    if (found != 0) {
        (void)failed(found);
        return ScopedFd(-1);
    }
    return openPlace(place, flags);
}

ScopedFile openForReading(const std::string& path)
{
    return streamOn(openPath(path, O_RDONLY), "r");
}

int openForWriting(const std::string& path, Existing existing, mode_t mode, WritableFile& file,
                   int access)
{
    // O_EXCL never follows a link. Only if the name is taken, a link of ours may lead elsewhere.
    int error = EEXIST;
    Place place;
    for (const LastLink lastLink : {LastLink::Keep, LastLink::Follow}) {
        const int found = findPlace(path, lastLink, place);
        if (found != 0)
            return found == StrangersLink ? ENOENT : found;
        const int append = existing == Existing::Append ? O_APPEND : 0;
        file.fd = ScopedFd(openat(place.fd(), place.name.c_str(),
                                  access | O_CREAT | O_EXCL | append | CautiousFlags, mode));
        file.created = file.fd.isOpen();
        if (file.created)
            return 0;
        error = errno;
        if (error != EEXIST)
            return error;
    }
    return existing == Existing::Refuse ? error : openExisting(place, existing, access, file.fd);
}

ScopedFile openStream(const std::string& path, Existing existing, mode_t mode, int access)
{
    WritableFile file;
    const int error = openForWriting(path, existing, mode, file, access);
    if (error != 0) {
        errno = error;
        return nullptr;
    }
    return streamOn(std::move(file.fd), existing == Existing::Append ? "a" : "w");
}

mode_t underUmask(mode_t mode)
{
    const mode_t mask = umask(0);
    (void)umask(mask);
    return mode & ~mask;
}

ModeChange changeMode(const std::string& path, mode_t mode)
{
    Place place;
    const int found = findPlace(path, LastLink::Follow, place);
    if (found != 0)
        return found == StrangersLink ? ModeChange::Failed : ModeChange::NothingThere;

    const ScopedFd fd(openat(place.fd(), place.name.c_str(), ComponentFlags));
    struct stat status = {};
    if (!fd.isOpen() || fstat(fd.get(), &status) != 0)
        return errno == ENOENT ? ModeChange::NothingThere : ModeChange::Failed;
    if (S_ISLNK(status.st_mode) || isPlantedHardLink(place, status))
        return ModeChange::Failed;
    return setModeOf(fd, place, status, mode) ? ModeChange::Changed : ModeChange::Failed;
}

int unlinkPath(const std::string& path)
{
    return unlinkAt(path, 0);
}

int removePath(const std::string& path)
{
    const int result = unlinkAt(path, 0);
    return result != 0 && errno == EISDIR ? unlinkAt(path, AT_REMOVEDIR) : result;
}

int removeDirectoryPath(const std::string& path)
{
    return unlinkAt(path, AT_REMOVEDIR);
}

int createDirectoryPath(const std::string& path, mode_t mode)
{
    Place place;
    const int found = findPlace(path, LastLink::Keep, place);
    return found == 0 ? mkdirat(place.fd(), place.name.c_str(), mode) : failed(found);
}
