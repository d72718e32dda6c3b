#include "tree_removal.h"

#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <ostream>
#include <string_view>
#include <utility>
#include <vector>

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int DirectoryFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;

bool isDotName(std::string_view name)
{
    return name == "." || name == "..";
}

/// What all levels together may hold of their directories' names, in bytes. One level may always
/// hold a block. A directory with more names is listed again once those that were held are gone.
constexpr std::size_t NamesLimit = std::size_t{32} * 1024 * 1024;

/// Adds names in the directory `fd` to `names`, in the order in which the system returns them, each
/// ended by a NUL, until there are no more or `names` has `limit` bytes. Returns true if there may
/// be more. A failure ends the list.
bool listNames(int fd, std::size_t limit, std::string& names)
{
    static char block[std::size_t{32} * 1024];
    do {
        const ssize_t size = getdents64(fd, block, sizeof block);
        if (size <= 0)
            return false;
        for (ssize_t at = 0; at < size;) {
            // Copied: the compiler knows the block only as characters.
            unsigned short length = 0;
            std::memcpy(&length, block + at + offsetof(dirent64, d_reclen), sizeof length);
            names += block + at + offsetof(dirent64, d_name);
            names += '\0';
            at += length;
        }
    } while (names.size() < limit);
    return true;
}

/// Deletes a tree. It moves by descriptors, never by paths, so that directories that are swapped or
/// moved meanwhile cannot redirect it. It needs two descriptors and no recursion, however deep the
/// tree is.
class TreeRemoval {
public:
    TreeRemoval(bool recurse, bool keepDirs) : recurse_(recurse), keepDirs_(keepDirs) {}

    /// Deletes the content of the directory `root`, whose path is `path`, and all below it. Returns
    /// the result of the root's level; the root itself is kept.
    bool run(ScopedFd root, const std::string& path)
    {
        root_ = std::move(root);
        path_ = path;
        enter(ScopedFd(fcntl(root_.get(), F_DUPFD_CLOEXEC, 0)), "");
        for (;;) {
            Level& level = levels_.back();
            if (level.next < level.names.size())
                removeNext(level);
            else if (level.hasMore && level.hasDeleted)
                listAgain(level);
            else if (levels_.size() > 1)
                leave();
            else
                return level.result;
        }
    }

private:
    /// One directory on the way down.
    struct Level {
        std::string name; ///< in the level above
        dev_t device = 0;
        ino_t inode = 0;
        std::size_t pathSize = 0; ///< of the directory's own path
        std::string names;        ///< what it holds; see listNames()
        std::size_t next = 0;     ///< where the next name begins
        bool hasMore = false;     ///< it holds more than `names`
        bool hasDeleted = false;  ///< something in it was deleted since it was listed
        bool result = true;
    };

    void enter(ScopedFd directory, const std::string& name)
    {
        struct stat status = {};
        (void)fstat(directory.get(), &status); // if it fails, the way up will not match
        current_ = std::move(directory);
        levels_.push_back({name, status.st_dev, status.st_ino, path_.size(), {}});
        list(levels_.back());
    }

    void listAgain(Level& level)
    {
        (void)lseek(current_.get(), 0, SEEK_SET); // if it fails, the list is empty
        list(level);
    }

    void list(Level& level)
    {
        held_ -= level.names.size();
        level.names.clear();
        level.next = 0;
        level.hasDeleted = false;
        level.hasMore =
            listNames(current_.get(), NamesLimit - std::min(NamesLimit, held_), level.names);
        held_ += level.names.size();
    }

    void removeNext(Level& level)
    {
        const std::string name = level.names.c_str() + level.next;
        level.next += name.size() + 1;
        if (!endsWithSlash(path_))
            path_ += '/';
        path_ += name;
        if (!removeChild(level, name))
            path_.resize(level.pathSize);
    }

