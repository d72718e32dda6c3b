// What a package puts where, by the installer's own rules.
#pragma once

#include <string>
#include <vector>

#include <sys/types.h>

class ZipFile;
struct ZipEntry;

/// One entry of a package on its way into an installation.
struct PackagedFile {
    std::string path; ///< where it goes; ends with "/" for a directory
    mode_t mode;      ///< that the extraction gives it
    const ZipEntry* entry;
};

/// Everything that an installation into `home` extracts from `archive`, in its order. A path can
/// occur more than once: the last one stays.
[[nodiscard]] std::vector<PackagedFile> packagedFiles(const ZipFile& archive,
                                                      const std::string& home, bool freshInstall);
