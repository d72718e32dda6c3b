#include "comparison.h"

#include "discovery.h"
#include "entry_content.h"
#include "file_index.h"
#include "foreign_files.h"
#include "guarded_file.h"
#include "guarded_index.h"
#include "package_files.h"
#include "paths.h"
#include "permissions.h"
#include "scoped.h"
#include "settings.h"
#include "settings_comparison.h"
#include "single_user_mode.h"
#include "survey.h"
#include "zip_file.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>
#include <unordered_set>

#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr std::size_t SmallFile = std::size_t{1} << 20; // a file with settings
constexpr std::string_view Passed = ".........";
constexpr std::string_view NotKnown = "?????????";

/// The name behind the last slash of `path`, which has one.
const char* nameIn(const std::string& path)
{
    return path.c_str() + path.rfind('/') + 1;
}

} // namespace

Comparison::Comparison(const Installation& found, const VerifyOptions& options)
    : found_(found), options_(options), home_(found.registry.homeDirectory),
      configuration_(joinPath(home_, spbCfgDir) + "/"),
      scripts_(joinPath(home_, auxDirInstall) + "/")
{
    const passwd* const owner = found.local ? getpwuid(found.uid) : nullptr;
    uid_ = found.local ? found.uid : 0;
    gid_ = owner != nullptr ? owner->pw_gid : uid_;
}

bool Comparison::withPackage()
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
        const ZipEntry* const content = directory ? nullptr : file.entry;
        plan.insert_or_assign(plan.end(), std::move(path), // often sorted
                              Expected{file.mode, true, directory, content});
    }
    addModes(plan);
    EntryReader package(archive);
    compareAll(plan, &package);
    return true;
}

bool Comparison::withIndex(std::string& state)
{
    const GuardedIndex index = readGuardedIndex(fileIndexPath(home_));
    state = index.state;
    if (!index.isRead())
        return false;
    std::set<std::string> own; // listed whether or not they exist
    addInstallerFiles(found_.registry, own);
    Plan plan;
    for (const std::string& path : index.files) {
        if (!own.contains(path))
            plan[path] = {path.starts_with(scripts_) ? mode_t{0750} : mode_t{0755},
                          path.starts_with(home_ + "/"), false, nullptr};
    }
    addModes(plan);
    compareAll(plan, nullptr);
    return true;
}

/// What the permission pass sets, for what is in the plan or exists.
void Comparison::addModes(Plan& plan) const
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

void Comparison::compareAll(const Plan& plan, EntryReader* package)
{
    for (const auto& [path, expected] : plan)
        compare(path, expected, package);
    if (!options_.noForeign)
        findForeign(plan);
    std::sort(differences_.begin(), differences_.end(),
              [](const Difference& a, const Difference& b) { return a.path < b.path; });
}

bool Comparison::isConfiguration(const std::string& path) const
{
    return path.starts_with(configuration_);
}

/// Opens the directory of `path`; most files are in that of the one before, so that the way to it
/// is resolved once for all of them. Returns 0 or an `errno`.
int Comparison::openParent(const std::string& path)
{
    const std::string_view directory(path.data(), path.rfind('/') + 1);
    if (parent_.isOpen() && directory == parentPath_)
        return 0;
    parentPath_ = directory;
    const char* const name = parentPath_.empty() ? "." : parentPath_.c_str();
    parent_ = ScopedFd(open(name, O_PATH | O_DIRECTORY | O_CLOEXEC));
    return parent_.isOpen() ? 0 : errno;
}

