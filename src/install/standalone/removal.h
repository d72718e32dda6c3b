// The removal: unregisters one exploiter, and deletes the toolkit if none is left.
#pragma once

#include "registry.h"
#include "tree_removal.h"

#include <string>
#include <vector>

/// Removes the exploiter of `request` (its list is the identifier without a colon) from `registry`;
/// deletes the installation if no exploiter is left.
///
/// `indexPath` is the file index, null for none. Returns 0; ScannersNotStopped (7) if nothing was
/// deleted or saved; or, while exploiters remain, the code of saving the registry. Deletion is best
/// effort and not journalled: its failures do not change the result.
[[nodiscard]] int removeInstallation(FileTransaction& transaction, InstallRegistry& registry,
                                     const InstallRegistry& request, const std::string* indexPath);

/// What a removal does with a directory.
enum RemovalKind : int {
    WithFiles,      ///< deletes the files directly in it, and then it if it is empty
    WithEverything, ///< deletes it with all that is below
    IfEmpty,        ///< deletes it if it is empty
};

struct RemovalStep {
    RemovalKind kind = IfEmpty;
    std::string path; ///< relative to the home directory; empty for the home directory itself
};

/// What a removal does with the directories of an installation, in this order: after it deleted the
/// files that an index lists (`listed`), or without an index.
[[nodiscard]] std::vector<RemovalStep> removalSteps(bool listed);

/// Deletes every file that the index at `indexPath` (null: none) lists, and then the index. Returns
/// true if it listed any; an empty line counts. A line of more than 1023 bytes is split into
/// pieces, each of which is taken as a path.
bool removeListedFiles(const std::string* indexPath);
