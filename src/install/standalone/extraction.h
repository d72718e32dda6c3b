// Copying the toolkit out of the SPB into an installation.
//
// The SPB stores every file under one image root (`spbFileRoot`), then a package directory. The
// package directories are extracted one after the other, each entry whose name begins with the
// directory's prefix; what lies outside of them is ignored without a word. Names are used as they
// stand: an SPB is trusted like the programs that it carries.
#pragma once

#include <cstdio>
#include <string>
#include <vector>

#include <sys/types.h>

class ZipFile;
struct FileTransaction;
struct InstallRegistry;

/// One package directory, as an installation extracts it.
struct ExtractionStep {
    std::string subdir;   ///< below the image root, and below the home directory
    mode_t mode;          ///< of the files, and before the permission pass of the directories
    std::string skipList; ///< names of entries that are passed over
};

/// The package directories in the order of their extraction.
[[nodiscard]] std::vector<ExtractionStep> extractionSteps(bool freshInstall);

/// How the names of the entries in the package directory `subdir` begin.
[[nodiscard]] std::string sourcePrefix(const std::string& subdir);

/// Where an entry goes whose name is a prefix and `rest`: `dstDir` and `rest`, without two slashes
/// in a row. With one byte or none of it, the entry is passed over.
[[nodiscard]] std::string destinationName(const std::string& dstDir, const std::string& rest);

/// Extracts the whole package at `spbPath` into the home of `installation`, journalled, and writes
/// the file index at `indexPath` (null: none).
///
/// Unless `freshInstall`, the installed "config/Zor.properties" is left alone. Returns 0, 1 when
/// there is no package or nothing in it, or the first failing code of a file operation; what was
/// extracted by then is the rollback's, the index is deleted. Logs its steps and failures.
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
/// Entries named in the name list `skipList` (null: none) are passed over. Every extracted file is
/// written to `index` (null: none), `debug` traces on standard output. Returns 0 or the first
/// failing code of createPath() or extractFile().
[[nodiscard]] int extractEntries(FileTransaction& transaction, const ZipFile& archive,
                                 const std::string& srcPrefix, const std::string& dstDir,
                                 mode_t mode, const std::string* skipList, std::FILE* index,
                                 bool debug);
