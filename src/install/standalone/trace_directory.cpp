#include "trace_directory.h"

#include "commands.h"
#include "common_directory.h"
#include "file_operations.h"
#include "interruption.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"

#include <ostream>

namespace {

/// Sets the mode of `count` directories, from `path` upwards.
void setModesUpwards(std::string path, std::size_t count, mode_t mode)
{
    for (; count != 0 && !path.empty(); --count) {
        (void)setFileMode(path, mode); // the directory is usable with any mode
        const std::size_t slash = path.rfind('/');
        path.erase(slash == std::string::npos ? 0 : slash);
    }
}

void createLogDir(FileTransaction& transaction, const std::string& directory)
{
    *logstream << "Setting logs dir='" << directory << "'\n";
    const std::size_t before = changeCount(transaction);
    {
        const ScopedUmask mask(globalFilesUmask);
        (void)createFullPath(transaction, directory, CommonLogDirMode, nullptr); // goes on without
    }
    // Creating a path changes nothing but directories, the last of them `directory`.
    const std::size_t created = changeCount(transaction) - before;
    if (applySingleUserMode)
        setModesUpwards(directory, created, CommonLogDirMode);
}

} // namespace

std::string commonLogDir(const std::string& common)
{
    return joinPath(common, joinPath(zorCommonDir, logDir));
}

int setupCommonLogDir(FileTransaction& transaction, const std::string& /*home*/, bool useCustomPath,
                      const std::string& customPath)
{
    std::string directory = customPath;
    if (!useCustomPath) {
        const std::string common = readCommonDirectory(false);
        const ScopedUmask mask(globalFilesUmask);
        const int code = createFullPath(transaction, common, CorvanCommonDirMode, nullptr);
        *logstream << "Created Corvan Common Dir='" << common << "' result=" << code << '\n';
        directory = commonLogDir(common);
    }

    if (!directory.empty() && !pathExists(directory))
        createLogDir(transaction, directory);
    return 0;
}

int updateCommonTracePath(FileTransaction& transaction, const std::string& home, bool useCustomPath,
                          const std::string& customPath)
{
    const std::string common = readCommonDirectory(useCustomPath);
    const int result = setupCommonLogDir(transaction, home, useCustomPath, customPath);
    const std::string tracePath = useCustomPath ? customPath : commonLogDir(common);

    // Deliberate: without a custom path the common directory is printed, not the whole trace path.
    *logstream << "Updating common trace path='" << (useCustomPath ? customPath : common)
               << "' result=" << result << '\n';

    setLibraryPath(home);
    if (isInterrupted())
        return RunInterrupted; // what the command would change could not be undone
    const int status = runCommand(joinPath(home, trawlcfgExe), joinPath(home, spbBinDir),
                                  "-s common_trace_path " + quotedIfBlank(tracePath));
    *logstream << "Setting common trace path='" << tracePath << "' result=" << status << '\n';
    return status;
}
