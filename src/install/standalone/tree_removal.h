// Deleting files and directory trees: best effort, each deletion logged, nothing journalled.
#pragma once

#include <string>

struct FileTransaction;

/// Logs "DEL: " and `path`, then removes the file or empty directory. Returns the C library's
/// result, 0 on success.
int deleteFile(const std::string& path);

/// Deletes the files in the directory `path`, with `recurse` also those of its subdirectories, and
/// unless `keepDirs` the directories that are empty then, each logged as "RMDIR: ".
///
/// Links are deleted, not followed. Returns false when the directory could not be opened or removed
/// or something in it not be deleted. A failure further below does not count by itself, and a
/// subdirectory's success hides an earlier failure.
bool removeTree(const std::string& path, bool recurse, bool keepDirs);

/// removeTree() of the directory `sub` in `base`, or of `base` when `sub` is empty. The transaction
/// is part of the interface; nothing is journalled. Returns 0 whatever happened.
int removeDir(FileTransaction& transaction, const std::string& base, const std::string& sub,
              bool recursive);

/// As removeDir(), but every directory stays. Returns 0 whatever happened. No flow calls it.
int removeFiles(const std::string& base, const std::string& sub, bool recursive);
