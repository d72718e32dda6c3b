#include "survey.h"

#include "directory_names.h"
#include "file_index.h"
#include "guarded_file.h"
#include "guarded_index.h"
#include "locations.h"
#include "paths.h"
#include "property_file.h"
#include "settings.h"
#include "single_user_mode.h"

#include <algorithm>
#include <cerrno>
#include <iterator>
#include <set>
#include <string_view>
#include <utility>

#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr std::size_t PropertyLimit = std::size_t{1} << 20;

bool hasContent(const std::string& text)
{
    return text.find_first_not_of(" \t\r\n") != std::string::npos;
}

/// Reads and parses the registry at `path`; returns the name of its state.
std::string readRegistry(const std::string& path, InstallRegistry& registry)
{
    const GuardedText file = readGuarded(path, RegistryLimit);
    if (file.state != ReadState::Read)
        return readStateName(file.state);
    if (!hasContent(file.text))
        return "empty";
    switch (parseRegistry(MemoryFile(file.text).path(), &registry)) {
    case RegistryOk:
        return "complete";
    case RegistryBadVersion:
        return "bad-version";
    case RegistryIncomplete:
        return "incomplete";
    default:
        return "unreadable";
    }
}

void report(Installation& found, const char* code, std::string text)
{
    found.problems.push_back({code, std::move(text)});
}

/// True if the installation is run by the current user, so that it has to be writable for it.
bool isOurs(const Installation& found)
{
    return found.local ? found.uid == getuid() : isRoot();
}

/// Judges the home directory by the rules of the installer, but without its probe.
std::string homeStateOf(const Installation& found)
{
    const std::string& home = found.registry.homeDirectory;
    struct stat status = {};
    if (stat(home.c_str(), &status) != 0)
        return errno == ENOENT || errno == ENOTDIR ? "missing" : "unknown";
    if (!S_ISDIR(status.st_mode))
        return "missing";
    if (isOurs(found) && faccessat(AT_FDCWD, home.c_str(), W_OK | X_OK, AT_EACCESS) != 0)
        return "not-writable";
    if (stat(joinPath(home, trawlcfgExe).c_str(), &status) != 0)
        return errno == ENOENT || errno == ENOTDIR ? "control-missing" : "unknown";
    return status.st_size == 0 ? "control-empty" : "intact";
}

/// Reads the index; returns its paths.
std::set<std::string> readIndex(Installation& found)
{
    GuardedIndex index = readGuardedIndex(fileIndexPath(found.registry.homeDirectory));
    found.indexState = index.state;
    if (index.isRead())
        found.indexedFiles = index.files.size();
    return std::move(index.files);
}

std::string recordedTypeOf(const std::string& home)
{
    const GuardedText file =
        readGuarded(joinPath(home, joinPath(auxDirInstall, installProps)), PropertyLimit);
    if (file.state == ReadState::Missing)
        return "missing";
    PropertyFile properties;
    if (file.state != ReadState::Read || properties.load(MemoryFile(file.text).path()) != 0)
        return "unknown";
    return installTypeName(properties.getValue(keyInstallType) == valueInstallLocal);
}

/// Whether the flag of single-user mode is there: the installer asks whether it can be opened.
std::optional<bool> singleUserModeOf(const std::string& home)
{
    struct stat status = {};
    if (stat(singleUserFlagPath(home).c_str(), &status) == 0)
        return true;
    if (errno == ENOENT || errno == ENOTDIR)
        return false;
    return std::nullopt;
}

/// The backups that an interrupted run left: those of files that the installer put there. Another
/// name that ends like a backup is the administrator's.
void findLeftBackups(Installation& found, const std::set<std::string>& index)
{
    found.backupsKnown = true;
    const bool knowsItsFiles = found.indexState == "complete";
    for (const std::string& path : findBackups(found.registry.homeDirectory, found.backupsKnown)) {
        const std::string original = path.substr(0, path.size() - BackupSuffix.size());
        if (!knowsItsFiles || (index.contains(original) && !index.contains(path)))
            found.backups.push_back(path);
    }
}

void judgeHome(Installation& found)
{
    const std::string& home = found.registry.homeDirectory;
    const std::string control = joinPath(home, trawlcfgExe);
    if (found.homeState == "missing")
        report(found, "home-missing", "there is no directory " + home);
    else if (found.homeState == "not-writable")
        report(found, "home-not-writable", "no file can be created in " + home);
    else if (found.homeState == "control-missing")
        report(found, "control-missing", "the scanner control " + control + " is missing");
    else if (found.homeState == "control-empty")
        report(found, "control-empty", "the scanner control " + control + " is empty");
}

void judgeIndex(Installation& found)
{
    const std::string path = fileIndexPath(found.registry.homeDirectory);
    if (found.indexState == "interrupted")
        report(found, "index-interrupted",
               "an extraction was interrupted: " + path + " is not finished");
    else if (found.indexState == "missing" && found.homeState != "missing")
        report(found, "index-missing", "there is no index " + path);
    else if (found.indexState == "not-regular" || found.indexState == "too-large")
        report(found, "index-unusable", path + " cannot be an index: " + found.indexState);
}

