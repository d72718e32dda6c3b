#include "verify.h"

#include "common_directory.h"
#include "entry_content.h"
#include "exit_status.h"
#include "file_index.h"
#include "fresh_install.h"
#include "guarded_file.h"
#include "installation_lock.h"
#include "json_report.h"
#include "locations.h"
#include "package_files.h"
#include "paths.h"
#include "permissions.h"
#include "property_file.h"
#include "settings.h"
#include "settings_upgrade.h"
#include "shown_text.h"
#include "single_user_mode.h"
#include "survey.h"
#include "template_variables.h"
#include "text.h"
#include "tool_output.h"
#include "zip_file.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <iostream>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int VerifySchema = 1;
constexpr std::size_t SmallFile = std::size_t{1} << 20; // a file with settings
constexpr std::string_view Passed = ".........";

/// What is known of a file that has to be there.
struct Expected {
    mode_t mode = 0;
    bool hasMode = false;
    bool directory = false;
    const ZipEntry* entry = nullptr; ///< its content; null when it is not known
};

/// One line of the report.
struct Difference {
    std::string path;
    std::string kind;             ///< "missing", "changed", "customised", "foreign" or "unknown"
    std::string columns;          ///< the nine of rpm -V, for "changed" and "customised"
    bool isConfiguration = false; ///< the attribute letter "c"
    std::vector<std::string> keys;
};

using Plan = std::map<std::string, Expected>;

/// Compares one installation.
class Verification {
public:
    Verification(const Installation& found, const VerifyOptions& options)
        : found_(found), options_(options), home_(found.registry.homeDirectory)
    {
        const passwd* const owner = found.local ? getpwuid(found.uid) : nullptr;
        uid_ = found.local ? found.uid : 0;
        gid_ = owner != nullptr ? owner->pw_gid : uid_;
    }

    /// Compares with the package; false when it cannot be read.
    bool withPackage()
    {
        const ZipFile archive(options_.spb.c_str());
        if (archive.entries().empty())
            return false;
        Plan plan;
        for (const PackagedFile& file : packagedFiles(archive, home_, true)) {
            std::string path = file.path;
            const bool directory = endsWithSlash(path);
            if (directory)
                path.pop_back();
            plan[path] = {file.mode, true, directory, directory ? nullptr : file.entry};
        }
        addModes(plan);
        compareAll(plan, &archive);
        return true;
    }

    /// Compares with the index; false when there is none.
    bool withIndex()
    {
        if (found_.indexState != "complete" && found_.indexState != "interrupted")
            return false;
        Plan plan;
        for (const std::string& path : indexedFiles()) {
            if (!mayBeMissing(path))
                plan[path] = {modeOf(path), path.starts_with(home_ + "/"), false, nullptr};
        }
        addModes(plan);
        compareAll(plan, nullptr);
        return true;
    }

    [[nodiscard]] const std::vector<Difference>& differences() const { return differences_; }

private:
    std::set<std::string> indexedFiles() const
    {
        std::set<std::string> files;
        const GuardedText index = readGuarded(fileIndexPath(home_), std::size_t{64} << 20);
        if (index.state == ReadState::Read)
            readFileIndex(MemoryFile(index.text).path(), files);
        return files;
    }

    /// Files that the index lists whether or not they exist.
    bool mayBeMissing(const std::string& path) const
    {
        std::set<std::string> own;
        addInstallerFiles(found_.registry, own);
        return own.contains(path);
    }

    mode_t modeOf(const std::string& path) const
    {
        const bool scripts = path.starts_with(joinPath(home_, auxDirInstall) + "/");
        return scripts ? 0750 : 0755;
    }

    /// What the permission pass sets, for what is in the plan or exists.
    void addModes(Plan& plan) const
    {
        Discovery place;
        place.homeExists = true;
        place.currentZorHome = place.currentCfgHome = home_;
        for (const Permission& permission : permissionTable(place)) {
            std::string path = permission.path;
            if (path.size() > 1 && endsWithSlash(path))
                path.pop_back();
            // The scanners make these two anew, with modes of their own.
            if (path == joinPath(home_, cacheDir) || path == joinPath(home_, logDir))
                continue;
            struct stat status = {};
            const auto known = plan.find(path);
            if (known != plan.end()) {
                known->second.mode = permission.mode;
                known->second.hasMode = true;
            } else if (lstat(path.c_str(), &status) == 0) {
                plan[path] = {permission.mode, true, S_ISDIR(status.st_mode), nullptr};
            }
        }
    }

    void compareAll(const Plan& plan, const ZipFile* archive)
    {
        for (const auto& [path, expected] : plan)
            compare(path, expected, archive);
        if (!options_.noForeign)
            findForeign(plan);
        std::sort(differences_.begin(), differences_.end(),
                  [](const Difference& a, const Difference& b) { return a.path < b.path; });
    }

