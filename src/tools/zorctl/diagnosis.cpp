#include "diagnosis.h"

#include "build_stamp.h"
#include "discovery.h"
#include "file_index.h"
#include "fresh_install.h"
#include "guarded_file.h"
#include "guarded_index.h"
#include "locations.h"
#include "paths.h"
#include "permissions.h"
#include "removal.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "settings.h"
#include "settings_upgrade.h"
#include "transaction.h"
#include "tree_removal.h"
#include "trusted_path.h"

#include <utility>

namespace {

/// What the first line of an index says, or an empty record.
InstallRegistry stampOfHeader(const std::string& line)
{
    const std::string start = "# File created by ZOR: ";
    InstallRegistry stamped;
    if (!line.starts_with(start))
        return stamped;
    const std::string stamp =
        line.substr(start.size(), line.find(' ', start.size()) - start.size());
    stamped.version = stampVersion(stamp);
    stamped.buildDate = stampBuildDate(stamp);
    return stamped;
}

/// The name that `backup` is a backup of.
std::string originalOf(const std::string& backup)
{
    return backup.substr(0, backup.size() - BackupSuffix.size());
}

} // namespace

Diagnosis::Diagnosis(Installation& found, std::string home) : found_(found), home_(std::move(home))
{
    restoreRegistry();
    if (found_.registryState == "complete")
        home_ = found_.registry.homeDirectory;
    else if (home_.empty())
        home_ = defaultInstallDir(localInstall);
    readIndexOf(home_);
    for (const std::string& backup : packageBackups(false))
        advise("untrusted-backup",
               backup + " may be somebody else's: look at it, and rename it or delete it");
    if (found_.registryState != "complete")
        diagnoseUnregistered();
    else if (!packageBackups().empty() || found_.indexState == "interrupted")
        diagnoseDeployment();
    else if (isInterruptedRemoval())
        diagnoseRemoval();
    else
        diagnoseRest();
}

bool Diagnosis::carryOut()
{
    bool good = true;
    for (Action& action : actions_) {
        const bool done = action.carryOut();
        action.outcome = done ? "done" : "failed";
        good = good && done;
    }
    return good;
}

// The registry comes first: it says where everything else is.

void Diagnosis::restoreRegistry()
{
    const std::string& path = found_.registryPath;
    const std::string backup = backupName(path);
    if (found_.registryState == "complete") {
        if (found_.registryBackupState != "missing")
            deleteLater("delete-backup", backup);
        return;
    }
    if (found_.registryBackupState == "complete") {
        interrupted_ = "registration";
        if (!isTrustedFile(backup)) {
            advise("untrusted-backup", backup +
                                           " may be somebody else's: look at it, and "
                                           "rename it to " +
                                           path);
            return;
        }
        add("restore-registry", path, [backup] { return restoreTrusted(backup); });
        const GuardedText text = readGuarded(backup, RegistryLimit);
        if (parseRegistry(MemoryFile(text.text).path(), &found_.registry) == RegistryOk)
            found_.registryState = "complete";
    } else if (found_.registryState == "empty") {
        interrupted_ = "installation";
        deleteLater("delete-empty-registry", path);
    } else if (found_.registryState != "missing") {
        advise("registry-damaged", path + " is no registry (" + found_.registryState +
                                       "): restore it, or delete it and install again");
    }
}

void Diagnosis::readIndexOf(const std::string& home)
{
    index_ = fileIndexPath(home);
    GuardedIndex index = readGuardedIndex(index_);
    if (!index.isRead())
        return;
    found_.indexState = index.state;
    stamp_ = stampOfHeader(index.header);
    listed_ = std::move(index.files);
}

/// The backups of files that an installation replaced. One that somebody else may have made is no
/// evidence of anything.
std::vector<std::string> Diagnosis::packageBackups(bool areTrusted) const
{
    bool complete = true;
    std::vector<std::string> backups;
    for (const std::string& path : findBackups(home_, complete)) {
        const std::string original = originalOf(path);
        const bool known = found_.indexState != "complete" || listed_.contains(original);
        if (known && !listed_.contains(path) && isTrustedFile(path) == areTrusted)
            backups.push_back(path);
    }
    return backups;
}

