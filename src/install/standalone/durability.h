// Syncing: forces what a run wrote to the disk before the old files are deleted.
//
// Until its backups are deleted, a run can be undone: by a rollback or, after a power cut, by hand.
// So everything new must be on the disk by then. A deployment writes hundreds or thousands of
// files; one call for each file system syncs them all, and whatever other programs left in its
// cache. A registration writes one file and syncs only that.
#pragma once

#include "scoped.h"

#include <string>
#include <vector>

/// The file systems that a run is going to write to.
class FileSystemSync {
public:
    /// Opens the file systems of `directories`; of a missing one, that of its nearest parent.
    /// Create this before the first write: a failed writeback is reported only to descriptors that
    /// were open at that time (and only since Linux 5.8).
    explicit FileSystemSync(const std::vector<std::string>& directories);

    /// Writes everything that is cached for these file systems to the disk. Returns 0, or
    /// CannotWrite (5) if there is no space or the disk reports an error.
    [[nodiscard]] int sync() const;

private:
    std::vector<ScopedFd> fileSystems_;
};

/// Writes the names in `directories` to the disk; the content of the files must be there already.
/// Returns 0 or CannotWrite (5) as FileSystemSync::sync().
[[nodiscard]] int syncDirectories(const std::vector<std::string>& directories);