    bool isConfiguration(const std::string& path) const
    {
        return path.starts_with(joinPath(home_, spbCfgDir) + "/");
    }

    void compare(const std::string& path, const Expected& expected, const ZipFile* archive)
    {
        Difference difference{path, "changed", std::string(Passed), isConfiguration(path), {}};
        struct stat status = {};
        if (lstat(path.c_str(), &status) != 0) {
            const bool missing = errno == ENOENT || errno == ENOTDIR;
            difference.kind = missing ? "missing" : "unknown";
            difference.columns = "?????????";
            differences_.push_back(difference);
            return;
        }
        // An administrator's link to a directory counts as that directory.
        if (expected.directory && S_ISLNK(status.st_mode))
            (void)stat(path.c_str(), &status); // the link's own status stays otherwise
        const bool rightKind =
            expected.directory ? S_ISDIR(status.st_mode) : S_ISREG(status.st_mode);
        if (!rightKind || (expected.hasMode && (status.st_mode & 07777) != expected.mode))
            difference.columns[1] = 'M';
        if (status.st_uid != uid_)
            difference.columns[5] = 'U';
        if (status.st_gid != gid_)
            difference.columns[6] = 'G';
        if (rightKind && expected.entry != nullptr)
            compareContent(path, *expected.entry, *archive, status, difference);
        if (difference.kind == "customised" &&
            difference.columns.find_first_of("MUG") == std::string::npos && options_.noCustomised)
            return;
        if (difference.columns != Passed)
            differences_.push_back(difference);
    }

    void compareContent(const std::string& path, const ZipEntry& entry, const ZipFile& archive,
                        const struct stat& status, Difference& difference)
    {
        if (compareSettings(path, entry, archive, difference))
            return;
        if (status.st_size != static_cast<off_t>(entry.uncompressedSize))
            difference.columns[0] = 'S';
        const char result = difference.columns[0] == 'S' ? '5' : sameBytes(path, entry, archive);
        difference.columns[2] = result;
        if (result == '?' && difference.columns.find_first_of("SMUG") == std::string::npos)
            difference.kind = "unknown";
    }

