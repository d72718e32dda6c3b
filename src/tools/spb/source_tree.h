// The files and directories that are packed, and why some cannot be.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

/// A file or directory to be packed.
struct Source {
    std::string relative; ///< below the image root; a directory's ends in "/"
    std::string path;
    std::uint64_t size = 0; ///< 0 for a directory

    [[nodiscard]] bool isDir() const { return relative.ends_with('/'); }
};

/// What findSources() gives.
struct SourceTree {
    std::vector<Source> sources;          ///< by name: every directory before what is in it
    std::vector<std::string> reasons;     ///< why the tree cannot be packed, to be shown
    std::vector<std::string> leftOut;     ///< names outside the package directories
    std::vector<std::string> directories; ///< the package directories that are there
};

/// Finds what is in the package directories of `tree`. Links to files count as these. Returns 0, or
/// the `errno` with which `failed` could not be read.
[[nodiscard]] int findSources(const std::string& tree, SourceTree& found, std::string& failed);