// Installations and upgrades.

/// Whether everything was extracted and registered before the run was interrupted: the index
/// is finished, and its version is the registered one.
bool Diagnosis::wasRegistered() const
{
    return found_.indexState == "complete" &&
           compareVersions(stamp_.version, found_.registry.version) == 0 &&
           buildDateNumber(stamp_.buildDate) <= buildDateNumber(found_.registry.buildDate);
}

void Diagnosis::diagnoseDeployment()
{
    interrupted_ = "upgrade";
    if (wasRegistered())
        goForward();
    else
        goBack();
}

/// The new files are complete and registered: what came after that is done now.
void Diagnosis::goForward()
{
    add("customise", home_, [this] {
        return customizeDeployment(home_, found_.registry, custom_log_path_available) == 0;
    });
    for (const std::string& backup : packageBackups())
        deleteLater("delete-backup", backup);
    recordType();
    setModes();
    deleteCache();
    enableScanners();
}

/// The old files come back, as a rollback would have done it.
void Diagnosis::goBack()
{
    std::set<std::string> restored;
    for (const std::string& backup : packageBackups()) {
        const std::string path = originalOf(backup);
        restored.insert(path);
        add("restore", path, [backup] { return restoreTrusted(backup); });
    }
    restoreIndex(restored);
    if (advice_.empty()) // a directory that was open to others must not look closed next time
        setModes();
    enableScanners();
    advise("reinstall", "what the upgrade had deleted (properties, obsolete files) is not back: "
                        "run the same command again");
}

/// An unfinished index lists what was being installed; the names of what was there are known
/// only as far as it was replaced.
void Diagnosis::restoreIndex(const std::set<std::string>& restored)
{
    if (found_.indexState == "complete" || found_.registryState != "complete")
        return;
    add("rebuild-index", index_, [this, restored] {
        std::set<std::string> files = restored;
        for (const std::string& path : listed_) {
            if (pathExists(path))
                files.insert(path);
        }
        addPresent(home_, files);
        addInstallerFiles(found_.registry, files);
        writeFileIndex(index_, files);
        return pathExists(index_);
    });
}

/// Adds what the installer itself always finds in its places.
void Diagnosis::addPresent(const std::string& home, std::set<std::string>& files) const
{
    for (const std::string& path : {joinPath(home, trawlcfgExe), joinPath(home, trawlfsExe),
                                    joinPath(joinPath(home, spbCfgDir), zorProps),
                                    joinPath(joinPath(home, spbCfgDir), traceProps),
                                    joinPath(home, joinPath(auxDirInstall, installProps))}) {
        if (pathExists(path))
            files.insert(path);
    }
}

// Nothing registered.

void Diagnosis::diagnoseUnregistered()
{
    const std::vector<std::string> backups = packageBackups();
    const bool hasIndex = found_.indexState == "complete" || found_.indexState == "interrupted";
    const bool hasFiles = pathExists(joinPath(home_, spbBinDir));
    if (backups.empty() && !hasIndex && !hasFiles)
        return;
    interrupted_ = "installation";
    for (const std::string& backup : backups) {
        add("restore", originalOf(backup), [backup] { return restoreTrusted(backup); });
    }
    advise("unregistered-files", home_ + " holds files, but nothing is registered: install "
                                         "again, or delete them");
}

// Removals.

