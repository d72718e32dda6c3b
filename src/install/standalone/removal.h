// The removal: one exploiter unregistered, and the toolkit deleted when none is left.
#pragma once

#include <string>
#include <vector>

struct FileTransaction;
struct InstallRegistry;

/// Takes the exploiter of `request` (its list is the bare identifier) out of the installation of
/// `registry`; deletes the installation when no exploiter is left.
///
/// `logPath` is the index of installed files, null for none. Returns 0; ScannersNotStopped (7):
/// nothing was deleted or saved; or, while exploiters remain, the code of saving the registry.
/// Deletion is best effort and not journalled: no failure of it changes the result.
[[nodiscard]] int removeInstallation(FileTransaction& transaction, InstallRegistry& registry,
                                     const InstallRegistry& request, const std::string* logPath);

/// What a removal does with a directory.
enum RemovalKind : int {
    WithFiles,      ///< deletes the files directly in it, and then it if it is empty
    WithEverything, ///< deletes it with all that is below
    IfEmpty,        ///< deletes it if it is empty
};

struct RemovalStep {
    RemovalKind kind;
    std::string path; ///< relative to the home directory; empty for the home directory itself
};

/// What a removal does with the directories of an installation, in its order: after it deleted the
/// files of an index (`listed`), or without any index.
[[nodiscard]] std::vector<RemovalStep> removalSteps(bool listed);

/// Deletes every file that the index at `logPath` (null: none) lists, and then the index. Returns
/// true when it listed any; an empty line counts. A line of more than 1023 bytes is taken in
/// pieces, each as a path.
bool removeListedFiles(const std::string* logPath);
