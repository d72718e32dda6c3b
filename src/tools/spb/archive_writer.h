// Writes the archive: the same bytes for the same sources, on however many processors.
//
// Files are compressed in chunks of 2 MiB by as many threads as there are processors; the calling
// thread writes what they have made, in order. A few chunks at a time are in memory.
#pragma once

#include "source_tree.h"

#include <cstdint>
#include <string>
#include <vector>

/// How an archive is written.
struct ArchiveOptions {
    bool stored = false;     ///< do not compress
    std::uint16_t time = 0;  ///< of every entry, in the format of DOS
    std::uint16_t date = 33; ///< the first of January 1980
    unsigned threads = 1;
};

/// Why an archive could not be written.
struct ArchiveFailure {
    int error = 0;      ///< the `errno`; 0 when `reason` says what is wrong
    std::string path;   ///< of the source that is to blame; empty: the archive itself
    std::string reason; ///< to be shown
};

/// Writes `sources` to the empty file `fd`. Returns false with `failure` set when that fails.
[[nodiscard]] bool writeArchive(int fd, const std::vector<Source>& sources,
                                const ArchiveOptions& options, ArchiveFailure& failure);

inline constexpr const char* PackageTooLarge =
    "the package would reach 2 GiB, more than the installer can read";