void Comparison::compare(const std::string& path, const Expected& expected, EntryReader* package)
{
    Difference difference{path, "changed", std::string(Passed), isConfiguration(path), {}};
    struct stat status = {};
    int error = openParent(path);
    if (error == 0 && fstatat(parent_.get(), nameIn(path), &status, AT_SYMLINK_NOFOLLOW) != 0)
        error = errno;
    if (error != 0) {
        const bool missing = error == ENOENT || error == ENOTDIR;
        difference.kind = missing ? "missing" : "unknown";
        difference.columns = NotKnown;
        differences_.push_back(difference);
        return;
    }
    // An administrator's link to a directory counts as that directory.
    if (expected.directory && S_ISLNK(status.st_mode))
        (void)fstatat(parent_.get(), nameIn(path), &status,
                      0); // the link's own status stays otherwise
    const bool rightKind = expected.directory ? S_ISDIR(status.st_mode) : S_ISREG(status.st_mode);
    if (!rightKind || (expected.hasMode && (status.st_mode & 07777) != expected.mode))
        difference.columns[1] = 'M';
    if (status.st_uid != uid_)
        difference.columns[5] = 'U';
    if (status.st_gid != gid_)
        difference.columns[6] = 'G';
    if (rightKind && expected.entry != nullptr)
        compareContent(path, *expected.entry, *package, status, difference);
    if (difference.kind == "customised" &&
        difference.columns.find_first_of("MUG") == std::string::npos && options_.noCustomised)
        return;
    if (difference.columns != Passed)
        differences_.push_back(difference);
}

void Comparison::compareContent(const std::string& path, const ZipEntry& entry,
                                EntryReader& package, const struct stat& status,
                                Difference& difference) const
{
    if (compareSettings(path, entry, package, difference))
        return;
    if (status.st_size != static_cast<off_t>(entry.uncompressedSize))
        difference.columns[0] = 'S';
    const char result = difference.columns[0] == 'S' ? '5' : sameBytes(path, entry, package);
    difference.columns[2] = result;
    if (result == '?' && difference.columns.find_first_of("SMUG") == std::string::npos)
        difference.kind = "unknown";
}

/// "." if the file at `path` holds what the entry does, "5" if not, "?" if that is not known.
char Comparison::sameBytes(const std::string& path, const ZipEntry& entry,
                           EntryReader& package) const
{
    const ScopedFd file(openat(parent_.get(), nameIn(path),
                               O_RDONLY | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW | O_CLOEXEC));
    if (!file.isOpen())
        return '?';
    static std::vector<char> buffer(std::size_t{128} << 10);
    bool failed = false;
    const EntryState state = package.read(entry, [&](const char* data, std::size_t size) {
        while (size > 0) {
            const ssize_t count = read(file.get(), buffer.data(), std::min(size, buffer.size()));
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

/// True when `path` is a file that the installer edits: it was compared by its lines.
bool Comparison::compareSettings(const std::string& path, const ZipEntry& entry,
                                 EntryReader& package, Difference& difference) const
{
    if (!isConfiguration(path) && !path.starts_with(scripts_))
        return false; // nearly all files
    const EditedFile kind = editedFile(path, home_);
    if (kind == EditedFile::None)
        return false;
    std::string packaged;
    const GuardedText installed = readGuarded(path, SmallFile);
    if (installed.state != ReadState::Read || !package.readSmall(entry, SmallFile, packaged)) {
        difference.columns[0] = difference.columns[2] = '?';
        difference.kind = "unknown";
        return true;
    }
    if (kind == EditedFile::Script) {
        if (!isScriptUnchanged(found_, packaged, installed.text))
            difference.columns[2] = '5';
        return true;
    }
    difference.keys = changedSettings(found_, kind, packaged, installed.text);
    if (!difference.keys.empty()) {
        difference.kind = "customised";
        difference.columns[2] = '5';
    }
    return true;
}

/// What nobody installed, and the directories in which that cannot be found out.
void Comparison::findForeign(const Plan& plan)
{
    std::set<std::string> own;
    addInstallerFiles(found_.registry, own);
    own.insert(joinPath(home_, ZOR_FILE_INDEX)); // as the search finds it
    own.insert(joinPath(home_, joinPath(auxDirInstall, installProps)));
    own.insert(singleUserFlagPath(home_));
    for (const std::string& name : {cacheDir, logDir})
        own.insert(joinPath(home_, name));
    std::unordered_set<std::string_view> planned; // many are looked up: faster than the plan
    planned.reserve(plan.size());
    for (const auto& [path, expected] : plan)
        planned.insert(path);
    const ForeignFiles found =
        findForeignFiles(home_, [&](const std::string& path, bool isDirectory) {
            return (!isDirectory && planned.contains(path)) || own.contains(path);
        });
    for (const std::string& path : found.files)
        differences_.push_back({path, "foreign", "", isConfiguration(path), {}});
    for (const std::string& path : found.notSearched)
        differences_.push_back({path, "unknown", std::string(NotKnown), isConfiguration(path), {}});
}
