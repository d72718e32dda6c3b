#include "single_user_mode.h"

#include "file_index.h"
#include "file_operations.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"

#include <ostream>

std::string singleUserFlagPath(const std::string& home)
{
    return joinPath(home, singleUserFlag);
}

void detectSingleUserMode(const std::string& home)
{
    const ScopedFile flag = openForReading(singleUserFlagPath(home));
    if (!flag)
        return;
    *logstream << "Single user mode file found\n";
    enterSingleUserMode();
}

void createSingleUserModeFlag(FileTransaction& transaction, const std::string& home,
                              const std::string* indexPath)
{
    const ScopedUmask mask(globalFilesUmask);
    const std::string path = singleUserFlagPath(home);
    *logstream << "Creating single user mode flag file: " << path << '\n';
    if (!openStream(path, Existing::Truncate, NewFileMode)) {
        *logstream << "Unable to create single user mode flag file\n";
        return;
    }
    if (indexPath == nullptr)
        return;

    (void)createPath(transaction, *indexPath, IndexDirectoryMode); // if it fails, so does the open
    appendToFileIndex(*indexPath, path);
}