    /// "." if the file at `path` holds what the entry does, "5" if not, "?" if that is not known.
    char sameBytes(const std::string& path, const ZipEntry& entry, const ZipFile& archive) const
    {
        const ScopedFd file(
            open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW | O_CLOEXEC));
        if (!file.isOpen())
            return '?';
        static std::vector<char> buffer(std::size_t{128} << 10);
        bool failed = false;
        const EntryState state = readEntry(archive, entry, [&](const char* data, std::size_t size) {
            while (size > 0) {
                const ssize_t count =
                    read(file.get(), buffer.data(), std::min(size, buffer.size()));
                failed = count < 0;
                if (count <= 0 ||
                    std::memcmp(buffer.data(), data, static_cast<std::size_t>(count)) != 0)
                    return false;
                data += count;
                size -= static_cast<std::size_t>(count);
            }
            return true;
        });
        if (failed || state == EntryState::Damaged)
            return '?';
        return state == EntryState::Whole ? '.' : '5';
    }

    // Files that the installer edits.

    /// True when `path` is a file that the installer edits: it was compared by its lines.
    bool compareSettings(const std::string& path, const ZipEntry& entry, const ZipFile& archive,
                         Difference& difference)
    {
        const std::string config = joinPath(home_, spbCfgDir);
        const bool main = path == joinPath(config, zorProps);
        const bool traces = path == joinPath(config, traceProps);
        const bool script =
            std::any_of(std::begin(ScriptNames), std::end(ScriptNames), [&](const char* name) {
                return path == joinPath(joinPath(home_, auxDirInstall), name);
            });
        if (!main && !traces && !script)
            return false;

        std::string packaged;
        const GuardedText installed = readGuarded(path, SmallFile);
        if (installed.state != ReadState::Read ||
            !readSmallEntry(archive, entry, SmallFile, packaged)) {
            difference.columns[0] = difference.columns[2] = '?';
            difference.kind = "unknown";
            return true;
        }
        PropertyFile wanted = linesOf(packaged);
        PropertyFile present = linesOf(installed.text);
        if (script)
            compareScript(wanted, present, difference);
        else
            compareProperties(wanted, present, main, difference);
        return true;
    }

    static PropertyFile linesOf(const std::string& text)
    {
        PropertyFile file;
        (void)file.load(MemoryFile(text).path()); // no lines then, which differ
        return file;
    }

    void compareScript(PropertyFile& wanted, const PropertyFile& present, Difference& difference)
    {
        // An upgrade of a per-user installation leaves the placeholders as they are.
        if (found_.local && wanted.lines == present.lines)
            return;
        fillScript(wanted, home_, readCommonDirectory(true));
        if (wanted.lines != present.lines)
            difference.columns[2] = '5';
    }

    void compareProperties(PropertyFile& wanted, PropertyFile& present, bool main,
                           Difference& difference)
    {
        PropertyFile asShipped = wanted;
        if (main)
            fillMainProperties(wanted, home_);
        else
            fillTraceProperties(wanted, home_);

        std::map<std::string, std::set<std::string>> allowed =
            main ? defaultsOfUpgrades() : carriedTraces(wanted);
        const auto allow = [&](const PropertyFile& file) {
            for (const std::string& line : file.lines) {
                if (isSetting(line))
                    allowed[keyOfLine(line)].insert(valueOf(line));
            }
        };
        allow(wanted);
        allow(asShipped); // an upgrade leaves some placeholders as they are
        if (main) {
            upgradeProperties(asShipped, home_, found_.registry, readCommonDirectory(true));
            allow(asShipped); // and fills others in
        }
        difference.keys = changedKeys(allowed, wanted, present);
        if (!difference.keys.empty()) {
            difference.kind = "customised";
            difference.columns[2] = '5';
        }
    }

    static bool isSetting(const std::string& line)
    {
        const std::string key = keyOfLine(line);
        return line.find('=') != std::string::npos && !key.empty() && key[0] != '#';
    }

    static std::string valueOf(const std::string& line)
    {
        std::string value = textAfterEquals(line);
        trim(value);
        return value;
    }

    /// What an upgrade adds to "Zor.properties", in addition to what the package has.
    std::map<std::string, std::set<std::string>> defaultsOfUpgrades() const
    {
        PropertyFile file;
        for (const PropertyDefault* entry = ZorPropertiesUpdate; entry->key != nullptr; ++entry)
            file.lines.push_back(std::string(entry->key) + "=" + entry->value);
        upgradeProperties(file, home_, found_.registry, readCommonDirectory(true));
        file.lines.push_back("version=" + registryVersionText(found_.registry.version));
        std::map<std::string, std::set<std::string>> allowed;
        for (const std::string& line : file.lines)
            allowed[keyOfLine(line)].insert(valueOf(line));
        return allowed;
    }

    /// What an upgrade carries into "ZorTrace.properties" from the trace settings.
    std::map<std::string, std::set<std::string>> carriedTraces(PropertyFile& traces) const
    {
        const GuardedText text =
            readGuarded(joinPath(joinPath(home_, spbCfgDir), zorProps), SmallFile);
        PropertyFile settings = linesOf(text.text);
        const auto rest = [&](const char* key) {
            const std::string* const line = settings.findLine(key);
            return line == nullptr ? std::string() : textAfterEquals(*line);
        };
        std::map<std::string, std::set<std::string>> allowed;
        std::string file = rest("trace_file_path") + "/" + rest("trace_file");
        std::string level = "DEBUG_" + rest("trace_level");
        trim(file);
        trim(level);
        allowed["handlers.traceFile.fileName"].insert(file);
        for (const std::string& line : traces.lines) {
            if (keyOfLine(line).find(".loggers.trcLogger.level") != std::string::npos)
                allowed[keyOfLine(line)].insert(level);
        }
        return allowed;
    }

    /// The keys that have another value than the allowed ones, are new, or are missing.
    static std::vector<std::string>
    changedKeys(const std::map<std::string, std::set<std::string>>& allowed,
                const PropertyFile& needed, const PropertyFile& present)
    {
        std::set<std::string> seen;
        std::set<std::string> changed;
        for (const std::string& line : present.lines) {
            if (!isSetting(line))
                continue;
            const std::string key = keyOfLine(line);
            const auto values = allowed.find(key);
            seen.insert(key);
            if (values == allowed.end() || !values->second.contains(valueOf(line)))
                changed.insert(key);
        }
        for (const std::string& line : needed.lines) {
            if (isSetting(line) && !seen.contains(keyOfLine(line)))
                changed.insert(keyOfLine(line));
        }
        return {changed.begin(), changed.end()};
    }

    // What nobody installed.

    void findForeign(const Plan& plan)
    {
        std::set<std::string> known;
        addInstallerFiles(found_.registry, known);
        known.insert(joinPath(home_, ZOR_FILE_INDEX)); // as the search below finds it
        known.insert(joinPath(home_, joinPath(auxDirInstall, installProps)));
        known.insert(singleUserFlagPath(home_));
        for (const std::string& name : {cacheDir, logDir})
            known.insert(joinPath(home_, name));
        searchForeign(home_, plan, known);
    }

    void searchForeign(const std::string& directory, const Plan& plan,
                       const std::set<std::string>& known)
    {
        ScopedFd fd(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_NONBLOCK | O_CLOEXEC));
        const ScopedDir dir(fd.isOpen() ? fdopendir(fd.get()) : nullptr);
        if (!dir)
            return;         // not readable for this user: its own line says so
        (void)fd.release(); // the stream owns it now
        std::vector<std::string> below;
        while (const dirent* entry = readdir(dir.get())) {
            const std::string_view name = entry->d_name;
            const std::string path = joinPath(directory, name);
            if (name == "." || name == ".." || known.contains(path))
                continue;
            struct stat status = {};
            const bool isDirectory =
                fstatat(dirfd(dir.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
                S_ISDIR(status.st_mode);
            if (isDirectory)
                below.push_back(path);
            else if (!plan.contains(path))
                differences_.push_back({path, "foreign", "", isConfiguration(path), {}});
        }
        for (const std::string& path : below)
            searchForeign(path, plan, known);
    }

    const Installation& found_;
    const VerifyOptions& options_;
    std::string home_;
    uid_t uid_ = 0;
    gid_t gid_ = 0;
    std::vector<Difference> differences_;
};

