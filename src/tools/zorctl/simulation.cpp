#include "simulation.h"

#include "common_directory.h"
#include "discovery.h"
#include "exploiters.h"
#include "file_index.h"
#include "guarded_file.h"
#include "locations.h"
#include "package_files.h"
#include "paths.h"
#include "permissions.h"
#include "removal.h"
#include "safe_path.h"
#include "settings.h"
#include "single_user_mode.h"
#include "template_variables.h"
#include "trace_directory.h"
#include "upgrade.h"
#include "zip_file.h"

#include <algorithm>
#include <cstring>
#include <iostream>
#include <set>
#include <sstream>
#include <string_view>

#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

namespace {

using Kind = SimulatedTree::Kind;

constexpr std::size_t IndexLimit = std::size_t{64} << 20;

/// Collects what the library prints while this exists.
class CapturedOutput {
public:
    CapturedOutput()
        : log_(logstream), out_(std::cout.rdbuf(text_.rdbuf())),
          err_(std::cerr.rdbuf(errors_.rdbuf()))
    {
        logstream = &text_;
    }
    CapturedOutput(const CapturedOutput&) = delete;
    CapturedOutput& operator=(const CapturedOutput&) = delete;
    ~CapturedOutput()
    {
        logstream = log_;
        std::cout.rdbuf(out_);
        std::cerr.rdbuf(err_);
    }

    /// The first line of standard error, or of everything else.
    [[nodiscard]] std::string firstLine() const
    {
        std::string text = errors_.str().empty() ? text_.str() : errors_.str();
        return text.substr(0, text.find('\n'));
    }

private:
    std::ostringstream text_;
    std::ostringstream errors_;
    std::ostream* log_;
    std::streambuf* out_;
    std::streambuf* err_;
};

unsigned long long roundedUp(unsigned long long size, unsigned long long block)
{
    return (size + block - 1) / block * block;
}

class Simulation {
public:
    Simulation(const CommandLine& commandLine, Forecast& forecast)
        : commandLine_(commandLine), forecast_(forecast), tree_(forecast.tree)
    {
    }

    void run()
    {
        Discovery found = discoverInstallation(commandLine_, true);
        InstallRegistry request = commandLine_.request;
        forecast_.home = found.registryFound ? found.registry.homeDirectory : request.homeDirectory;
        if (found.installAction)
            install(found, request);
        else
            remove(found, request);
        if (privateMode)
            runPrivately();
        judge(found);
    }

private:
    // Installations.

    void install(Discovery& found, InstallRegistry& request)
    {
        const std::string& home = forecast_.home;
        forecast_.package = spbPackage;
        if (!checkInstallTypeCompatibility(localInstall, request.homeDirectory)) {
            forecast_.operation = "refused";
            fail("an installation of the other type is in " + request.homeDirectory);
            return;
        }
        detectSingleUserMode(home);
        if (!found.registryFound) {
            forecast_.operation = "fresh";
            freshInstall(home, true);
        } else if (found.upgradeNeeded) {
            forecast_.operation = "upgrade";
            upgrade(found, request);
        } else {
            forecast_.operation = "registration";
            finishUpgrade(found, request, false);
            createFlag(home);
        }
        if (forecast_.failure.empty() && found.upgradeNeeded)
            (void)tree_.removeTree(joinPath(home, cacheDir), true);
    }

    void freshInstall(const std::string& home, bool registers)
    {
        extract(home, true);
        if (forecast_.failure.empty())
            prepareFresh(home, registers);
        createFlag(home);
        if (!forecast_.failure.empty() || (localInstall && !custom_log_path_available))
            return;
        setUpLogs();
        runControl(home, "-s common_trace_path");
        const std::string control = joinPath(home, trawlcfgExe);
        struct stat status = {};
        const bool extracted = tree_.created().contains(control) || deployed_.contains(control);
        if (!tree_.exists(control) ||
            (!extracted && (stat(control.c_str(), &status) != 0 || (status.st_mode & 0111) == 0)))
            fail("the scanner control " + control + " is missing");
    }

