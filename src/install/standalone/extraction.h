// Copying the toolkit out of the SPB into an installation.
//
// The SPB stores every file under one image root (`spbFileRoot`), in one of the package
// directories. These are extracted one after the other: every entry whose name begins with the
// directory's prefix. Other entries are silently ignored. Names are used unchecked: an SPB is
// trusted like the programs in it.
#pragma once

#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

#include <sys/types.h>

class ZipFile;
struct FileTransaction;
struct InstallRegistry;

/// One package directory, as an installation extracts it.
struct ExtractionStep {
    std::string subdir;   ///< below the image root, and below the home directory
    mode_t mode;          ///< of the files, and before the permission pass of the directories
    std::string skipList; ///< names of entries that are skipped
};

/// The package directories in the order of their extraction.
[[nodiscard]] std::vector<ExtractionStep> extractionSteps(bool freshInstall);

/// How the names of the entries in the package directory `subdir` begin.
[[nodiscard]] std::string sourcePrefix(const std::string& subdir);

/// The destination of an entry whose name is the source prefix followed by `rest`: `dstDir`, a
/// slash and `rest`, without double slashes. An entry is skipped if this has fewer than two bytes.
[[nodiscard]] std::string destinationName(const std::string& dstDir, std::string_view rest);

/// Extracts the whole package at `spbPath` into the home of `installation`, journalled, and writes
/// the file index at `indexPath` (null: none).
///
/// Unless `freshInstall`, the installed "config/Zor.properties" is not replaced. Returns 0; 1 if
/// there is no package or it is empty; or the first failing code of a file operation. A failure
/// deletes the index and leaves the extracted files to the rollback. Logs its steps and failures.
[[nodiscard]] int extractPackage(const std::string& spbPath, FileTransaction& transaction,
                                 InstallRegistry& installation, bool freshInstall,
                                 const std::string* indexPath);

/// extractEntries() of the package directory `subdir` into the same one of `targetDir`, without a
/// skip list.
[[nodiscard]] int extractDir(FileTransaction& transaction, const ZipFile& archive,
                             const std::string& targetDir, const std::string& subdir, mode_t mode,
                             std::FILE* index, bool debug);

/// Extracts every entry whose name begins with `srcPrefix` into `dstDir`: a name that ends with "/"
/// as a directory, others as files, all with `mode`.
///
/// Entries named in the name list `skipList` (null: none) are skipped. Every extracted file is
/// written to `index` (null: none), `debug` traces on standard output. Returns 0 or the first
/// failing code of createPath() or extractFile().
[[nodiscard]] int extractEntries(FileTransaction& transaction, const ZipFile& archive,
                                 const std::string& srcPrefix, const std::string& dstDir,
                                 mode_t mode, const std::string* skipList, std::FILE* index,
                                 bool debug);
