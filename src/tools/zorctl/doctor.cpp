#include "doctor.h"

#include "build_stamp.h"
#include "discovery.h"
#include "exit_status.h"
#include "file_index.h"
#include "fresh_install.h"
#include "guarded_file.h"
#include "installation_lock.h"
#include "json_report.h"
#include "locations.h"
#include "paths.h"
#include "permissions.h"
#include "removal.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "settings.h"
#include "settings_upgrade.h"
#include "shown_text.h"
#include "survey.h"
#include "tool_output.h"
#include "transaction.h"
#include "trusted_path.h"

#include <algorithm>
#include <cstdio>
#include <functional>
#include <iostream>
#include <set>
#include <vector>

#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int DoctorSchema = 1;
constexpr std::size_t IndexLimit = std::size_t{64} << 20;

/// One thing to do.
struct Action {
    std::string code;
    std::string path; ///< what it is about; empty: the installation
    std::function<bool()> carryOut;
    std::string outcome = "planned"; ///< then "done" or "failed"
};

/// What the first line of an index says, or an empty record.
InstallRegistry stampOfIndex(const std::string& text)
{
    const std::string start = "# File created by ZOR: ";
    InstallRegistry record;
    const std::string line = text.substr(0, text.find('\n'));
    if (!line.starts_with(start))
        return record;
    const std::string stamp =
        line.substr(start.size(), line.find(' ', start.size()) - start.size());
    record.version = stampVersion(stamp);
    record.buildDate = stampBuildDate(stamp);
    return record;
}

class Doctor {
public:
    Doctor(Installation& found, const DoctorOptions& options) : found_(found), options_(options) {}

    /// Finds out what was interrupted, and what is to be done.
    void diagnose()
    {
        restoreRegistry();
        home_ = found_.registryState == "complete" ? found_.registry.homeDirectory : usualHome();
        readIndexOf(home_);
        if (found_.registryState != "complete") {
            diagnoseUnregistered();
            return;
        }
        if (!packageBackups().empty() || found_.indexState == "interrupted")
            diagnoseDeployment();
        else if (isInterruptedRemoval())
            diagnoseRemoval();
        else
            diagnoseRest();
    }

    /// Does what diagnose() found; false if something failed.
    bool carryOut()
    {
        bool good = true;
        for (Action& action : actions_) {
            const bool done = action.carryOut();
            action.outcome = done ? "done" : "failed";
            good = good && done;
        }
        return good;
    }

    [[nodiscard]] const std::vector<Action>& actions() const { return actions_; }
    [[nodiscard]] const std::vector<Problem>& advice() const { return advice_; }
    [[nodiscard]] const std::string& interrupted() const { return interrupted_; }
    [[nodiscard]] const std::string& home() const { return home_; }

private:
    // The registry comes first: it says where everything else is.

    void restoreRegistry()
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
            add("restore-registry", path,
                [backup, path] { return std::rename(backup.c_str(), path.c_str()) == 0; });
            const GuardedText text = readGuarded(backup, IndexLimit);
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

    std::string usualHome() const
    {
        return options_.home.empty() ? defaultInstallDir(localInstall) : options_.home;
    }

    void readIndexOf(const std::string& home)
    {
        index_ = fileIndexPath(home);
        const GuardedText text = readGuarded(index_, IndexLimit);
        if (text.state != ReadState::Read)
            return;
        readFileIndex(MemoryFile(text.text).path(), listed_);
        stamp_ = stampOfIndex(text.text);
        const std::string line = text.text.substr(0, text.text.find('\n'));
        found_.indexState =
            line.find(" installed on ") == std::string::npos ? "interrupted" : "complete";
    }

    /// The backups of files that an installation replaced.
    std::vector<std::string> packageBackups() const
    {
        bool complete = true;
        std::vector<std::string> backups;
        for (const std::string& path : findBackups(home_, complete)) {
            const std::string original = path.substr(0, path.size() - BackupSuffix.size());
            const bool known = found_.indexState != "complete" || listed_.contains(original);
            if (known && !listed_.contains(path))
                backups.push_back(path);
        }
        return backups;
    }

    // Installations and upgrades.

    /// Whether everything was extracted and registered before the run was interrupted: the index
    /// is finished, and its version is the registered one.
    bool wasRegistered() const
    {
        return found_.indexState == "complete" &&
               compareVersions(stamp_.version, found_.registry.version) == 0 &&
               buildDateNumber(stamp_.buildDate) <= buildDateNumber(found_.registry.buildDate);
    }

    void diagnoseDeployment()
    {
        interrupted_ = "upgrade";
        if (wasRegistered())
            goForward();
        else
            goBack();
    }

    /// The new files are complete and registered: what came after that is done now.
    void goForward()
    {
        add("customise", home_, [this] {
            return customizeDeployment(home_, found_.registry, custom_log_path_available) == 0;
        });
        for (const std::string& backup : packageBackups())
            deleteLater("delete-backup", backup);
        recordType();
        setModes();
        enableScanners();
    }

    /// The old files come back, as a rollback would have done it.
    void goBack()
    {
        std::set<std::string> restored;
        for (const std::string& backup : packageBackups()) {
            const std::string path = backup.substr(0, backup.size() - BackupSuffix.size());
            if (!isTrustedFile(backup)) {
                advise("untrusted-backup",
                       backup + " may be somebody else's: look at it, and rename it or delete it");
                continue;
            }
            restored.insert(path);
            add("restore", path,
                [backup, path] { return std::rename(backup.c_str(), path.c_str()) == 0; });
        }
        restoreIndex(restored);
        if (advice_.empty()) // a directory that was open to others must not look closed next time
            setModes();
        enableScanners();
        advise("reinstall",
               "what the upgrade had deleted (properties, obsolete files) is not back: "
               "run the same command again");
    }

