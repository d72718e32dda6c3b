// Listing directories in which another user may have planted things.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

/// How many names a search looks at, at most.
inline constexpr std::size_t MostNames = 1'000'000;

/// Paths in a directory. Links are files.
struct DirectoryNames {
    std::vector<std::string> directories;
    std::vector<std::string> files;

    [[nodiscard]] std::size_t count() const { return directories.size() + files.size(); }
};

/// What listDirectory() returns.
enum class Listed { All, Missing, NotAll };

/// Adds the paths in the directory `path` to `names`, up to `most` of them. Links on the path are
/// followed only if root or the running user owns them.
[[nodiscard]] Listed listDirectory(const std::string& path, std::size_t most,
                                   DirectoryNames& names);