    /// Directories, property files, scripts, registry and install type.
    void prepareFresh(const std::string& home, bool registers)
    {
        const bool made = tree_.makePath(joinPath(home, cacheDir) + "/") &&
                          tree_.makePath(joinPath(joinPath(home, spbBinDir), etcDir) + "/") &&
                          tree_.makePath(joinPath(home, auxDirInstall) + "/");
        if (!made)
            fail("a directory below " + home + " cannot be created");
        editProperties(home);
        if (!forecast_.failure.empty())
            return;
        readCommonSetting();
        editScripts(home);
        if (registers) {
            (void)tree_.makePath(registryPath(localInstall));
            saveRegistry();
        }
        if (forecast_.failure.empty())
            writeOwnFile(joinPath(home, joinPath(auxDirInstall, installProps)));
    }

    void upgrade(Discovery& found, const InstallRegistry& request)
    {
        const std::string& home = forecast_.home;
        stopScanners(home);
        const std::string properties = joinPath(home, spbPropertiesDir);
        noteLoss(properties);
        (void)tree_.removeTree(properties, true);
        for (const std::string& path : obsoleteFiles(home)) {
            noteLoss(path);
            if (tree_.exists(path))
                (void)tree_.remove(path);
        }
        extract(home, false);
        if (forecast_.failure.empty())
            editProperties(home);
        if (forecast_.failure.empty())
            readCommonSetting();
        if (forecast_.failure.empty() && !localInstall)
            editScripts(home);
        if (forecast_.failure.empty())
            finishUpgrade(found, request, true);
        createFlag(home);
        runControl(home, "-enable all");
    }

    void finishUpgrade(Discovery& found, const InstallRegistry& request, bool deploys)
    {
        if (!localInstall && !custom_log_path_available)
            setUpLogs();
        if (updateRegistration(found.registry, request) || deploys)
            saveRegistry();
    }

    // Steps of an installation.

    void extract(const std::string& home, bool fresh)
    {
        const ZipFile archive(spbPackage.c_str());
        if (archive.entries().empty()) {
            fail("the package " + spbPackage + " is not found or not valid");
            return;
        }
        const std::string index = fileIndexPath(home);
        noteLoss(index);
        bool indexOpened = tree_.makePath(index) && tree_.canCreateIn(home);
        if (indexOpened)
            tree_.write(index, 0);
        for (const PackagedFile& file : packagedFiles(archive, home, fresh)) {
            if (!extractOne(file)) {
                if (indexOpened)
                    (void)tree_.remove(index);
                return;
            }
        }
    }

    bool extractOne(const PackagedFile& file)
    {
        const std::string& path = file.path;
        if (endsWithSlash(path)) {
            if (!tree_.makePath(path))
                fail("the directory " + path + " cannot be created");
            return forecast_.failure.empty();
        }
        if (!isReadable(*file.entry)) {
            fail("the entry for " + path +
                 " cannot be opened: it is empty or of an unknown method");
            return false;
        }
        const std::string directory = path.substr(0, path.rfind('/'));
        const bool there = tree_.exists(path);
        if (!tree_.canCreateIn(directory) || (there && !moveAway(path))) {
            fail("the file " + path + " cannot be written: its directory is missing or closed");
            return false;
        }
        // The second pass over "config/xss" takes the place of the first one's backup.
        if (there && deployed_.contains(path))
            noteLoss(path);
        forecast_.spaceNeeded += roundedUp(file.entry->uncompressedSize, blockSize());
        tree_.write(path, file.entry->uncompressedSize);
        deployed_.insert(path);
        return true;
    }

    static bool isReadable(const ZipEntry& entry)
    {
        return entry.uncompressedSize != 0 && entry.compressedSize != 0 &&
               (entry.method == 0 || entry.method == 8);
    }