    /// An unfinished index lists what was being installed; the names of what was there are known
    /// only as far as it was replaced.
    void restoreIndex(const std::set<std::string>& restored)
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
    void addPresent(const std::string& home, std::set<std::string>& files) const
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

    void diagnoseUnregistered()
    {
        const std::vector<std::string> backups = packageBackups();
        const bool hasIndex = found_.indexState == "complete" || found_.indexState == "interrupted";
        const bool hasFiles = pathExists(joinPath(home_, spbBinDir));
        if (backups.empty() && !hasIndex && !hasFiles)
            return;
        interrupted_ = "installation";
        for (const std::string& backup : backups) {
            const std::string path = backup.substr(0, backup.size() - BackupSuffix.size());
            if (isTrustedFile(backup))
                add("restore", path,
                    [backup, path] { return std::rename(backup.c_str(), path.c_str()) == 0; });
        }
        advise("unregistered-files", home_ + " holds files, but nothing is registered: install "
                                             "again, or delete them");
    }

    // Removals.

    /// Whether a removal of the last exploiter was interrupted when it had deleted the scanner
    /// control, so that the installer refuses to go on. It deletes the listed files in the order of
    /// their names and leaves the directories, which no careless deletion does.
    bool isInterruptedRemoval() const
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

    void diagnoseRemoval()
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

    void diagnoseRest()
    {
        recordType();
        if (found_.homeState == "control-missing" || found_.homeState == "control-empty" ||
            found_.homeState == "missing")
            advise("broken",
                   "the installation is broken (" + found_.homeState + "): install again");
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

    void recordType()
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

    void setModes()
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

    void enableScanners()
    {
        add("enable-scanners", joinPath(home_, trawlcfgExe),
            [this] { return restartScanners(home_) == 0; });
    }

    void deleteLater(const char* code, const std::string& path)
    {
        add(code, path, [path] { return unlink(path.c_str()) == 0; });
    }

    void add(const char* code, const std::string& path, std::function<bool()> carryOut)
    {
        actions_.push_back({code, path, std::move(carryOut)});
    }

    void advise(const char* code, std::string text) { advice_.push_back({code, std::move(text)}); }

    Installation& found_;
    const DoctorOptions& options_;
    std::string home_;
    std::string index_;
    std::set<std::string> listed_;
    InstallRegistry stamp_;
    std::string interrupted_;
    std::vector<Action> actions_;
    std::vector<Problem> advice_;
};

Installation surveyAsked()
{
    return localInstall ? surveyOwn() : surveyShared();
}

void printText(const Doctor& doctor, const Installation& after, const DoctorOptions& options)
{
    std::cout << "Interrupted: "
              << (doctor.interrupted().empty() ? "nothing" : doctor.interrupted()) << '\n';
    for (const Action& action : doctor.actions())
        std::cout << (options.apply ? action.outcome : "to do") << ": " << action.code << " "
                  << shown(action.path) << '\n';
    for (const Problem& problem : doctor.advice())
        std::cout << "advice: " << problem.code << ": " << shown(problem.text) << '\n';
    std::cout << "State: " << healthName(after.health) << '\n';
    if (!options.apply && !doctor.actions().empty())
        std::cout << "Nothing was changed: --apply does what is listed\n";
}

Json toJson(const Doctor& doctor, const Installation& after, const DoctorOptions& options)
{
    Json report = reportHead("doctor", DoctorSchema);
    report["applied"] = options.apply;
    report["type"] = installTypeName(localInstall);
    report["home"] = jsonText(doctor.home());
    report["interrupted"] =
        doctor.interrupted().empty() ? Json(nullptr) : Json(doctor.interrupted());
    report["actions"] = Json::array();
    for (const Action& action : doctor.actions())
        report["actions"].push_back({{"action", action.code},
                                     {"path", jsonText(action.path)},
                                     {"outcome", action.outcome}});
    report["advice"] = Json::array();
    for (const Problem& problem : doctor.advice())
        report["advice"].push_back({{"code", problem.code}, {"text", jsonText(problem.text)}});
    report["installation"] = toJson(after);
    return report;
}

int exitStatusOf(const Doctor& doctor, const Installation& after, const DoctorOptions& options,
                 bool good)
{
    if (after.health == Health::Unknown)
        return ToolTrouble;
    if (!good || (!options.apply && !doctor.actions().empty()) || after.health == Health::Damaged)
        return ToolDiffers;
    if (after.health == Health::Absent)
        return ToolNotInstalled;
    return doctor.advice().empty() ? ToolOk : ToolDiffers;
}

} // namespace

int examine(const DoctorOptions& options)
{
    localInstall = options.type.empty() ? !isRoot() : options.type == valueInstallLocal;
    ScopedFd lock(-1);
    if (!options.apply) {
        lock = lockForReading(localInstall);
    } else if (takeLock(lockPath(localInstall), true, 0, lock) != LockState::Held) {
        complain("cannot take the lock " + shown(lockPath(localInstall)));
        return ToolLocked;
    }

    Installation found = surveyAsked();
    if (found.singleUserMode.value_or(false))
        enterSingleUserMode();
    Doctor doctor(found, options);
    doctor.diagnose();
    const bool good = !options.apply || doctor.carryOut();
    const Installation after = surveyAsked();
    if (options.json)
        printJson(toJson(doctor, after, options));
    else
        printText(doctor, after, options);
    return exitStatusOf(doctor, after, options, good);
}