/// Whether a removal of the last exploiter was interrupted when it had deleted the scanner
/// control, so that the installer refuses to go on. It deletes the listed files in the order of
/// their names and leaves the directories, which no careless deletion does.
bool Diagnosis::isInterruptedRemoval() const
{
    if (exploiterList(found_.registry.exploiters).size() > 1 ||
        pathExists(joinPath(home_, trawlcfgExe)))
        return false;
    const std::string settings = joinPath(joinPath(home_, spbCfgDir), zorProps);
    if (found_.indexState != "complete") // all listed files are gone
        return found_.indexState == "missing" && !pathExists(settings);
    if (!pathExists(joinPath(joinPath(home_, spbBinDir), etcDir)))
        return false;
    std::set<std::string> own; // they may be missing at any time
    addInstallerFiles(found_.registry, own);
    bool metPresent = false;
    for (const std::string& path : listed_) {
        if (own.contains(path))
            continue;
        const bool present = pathExists(path);
        if (metPresent && !present)
            return false;
        metPresent = metPresent || present;
    }
    return true;
}

void Diagnosis::diagnoseRemoval()
{
    interrupted_ = "removal";
    add("finish-removal", home_, [this] {
        FileTransaction transaction;
        InstallRegistry request;
        const std::vector<std::string> users = exploiterList(found_.registry.exploiters);
        request.exploiters = users.empty() ? std::string() : users.front();
        if (users.empty())
            found_.registry.exploiters = ":";
        return removeInstallation(transaction, found_.registry, request, &index_) == 0 &&
               !pathExists(found_.registryPath);
    });
}

// What is left when nothing has to go back or forward.

void Diagnosis::diagnoseRest()
{
    recordType();
    if (found_.homeState == "control-missing" || found_.homeState == "control-empty" ||
        found_.homeState == "missing")
        advise("broken", "the installation is broken (" + found_.homeState + "): install again");
    std::size_t missing = 0;
    std::set<std::string> own;
    addInstallerFiles(found_.registry, own);
    bool anyProperties = false;
    bool propertiesLeft = false;
    for (const std::string& path : listed_) {
        const bool present = pathExists(path);
        if (!present && !own.contains(path))
            ++missing;
        if (path.starts_with(joinPath(home_, spbPropertiesDir) + "/")) {
            anyProperties = true;
            propertiesLeft = propertiesLeft || present;
        }
    }
    if (anyProperties && !propertiesLeft && found_.homeState == "intact") {
        interrupted_ = "upgrade"; // it deletes them first, when the scanners are stopped
        enableScanners();
    }
    if (missing != 0)
        advise("files-missing", std::to_string(missing) +
                                    " files of the index are missing: run the interrupted "
                                    "command again, or install again");
    else if (found_.indexState == "missing" && found_.homeState == "intact")
        advise("index-missing", "there is no index: install again to get one");
}

// Steps.

void Diagnosis::recordType()
{
    if (found_.recordedType != "missing" || found_.homeState == "missing" ||
        !pathExists(joinPath(home_, auxDirInstall)))
        return;
    const std::string path = joinPath(home_, joinPath(auxDirInstall, installProps));
    add("record-type", path, [this, path] {
        writeInstallType(home_, &index_);
        return pathExists(path);
    });
}

void Diagnosis::setModes()
{
    add("set-modes", home_, [this] {
        Discovery place;
        place.registry = found_.registry;
        place.homeExists = true;
        place.currentZorHome = place.currentCfgHome = home_;
        applyPermissions(place);
        return true;
    });
}

/// As at the end of an upgrade: the scanners start with an empty cache.
void Diagnosis::deleteCache()
{
    const std::string cache = joinPath(home_, cacheDir);
    add("delete-cache", cache, [this, cache] {
        FileTransaction transaction;
        (void)removeDir(transaction, home_, cacheDir, true); // always 0
        return !pathExists(cache);
    });
}

void Diagnosis::enableScanners()
{
    add("enable-scanners", joinPath(home_, trawlcfgExe),
        [this] { return restartScanners(home_) == 0; });
}

void Diagnosis::deleteLater(const char* code, const std::string& path)
{
    add(code, path, [path] { return unlinkPath(path) == 0; });
}

void Diagnosis::add(const char* code, const std::string& path, std::function<bool()> carryOut)
{
    actions_.push_back({code, path, std::move(carryOut)});
}

void Diagnosis::advise(const char* code, std::string text)
{
    advice_.push_back({code, std::move(text)});
}