    /// Deletes the child `name`, whose path is `path_`. Returns true if it is a directory that was
    /// entered instead.
    bool removeChild(Level& level, const std::string& name)
    {
        struct stat status = {};
        // A path that is too long for the system counts as one that cannot be examined. In a
        // directory that may be listed but not searched, "." cannot be examined either.
        if (path_.size() >= PATH_MAX ||
            fstatat(current_.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
            level.result = false;
            return false;
        }
        if (!S_ISDIR(status.st_mode)) {
            *logstream << "DEL: " << path_ << '\n';
            if (unlinkat(current_.get(), name.c_str(), 0) == 0)
                level.hasDeleted = true;
            else
                level.result = false;
            return false;
        }
        if (!recurse_ || isDotName(name))
            return false;
        ScopedFd child(openat(current_.get(), name.c_str(), DirectoryFlags));
        if (!child.isOpen())
            return false; // its failure is hidden; see finishLevel()
        enter(std::move(child), name);
        return true;
    }

    /// Goes back up from the deepest level and removes its directory.
    void leave()
    {
        const Level child = std::move(levels_.back());
        levels_.pop_back();
        held_ -= child.names.size();
        const bool isBack = goUp();
        bool result = child.result;
        if (!keepDirs_) {
            const bool isRemoved =
                isBack && unlinkat(current_.get(), child.name.c_str(), AT_REMOVEDIR) == 0;
            if (isRemoved)
                *logstream << "RMDIR: " << path_ << '\n';
            result = isRemoved && result;
            levels_.back().hasDeleted = levels_.back().hasDeleted || isRemoved;
        }
        // Deliberate: a later success hides an earlier failure.
        Level& level = levels_.back();
        level.result = result || level.result;
        path_.resize(level.pathSize);
    }

    /// Makes `current_` the directory of the last level. Returns false if that was moved away or
    /// replaced and cannot be found again: the rest of the level is then skipped.
    bool goUp()
    {
        if (isLevel(levels_.back(), ScopedFd(openat(current_.get(), "..", DirectoryFlags))))
            return true;
        if (descendAgain())
            return true;
        levels_.back().next = levels_.back().names.size();
        levels_.back().hasMore = false;
        return false;
    }

    /// Makes `directory` the `current_` one if it is that of `level`.
    bool isLevel(const Level& level, ScopedFd directory)
    {
        struct stat status = {};
        if (!directory.isOpen() || fstat(directory.get(), &status) != 0 ||
            status.st_dev != level.device || status.st_ino != level.inode)
            return false;
        current_ = std::move(directory);
        return true;
    }

    /// Finds the directory of the last level from the root, by the names on the way down.
    bool descendAgain()
    {
        ScopedFd at(openat(root_.get(), ".", DirectoryFlags));
        for (std::size_t depth = 1; depth < levels_.size() && at.isOpen(); ++depth) {
            ScopedFd below(openat(at.get(), levels_[depth].name.c_str(), DirectoryFlags));
            at = std::move(below);
        }
        return isLevel(levels_.back(), std::move(at));
    }

    bool recurse_;
    bool keepDirs_;
    ScopedFd root_{-1};
    ScopedFd current_{-1}; ///< the directory of the last level
    std::string path_;     ///< of what is being deleted, for messages
    std::vector<Level> levels_;
    std::size_t held_ = 0; ///< bytes of names in all levels
};

/// Opens the directory at `place` or, if that is a trusted link, the one that it leads to.
ScopedFd openDirectory(const Place& place, const std::string& path)
{
    // Without trailing slashes, which would make the system follow a link.
    const std::string name = place.name.substr(0, place.name.find_last_not_of('/') + 1);
    ScopedFd directory(openat(place.fd(), name.c_str(), DirectoryFlags));
    return directory.isOpen() ? std::move(directory) : openPath(path, O_RDONLY | O_DIRECTORY);
}

} // namespace

int deleteFile(const std::string& path)
{
    *logstream << "DEL: " << path << '\n';
    return removePath(path);
}

bool removeTree(const std::string& path, bool recurse, bool keepDirs)
{
    Place place;
    if (findPlace(path, LastLink::Keep, place) != 0)
        return false;
    ScopedFd directory = openDirectory(place, path);
    if (!directory.isOpen())
        return false;

    const bool result = TreeRemoval(recurse, keepDirs).run(std::move(directory), path);
    if (keepDirs)
        return result;

    if (unlinkat(place.fd(), place.name.c_str(), AT_REMOVEDIR) != 0)
        return false;
    *logstream << "RMDIR: " << path << '\n';
    return result;
}

int removeDir(FileTransaction& /*transaction*/, const std::string& base, const std::string& sub,
              bool recursive)
{
    (void)removeTree(joinPathOptional(base, sub), recursive, false); // best effort
    return 0;
}

int removeFiles(const std::string& base, const std::string& sub, bool recursive)
{
    (void)removeTree(joinPathOptional(base, sub), recursive, true); // best effort
    return 0;
}