    /// What is at `path` becomes its backup, which the commit deletes; false if that fails. A
    /// private installation keeps no backups and writes over it.
    bool moveAway(const std::string& path)
    {
        if (!keepsBackups_)
            return tree_.kindOf(path) == Kind::File;
        const std::string backup = backupName(path);
        if (tree_.kindOf(backup) == Kind::Directory)
            return false;
        if (tree_.exists(backup)) {
            noteLoss(backup);
            (void)tree_.remove(backup);
        }
        return true;
    }

    void editProperties(const std::string& home)
    {
        for (const std::string& name : {zorProps, traceProps}) {
            const std::string path = joinPath(joinPath(home, spbCfgDir), name);
            if (tree_.kindOf(path) != Kind::File) {
                fail("the property file " + path + " is missing");
                return;
            }
            if (!deployed_.contains(path))
                noteLoss(path);
            edit(path);
        }
    }

    void editScripts(const std::string& home)
    {
        for (const char* const name : ScriptNames) {
            const std::string path = joinPath(home, joinPath(auxDirInstall, name));
            if (tree_.kindOf(path) != Kind::File)
                continue;
            if (!deployed_.contains(path))
                noteLoss(path);
            edit(path);
        }
    }

    void edit(const std::string& path)
    {
        forecast_.edited.push_back(path);
        tree_.write(path, tree_.sizeOf(path));
    }

    void saveRegistry()
    {
        const std::string path = registryPath(localInstall);
        const std::string directory = registryDirectory(localInstall);
        const std::string backup = backupName(path);
        if (!tree_.canCreateIn(directory) || tree_.kindOf(path) == Kind::Directory ||
            (tree_.exists(path) && tree_.kindOf(backup) == Kind::Directory)) {
            fail("the registry " + path + " cannot be written");
            return;
        }
        if (tree_.exists(path) && tree_.exists(backup)) {
            noteLoss(backup);
            (void)tree_.remove(backup);
        }
        tree_.write(path, 0);
    }

    /// Writes a file of the installer's own; a failure has no consequence.
    void writeOwnFile(const std::string& path)
    {
        const std::string directory = path.substr(0, path.rfind('/'));
        if (!tree_.canCreateIn(directory) || tree_.kindOf(path) == Kind::Directory)
            return;
        forecast_.notRestored.push_back(path);
        tree_.write(path, 0);
    }

    void createFlag(const std::string& home)
    {
        if (!createSingleUserModeFile)
            return;
        writeOwnFile(singleUserFlagPath(home));
        if (tree_.exists(singleUserFlagPath(home)))
            writeOwnFile(fileIndexPath(home)); // where it is listed
    }

    /// The common directory; a missing setting is written unless traces go elsewhere.
    std::string readCommonSetting()
    {
        const std::string path = commonSettingPath();
        const bool readOnly = custom_log_path_available;
        if (!readOnly && !tree_.exists(path) && tree_.makePath(path) &&
            tree_.canCreateIn(path.substr(0, path.rfind('/')))) {
            forecast_.notRestored.push_back(path);
            tree_.write(path, 0);
        }
        return readCommonDirectory(true);
    }

    void setUpLogs()
    {
        std::string directory = new_log_path;
        if (!custom_log_path_available) {
            const std::string common = readCommonSetting();
            (void)tree_.makePath(common + "/");
            directory = commonLogDir(common);
        }
        if (!directory.empty() && !tree_.exists(directory))
            (void)tree_.makePath(directory + "/");
    }

    // Removals.

    void remove(Discovery& found, const InstallRegistry& request)
    {
        if (!found.registryFound) {
            forecast_.operation = "refused";
            fail("no intact installation is registered in " + registryPath(localInstall));
            return;
        }
        InstallRegistry& registry = found.registry;
        const std::string& exploiter = request.exploiters;
        forecast_.operation = "none";
        if (!isExploiterRegistered(registry, exploiter) && registry.exploiters != ":")
            return;
        if (removeExploiter(registry, exploiter) == OthersRemain) {
            forecast_.operation = "unregistration";
            saveRegistry();
            return;
        }
        forecast_.operation = "removal";
        removeToolkit(found);
    }