Json toJson(const Difference& difference)
{
    Json keys = Json::array();
    for (const std::string& key : difference.keys)
        keys.push_back(jsonText(key));
    return {{"path", jsonText(difference.path)},
            {"kind", difference.kind},
            {"columns", difference.columns.empty() ? Json(nullptr) : Json(difference.columns)},
            {"configuration", difference.isConfiguration},
            {"keys", keys}};
}

/// One line as rpm -V writes it, with two kinds of its own.
void printLine(const Difference& difference)
{
    const char letter = difference.isConfiguration ? 'c' : ' ';
    const std::string path = shown(difference.path);
    if (difference.kind == "missing" || difference.kind == "foreign")
        std::cout << difference.kind << "   " << letter << ' ' << path << '\n';
    else
        std::cout << difference.columns << "  " << letter << ' ' << path << '\n';
    for (const std::string& key : difference.keys)
        std::cout << "             customised: " << shown(key) << '\n';
}

/// True if a line of this kind is a difference that sets the exit status.
bool counts(const Difference& difference, const VerifyOptions& options)
{
    if (difference.kind == "foreign")
        return options.strict;
    if (difference.kind == "customised")
        return options.strict || difference.columns.find_first_of("MUG") != std::string::npos;
    return true;
}

int exitStatusOf(const std::vector<Difference>& differences, const VerifyOptions& options)
{
    int status = ToolOk;
    for (const Difference& difference : differences) {
        if (!counts(difference, options))
            continue;
        if (difference.kind != "unknown")
            return ToolDiffers;
        status = ToolTrouble;
    }
    return status;
}

int refuse(const std::string& what, int status)
{
    complain(shown(what));
    return status;
}

} // namespace

int verifyInstallation(const VerifyOptions& options)
{
    localInstall = options.type.empty() ? !isRoot() : options.type == valueInstallLocal;
    const ScopedFd lock = lockForReading(localInstall);
    const Installation found = localInstall ? surveyOwn() : surveyShared();
    if (found.registryState == "missing")
        return refuse(found.registryPath + ": nothing is installed", ToolNotInstalled);
    if (found.registryState != "complete")
        return refuse(found.registryPath + ": " + found.registryState,
                      found.registryState == "unreadable" ? ToolTrouble : ToolDiffers);
    if (found.singleUserMode.value_or(false))
        enterSingleUserMode();

    Verification verification(found, options);
    if (!options.spb.empty() && !verification.withPackage())
        return refuse(options.spb + ": package not found or not valid", ToolTrouble);
    if (options.spb.empty() && !verification.withIndex())
        return refuse(fileIndexPath(found.registry.homeDirectory) + ": " + found.indexState +
                          "; name the package to compare with it",
                      ToolTrouble);

    const int status = exitStatusOf(verification.differences(), options);
    if (!options.json) {
        for (const Difference& difference : verification.differences())
            printLine(difference);
        return status;
    }
    Json report = reportHead("verify", VerifySchema);
    report["locked"] = lock.isOpen();
    report["type"] = installTypeName(localInstall);
    report["home"] = jsonText(found.registry.homeDirectory);
    report["compared_with"] = options.spb.empty() ? "index" : "package";
    report["differences"] = Json::array();
    for (const Difference& difference : verification.differences())
        report["differences"].push_back(toJson(difference));
    printJson(report);
    return status;
}
