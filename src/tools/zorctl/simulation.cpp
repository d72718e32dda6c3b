#include "simulation.h"

#include "common_directory.h"
#include "conclusion.h"
#include "discovery.h"
#include "exploiters.h"
#include "file_index.h"
#include "locations.h"
#include "paths.h"
#include "removal.h"
#include "safe_path.h"
#include "settings.h"
#include "simulated_extraction.h"
#include "single_user_mode.h"
#include "template_variables.h"
#include "trace_directory.h"
#include "upgrade.h"

#include <algorithm>
#include <set>

#include <sys/stat.h>
#include <unistd.h>

namespace {

using Kind = SimulatedTree::Kind;

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
        conclude(forecast_, found);
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
        simulateExtraction(forecast_, home, fresh, keepsBackups_, deployed_);
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
        const std::set<std::string> files = removableFiles(found);
        const std::string& index = found.indexPath;
        // It is written anew even if it was missing, unless it cannot be.
        listedAny_ = tree_.canCreateIn(forecast_.home) || tree_.exists(index);
        for (const std::string& path : files) {
            if (tree_.kindOf(path) != Kind::Directory)
                (void)tree_.remove(path);
        }
        (void)tree_.remove(index);
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

    void fail(const std::string& reason) { forecast_.fail(reason); }
    void noteLoss(const std::string& path) { forecast_.noteLoss(path); }

    const CommandLine& commandLine_;
    Forecast& forecast_;
    SimulatedTree& tree_;
    std::set<std::string> deployed_;
    bool keepsBackups_ = true;
    bool listedAny_ = false;
};

} // namespace

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
