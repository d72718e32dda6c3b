// Reading the index of installed files, which another user may have put there.
#pragma once

#include <set>
#include <string>

/// What an index says.
struct GuardedIndex {
    /// "complete", "interrupted" (an extraction was writing it), or as readStateName() has it.
    std::string state = "missing";
    std::string header; ///< its first line
    std::set<std::string> files;

    [[nodiscard]] bool isRead() const { return state == "complete" || state == "interrupted"; }
};

/// Reads the index at `path` as readGuarded() does.
[[nodiscard]] GuardedIndex readGuardedIndex(const std::string& path);