    void removeToolkit(const Discovery& found)
    {
        const std::string& home = forecast_.home;
        stopScanners(home);
        removeListed(found);
        for (const RemovalStep& step : removalSteps(listedAny_)) {
            const std::string path = joinPathOptional(home, step.path);
            if (step.kind == IfEmpty)
                (void)tree_.remove(path);
            else
                (void)tree_.removeTree(path, step.kind == WithEverything);
        }
        if (!localInstall) {
            const std::string common = readCommonDirectory(true);
            (void)tree_.removeTree(joinPath(common, joinPath(zorCommonDir, logDir)), false);
            (void)tree_.removeTree(joinPath(common, zorCommonDir), false);
        }
        (void)tree_.remove(registryPath(localInstall));
        (void)tree_.remove(registryDirectory(localInstall));
    }

    /// The files of the index, which is completed first.
    void removeListed(const Discovery& found)
    {
        const std::set<std::string> files = indexedFiles(found);
        const std::string& index = found.indexPath;
        // It is written anew even if it was missing, unless it cannot be.
        listedAny_ = tree_.canCreateIn(forecast_.home) || tree_.exists(index);
        for (const std::string& path : files) {
            if (tree_.kindOf(path) != Kind::Directory)
                (void)tree_.remove(path);
        }
        (void)tree_.remove(index);
    }

    std::set<std::string> indexedFiles(const Discovery& found) const
    {
        std::set<std::string> files;
        const GuardedText index = readGuarded(found.indexPath, IndexLimit);
        if (index.state == ReadState::Read)
            readFileIndex(MemoryFile(index.text).path(), files);
        addInstallerFiles(found.registry, files);
        return files;
    }

    // Private mode.

    void runPrivately()
    {
        // Its result is that of the run, whatever the removal before it did.
        forecast_.failure.clear();
        forecast_.privateHome = commandLine_.privatePath;
        if (commandLine_.privateAction == 'r') {
            forecast_.privateOperation = "removal";
            stopScanners(forecast_.privateHome);
            (void)tree_.removeTree(forecast_.privateHome, true);
            return;
        }
        forecast_.privateOperation = "fresh";
        forecast_.package = spbPackage;
        keepsBackups_ = false;
        detectSingleUserMode(forecast_.privateHome);
        freshInstall(forecast_.privateHome, false);
    }

    // What all of them need.

    void stopScanners(const std::string& home)
    {
        forecast_.stopsScanners = true;
        forecast_.commands.push_back(joinPath(home, trawlfsExe) + " -shutdown");
        for (const char* const arguments :
             {"-disable all", "-shutdown all -timeout 60 -force", "-shutdown all -timeout 120"})
            runControl(home, arguments);
    }

    void runControl(const std::string& home, const std::string& arguments)
    {
        forecast_.commands.push_back(joinPath(home, trawlcfgExe) + " " + arguments);
    }

    void fail(const std::string& reason)
    {
        if (forecast_.failure.empty())
            forecast_.failure = reason;
    }

    /// Remembers a file, or all files in a directory, that a rollback does not restore.
    void noteLoss(const std::string& path)
    {
        if (tree_.kindOf(path) == Kind::Directory) {
            for (const std::string& child : tree_.list(path))
                noteLoss(child);
        } else if (tree_.exists(path)) {
            forecast_.notRestored.push_back(path);
        }
    }

    unsigned long long blockSize()
    {
        if (blockSize_ == 0)
            measureSpace();
        return blockSize_;
    }

    void measureSpace()
    {
        std::string place = forecast_.privateHome.empty() ? forecast_.home : forecast_.privateHome;
        while (!place.empty() && !pathExists(place))
            place.erase(place.rfind('/') == std::string::npos ? 0 : place.rfind('/'));
        struct statvfs status = {};
        blockSize_ = 4096;
        if (statvfs(place.empty() ? "/" : place.c_str(), &status) != 0)
            return;
        blockSize_ = status.f_frsize != 0 ? status.f_frsize : 4096;
        forecast_.spaceAvailable = static_cast<unsigned long long>(status.f_bavail) * blockSize_;
    }

