#include "environment.h"

#include "common_directory.h"
#include "file_operations.h"
#include "interruption.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "shell_command.h"

#include <cstdlib>
#include <deque>
#include <iostream>

namespace {

constexpr const char* SelinuxProbe = "/usr/sbin/selinuxenabled";
constexpr const char* LabellingTool = "/usr/bin/chcon";
constexpr const char* SystemToolDir = "/usr/bin";
constexpr const char* OutputSuppression = " >/dev/null 2>&1";
constexpr const char* LibraryPathName = "LD_LIBRARY_PATH";
constexpr mode_t InstallDirMode = 0750;

std::string quotedIfBlank(const std::string& text)
{
    return text.find(' ') == std::string::npos ? text : "\"" + text + "\"";
}

/// Sets the mode of `count` directories from `path` upwards.
void setModesUpwards(FileTransaction& transaction, std::string path, std::size_t count, mode_t mode)
{
    const ScopedUmask mask(globalFilesUmask);
    for (; count != 0 && !path.empty(); --count) {
        (void)setFileMode(transaction, path, mode); // the directory serves with any mode
        const std::size_t slash = path.rfind('/');
        path.erase(slash == std::string::npos ? 0 : slash);
    }
}

void createLogDir(FileTransaction& transaction, const std::string& directory)
{
    *logstream << "Setting logs dir='" << directory << "'\n";
    const std::size_t before = transaction.journal.size();
    {
        const ScopedUmask mask(globalFilesUmask);
        (void)createFullPath(transaction, directory, CommonLogDirMode, nullptr); // goes on without
    }
    // All that the creation adds to the journal are directories.
    const std::size_t created = transaction.journal.size() - before;
    if (applySingleUserMode)
        setModesUpwards(transaction, directory, created, CommonLogDirMode);
}

} // namespace

int runCommand(const std::string& program, const std::string& /*directory*/,
               const std::string& arguments)
{
    std::string command = quotedIfBlank(program);
    if (!arguments.empty())
        command += " " + arguments;
    if (!debugMode)
        command += OutputSuppression;

    // The command's own output, in debug mode, stands behind what was printed before it.
    std::cout.flush();
    logstream->flush();
    const int status = runShell(command);
    noteStatusOfCommand(status);
    *logstream << "Exec '" << command << "' returned " << status << '\n';
    return status;
}

int makeSubdir(FileTransaction& transaction, const std::string& parent, const std::string& name,
               mode_t mode)
{
    const int code = createPath(transaction, joinPath(parent, name + "/"), mode);
    if (code != FileOk)
        *logstream << "Error creating dir " << name << " in " << parent << " result=" << code
                   << " (" << fileErrorText(static_cast<unsigned>(code)) << ")\n";
    return code;
}

int createInstallDir(FileTransaction& transaction, const std::string& home)
{
    const ScopedUmask mask(globalFilesUmask);
    return makeSubdir(transaction, home, auxDirInstall, InstallDirMode) == FileOk ? 0 : -1;
}

int setSelinuxContext(const std::string& home)
{
    const int enabled = runCommand(SelinuxProbe, SystemToolDir, "");
    if (enabled != 0) {
        *logstream << "SELinux not enabled or not supported\n";
        return enabled;
    }
    return runCommand(LabellingTool, SystemToolDir,
                      "-R -t texrel_shlib_t " + joinPath(home, spbBinDir));
}

void setLibraryPath(const std::string& home)
{
    std::string setting = std::string(LibraryPathName) + "=" + joinPath(home, "bin");
    const char* const old = std::getenv(LibraryPathName);
    if (old != nullptr)
        setting += std::string(":") + old;

    if (debugMode)
        *logstream << "Setting '" << LibraryPathName << "' to '" << setting << "'\n";

    // The environment keeps pointing at the text: it stays for the rest of the process.
    static auto& texts = *new std::deque<std::string>;
    const int result = putenv(texts.emplace_back(setting).data());
    if (result != 0)
        *logstream << "Setting up the '" << LibraryPathName
                   << "' variable has failed. Error = " << result << '\n';
}

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

    // Deliberate: without a custom path the common directory is shown, not the whole trace path.
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
