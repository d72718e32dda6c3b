// Searching an installation for files that no package brought.
//
// Some of its directories can be written to by everybody: whatever is planted there, no link leads
// the search elsewhere, and depth and number of the names are bounded.
#pragma once

#include <functional>
#include <string>
#include <vector>

/// What a search found.
struct ForeignFiles {
    std::vector<std::string> files;
    std::vector<std::string> notSearched; ///< directories that could not be listed whole
};

/// Whether a path is left out: a file that is known, or a directory that is not to be searched.
using LeftOut = std::function<bool(const std::string& path, bool isDirectory)>;

/// Lists everything below `home` that is not left out, up to MostNames.
[[nodiscard]] ForeignFiles findForeignFiles(const std::string& home, const LeftOut& isLeftOut);
