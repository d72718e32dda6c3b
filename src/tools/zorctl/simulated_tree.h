// The machine's files as they would be after changes that nobody has made yet.
//
// Paths are texts: what is changed under one name is not seen under another that leads to the same
// file through a link. Where nothing was changed, the disk answers.
#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include <sys/types.h>

class SimulatedTree {
public:
    enum class Kind { Missing, File, Directory };

    /// What is at `path`, links followed; everything but a directory counts as a file.
    [[nodiscard]] Kind kindOf(const std::string& path) const;
    [[nodiscard]] bool exists(const std::string& path) const
    {
        return kindOf(path) != Kind::Missing;
    }

    /// What is at `path` itself: a link, a dangling one too, counts as a file.
    [[nodiscard]] Kind kindOfEntry(const std::string& path) const;

    /// Whether this process may create something in the directory `path`.
    [[nodiscard]] bool canCreateIn(const std::string& path) const;

    /// The size of the file at `path`; 0 if it is not known.
    [[nodiscard]] unsigned long long sizeOf(const std::string& path) const;

    /// Every name directly in the directory `path`, as whole paths.
    [[nodiscard]] std::vector<std::string> list(const std::string& path) const;

    /// Writes a file, over one that may be there.
    void write(const std::string& path, unsigned long long size);

    /// Creates the directory `path`; false if that fails.
    bool makeDirectory(const std::string& path);

    /// Creates every missing directory named before the last "/" of `path`, as createPath() does;
    /// false at the first that fails.
    bool makePath(const std::string& path);

    /// Deletes the file, or the directory if it is empty. False if that fails.
    bool remove(const std::string& path);

    /// Deletes what is in the directory `path`, as removeTree() does: false if that leaves it.
    bool removeTree(const std::string& path, bool recurse);

    /// What was done, as it differs from the disk.
    using Paths = std::set<std::string>;
    [[nodiscard]] Paths created() const { return changes(Kind::Missing, Kind::File); }
    /// Files that replace something.
    [[nodiscard]] Paths written() const;
    [[nodiscard]] Paths deleted() const { return changes(Kind::File, Kind::Missing); }
    /// Without "/" at the end.
    [[nodiscard]] Paths createdDirectories() const
    {
        return changes(Kind::Missing, Kind::Directory);
    }
    [[nodiscard]] Paths deletedDirectories() const
    {
        return changes(Kind::Directory, Kind::Missing);
    }

private:
    /// The paths at which the disk has `before` and the tree `after`.
    [[nodiscard]] Paths changes(Kind before, Kind after) const;

    struct Node {
        Kind kind = Kind::Missing;
        unsigned long long size = 0;
    };

    std::map<std::string, Node> changes_;
};
