// The files of a package as an installation would have them, with their digests.
#pragma once

#include "package_file.h"

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include <sys/types.h>

/// One file, or a directory, of a package.
struct LandedFile {
    mode_t mode = 0; ///< once the installation is complete
    std::uint32_t unixMode =
        0; ///< what the archive says of permissions; the installer doesn't look
    std::uint64_t size = 0;
    std::string sha256;  ///< of the bytes that are installed; empty for a directory
    bool sound = true;   ///< false: damaged, or cannot be installed
    std::string content; ///< of a property file, up to a megabyte
};

/// By place. Of entries that land at the same place the last one counts.
using LandedFiles = std::map<std::string, LandedFile>;

/// Reads all files of `package`.
[[nodiscard]] LandedFiles landedFiles(const PackageFile& package);

/// Opens the package at `path`. Returns null, with messages on standard error, when it cannot be
/// read or the installer would find no package in it.
[[nodiscard]] std::unique_ptr<PackageFile> openPackage(const std::string& path);

/// The keys of a property file and their values; of a key that occurs twice the last one.
[[nodiscard]] std::map<std::string, std::string> propertiesOf(const std::string& content);
