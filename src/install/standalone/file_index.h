// The file index ("ZOR_files"): every file that an installation put on the machine.
//
// The removal deletes exactly these files. The first line begins with "#"; every other line is one
// full path, each once, in ascending byte order, without quoting or trimming. While an extraction
// runs, the index has a transient form: a first line without a time, then the files in the order of
// extraction. Nothing here reports a failed write: a missing index only means that a removal knows
// fewer files.
#pragma once

#include <set>
#include <string>

#include <sys/types.h>

struct FileTransaction;
struct InstallRegistry;

/// The mode of directories that are created for an index.
inline constexpr mode_t IndexDirectoryMode = 0755;

/// The file index of the installation in `home`.
[[nodiscard]] std::string fileIndexPath(const std::string& home);

/// Adds every path of the index at `path` to `files`: every line that is neither empty nor begins
/// with "#". A file that cannot be opened adds nothing.
void readFileIndex(const std::string& path, std::set<std::string>& files);

/// Adds the files that the installer and the toolkit create in addition to those of the package,
/// whether or not they exist.
void addInstallerFiles(const InstallRegistry& registry, std::set<std::string>& files);

/// Replaces the index at `path`. A file that cannot be opened is not written.
void writeFileIndex(const std::string& path, const std::set<std::string>& files);

/// Adds the path `file` to the end of the index at `path`, which is created if missing. An index
/// that cannot be opened is not changed.
void appendToFileIndex(const std::string& path, const std::string& file);

/// Rewrites the index at `path` with the installer's own files added and a new time.
void refreshFileIndex(const InstallRegistry& registry, const std::string& path);

/// Opens the transient index at `path` as `zor_file_handle`, creates its directories and writes its
/// first line; prints a warning on `logstream` if it cannot be opened.
void openTransientIndex(FileTransaction& transaction, const std::string& path);

/// Closes `zor_file_handle` if it is open, and sets it to null.
void closeTransientIndex();
