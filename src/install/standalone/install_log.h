// The index of installed files, and the single-user flag.
//
// The index ("ZOR_files") lists every file that an installation put on the machine, so that the
// removal deletes exactly those: a header line that begins with "#", then one full path a line,
// unique, in ascending byte order, without quoting or trimming. While an extraction runs it is in a
// transient form: a header without a time, then the files in the order of extraction. Nothing here
// reports a failure of the index: a missing one only means that a removal knows fewer files.
#pragma once

#include <set>
#include <string>

struct FileTransaction;
struct InstallRegistry;

/// Adds every path of the index at `path` to `files`: every line that is neither empty nor begins
/// with "#". A file that cannot be opened adds nothing.
void readFileIndex(const std::string& path, std::set<std::string>& files);

/// Adds the files that the installer and the toolkit make beside those of the package, whether or
/// not they exist.
void addInstallerFiles(const InstallRegistry& registry, std::set<std::string>& files);

/// Writes the index at `path` anew. A file that cannot be opened is not written.
void writeFileIndex(const std::string& path, const std::set<std::string>& files);

/// Adds the path `file` to the end of the index at `path`, created if missing. An index that cannot
/// be opened stays as it is.
void appendToFileIndex(const std::string& path, const std::string& file);

/// Rewrites the index at `path` with the installer's own files added and a new time.
void refreshFileIndex(const InstallRegistry& registry, const std::string& path);

/// Opens the transient index at `path` as `zor_file_handle`, with its directories and its header;
/// a warning on `logstream` tells when it cannot be opened.
void openTransientIndex(FileTransaction& transaction, const std::string& path);

/// Closes `zor_file_handle`, if it is open, and makes it null.
void closeTransientIndex();

/// The path of the single-user flag of the installation in `home`.
[[nodiscard]] std::string singleUserFlagPath(const std::string& home);

/// Turns single-user mode on when the installation in `home` carries the flag.
void detectSingleUserMode(const std::string& home);

/// Puts the flag into the installation in `home` and its path into the index at `indexPath` (null:
/// no index). A failure is logged and has no other consequence. The flag is not journalled.
void createSingleUserModeFlag(FileTransaction& transaction, const std::string& home,
                              const std::string* indexPath);