void judgeRegistry(Installation& found)
{
    const std::string& state = found.registryState;
    const bool hasBackup = found.registryBackupState == "complete";
    const std::string hint =
        hasBackup ? "; " + backupName(found.registryPath) + " is complete" : std::string();
    if (state == "missing" && hasBackup)
        report(found, "registry-lost", found.registryPath + " is missing" + hint);
    else if (state == "empty" || state == "incomplete" || state == "bad-version" ||
             state == "not-regular" || state == "too-large")
        report(found, "registry-damaged", found.registryPath + " is no registry: " + state + hint);
}

/// Fills in everything that a complete registry leads to.
void surveyHome(Installation& found)
{
    found.homeState = homeStateOf(found);
    const std::set<std::string> index = readIndex(found);
    found.recordedType = recordedTypeOf(found.registry.homeDirectory);
    found.singleUserMode = singleUserModeOf(found.registry.homeDirectory);
    findLeftBackups(found, index);
    if (found.registryBackupState != "missing")
        found.backups.push_back(backupName(found.registryPath));

    judgeHome(found);
    judgeIndex(found);
    if (found.recordedType == installTypeName(!found.local))
        report(found, "type-mismatch", "recorded as a " + found.recordedType + " installation");
    if (!found.backups.empty())
        report(found, "backups-left",
               "an interrupted run left " + std::to_string(found.backups.size()) + " backups");
}

void survey(Installation& found)
{
    InstallRegistry backup;
    found.registryState = readRegistry(found.registryPath, found.registry);
    found.registryBackupState = readRegistry(backupName(found.registryPath), backup);
    judgeRegistry(found);
    if (found.registryState == "complete")
        surveyHome(found);

    if (found.registryState == "unreadable")
        found.health = Health::Unknown;
    else if (!found.problems.empty())
        found.health = Health::Damaged;
    else
        found.health = found.registryState == "complete" ? Health::Intact : Health::Absent;
}

/// Where the shared installation, or that of the current user, is registered.
Installation placeOf(bool local)
{
    Installation found;
    found.local = local;
    found.registryPath = registryPath(local);
    if (!local)
        return found;
    found.uid = getuid();
    if (const passwd* const entry = getpwuid(found.uid))
        found.user = entry->pw_name;
    return found;
}

} // namespace

std::vector<std::string> findBackups(const std::string& home, bool& complete)
{
    std::vector<std::string> pending;
    for (const std::string& name : {spbBinDir, spbPropertiesDir, spbCfgDir, auxDirInstall})
        pending.push_back(joinPath(home, name));

    std::vector<std::string> backups;
    std::size_t left = MostNames;
    while (!pending.empty()) {
        DirectoryNames names;
        const std::string directory = std::move(pending.back());
        pending.pop_back();
        if (listDirectory(directory, left, names) == Listed::NotAll)
            complete = false;
        left -= names.count();
        std::move(names.directories.begin(), names.directories.end(), std::back_inserter(pending));
        std::copy_if(names.files.begin(), names.files.end(), std::back_inserter(backups),
                     [](const std::string& file) { return file.ends_with(BackupSuffix); });
    }
    std::sort(backups.begin(), backups.end());
    return backups;
}

Installation surveyRegistry(bool local)
{
    Installation found = placeOf(local);
    found.registryState = readRegistry(found.registryPath, found.registry);
    if (found.registryState == "complete")
        found.singleUserMode = singleUserModeOf(found.registry.homeDirectory);
    return found;
}

Installation surveyShared()
{
    Installation found = placeOf(false);
    survey(found);
    return found;
}

Installation surveyOwn()
{
    Installation found = placeOf(true);
    survey(found);
    return found;
}

Installation surveyAccount(const Account& account)
{
    Installation found;
    found.local = true;
    found.uid = account.uid;
    found.user = account.name;
    found.registryPath = registryPathBelow(account.home);
    survey(found);
    return found;
}

std::vector<Account> allAccounts()
{
    std::vector<Account> accounts;
    std::set<std::string> homes;
    setpwent();
    while (const passwd* const entry = getpwent()) {
        if (homes.insert(entry->pw_dir).second)
            accounts.push_back({entry->pw_uid, entry->pw_gid, entry->pw_name, entry->pw_dir});
    }
    endpwent();
    return accounts;
}

const char* healthName(Health health)
{
    switch (health) {
    case Health::Intact:
        return "intact";
    case Health::Damaged:
        return "damaged";
    case Health::Absent:
        return "absent";
    case Health::Unknown:
        return "unknown";
    }
    return "unknown";
}

std::vector<std::string> exploiterList(const std::string& list)
{
    std::vector<std::string> names;
    for (std::size_t start = 0; start < list.size();) {
        const std::size_t colon = std::min(list.find(':', start), list.size());
        if (colon != start && colon != list.size())
            names.push_back(list.substr(start, colon - start));
        start = colon + 1;
    }
    return names;
}