    void judge(const Discovery& found)
    {
        (void)blockSize();
        if (forecast_.failure.empty() && forecast_.spaceNeeded > forecast_.spaceAvailable)
            fail("the file system has not enough space");
        if (privateMode) { // never rolled back
            for (const std::set<std::string>& paths : {tree_.deleted(), tree_.written()})
                forecast_.notRestored.insert(forecast_.notRestored.end(), paths.begin(),
                                             paths.end());
        }
        const std::set<std::string> known = indexedFiles(found);
        const std::set<std::string> own = {
            found.indexPath, registryPath(localInstall), backupName(registryPath(localInstall)),
            joinPath(forecast_.home, joinPath(auxDirInstall, installProps))};
        for (const std::string& path : tree_.deleted()) {
            if (!known.contains(path) && !own.contains(path))
                forecast_.ownerFiles.push_back(path);
        }
        forecast_.unchanged = tree_.created().empty() && tree_.written().empty() &&
                              tree_.deleted().empty() && tree_.createdDirectories().empty() &&
                              tree_.deletedDirectories().empty() && modesAreSet(found);
    }

    /// Whether the permission pass of an installation would change nothing.
    bool modesAreSet(const Discovery& found) const
    {
        if (!found.installAction || !forecast_.failure.empty())
            return true;
        const std::vector<Permission> table = permissionTable(found);
        return std::all_of(table.begin(), table.end(), [](const Permission& permission) {
            struct stat status = {};
            return stat(permission.path.c_str(), &status) != 0 ||
                   (status.st_mode & 07777) == permission.mode;
        });
    }

    const CommandLine& commandLine_;
    Forecast& forecast_;
    SimulatedTree& tree_;
    std::set<std::string> deployed_;
    bool keepsBackups_ = true;
    bool listedAny_ = false;
    unsigned long long blockSize_ = 0;
};

} // namespace

std::vector<std::string> withoutLogFile(const std::vector<std::string>& arguments)
{
    std::vector<std::string> kept;
    for (std::size_t at = 0; at < arguments.size(); ++at) {
        const std::string& option = arguments[at];
        const bool isOption = at >= 2 && option.size() == 2 && option[0] == '-';
        const bool takesArgument =
            isOption && std::strchr("dfsoc", option[1]) != nullptr && at + 1 < arguments.size();
        if (takesArgument && option[1] == 'o') {
            ++at;
            continue;
        }
        kept.push_back(option);
        if (takesArgument)
            kept.push_back(arguments[++at]);
    }
    return kept;
}

PlannedRun parseRun(const std::vector<std::string>& arguments)
{
    std::vector<std::string> texts = withoutLogFile(arguments);
    texts.insert(texts.begin(), "wzorinst");
    std::vector<char*> pointers;
    for (std::string& text : texts)
        pointers.push_back(text.data());
    pointers.push_back(nullptr);

    PlannedRun run;
    const CapturedOutput output;
    if (!isRoot())
        localInstall = true;
    if (parseCommandLine(static_cast<int>(texts.size()), pointers.data(), run.commandLine) != 0)
        run.error = output.firstLine();
    else if (fixDestination(run.commandLine, defaultInstallDir(localInstall)) != 0)
        run.error = "no destination directory";
    return run;
}

Forecast forecastRun(const PlannedRun& run)
{
    Forecast forecast;
    forecast.type = installTypeName(localInstall);
    forecast.action = std::string(1, run.commandLine.action);
    forecast.exploiter = run.commandLine.request.exploiters;
    Simulation(run.commandLine, forecast).run();
    std::vector<std::string>& lost = forecast.notRestored;
    std::sort(lost.begin(), lost.end());
    lost.erase(std::unique(lost.begin(), lost.end()), lost.end());
    return forecast;
}
