// Deleting files and directory trees: best effort, each deletion logged, nothing journalled.
#pragma once

#include <string>

struct FileTransaction;

/// Logs "DEL: " and `path`, then removes the file or empty directory. Returns the C library's
/// result, 0 on success.
int deleteFile(const std::string& path);

/// Deletes the files in the directory `path`, if `recurse` also those in its subdirectories, and
/// unless `keepDirs` the directories that are then empty, each logged as "RMDIR: ".
///
/// Links are deleted, not followed. Returns false if the directory could not be opened or removed,
/// or something in it could not be deleted. Failures further below do not count, and the success of
/// a later subdirectory hides an earlier failure.
bool removeTree(const std::string& path, bool recurse, bool keepDirs);

/// removeTree() of the directory `sub` in `base`, or of `base` if `sub` is empty. The transaction
/// is part of the interface; nothing is journalled. Always returns 0.
int removeDir(FileTransaction& transaction, const std::string& base, const std::string& sub,
              bool recursive);

/// As removeDir(), but keeps every directory. Always returns 0. No flow calls it.
int removeFiles(const std::string& base, const std::string& sub, bool recursive);
