#include "transaction.h"

#include "file_codes.h"
#include "file_reading.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "text.h"

#include <cstdio>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

char letterOf(int kind)
{
    switch (kind) {
    case BackedUp:
        return 'B';
    case Created:
        return 'C';
    case DirectoryCreated:
        return 'D';
    default:
        return ' ';
    }
}

/// The kind for a letter of a saved journal; 0 for any other letter.
int kindOf(char letter)
{
    switch (letter) {
    case 'B':
        return BackedUp;
    case 'C':
        return Created;
    case 'D':
        return DirectoryCreated;
    default:
        return 0;
    }
}

/// True if what is at `place` must be moved: anything but a dangling link of root or the running
/// user. Such a link remains, and its target is created. Sets `status` to that of what is there.
bool isInTheWay(const Place& place, const std::string& path, struct stat& status)
{
    if (fstatat(place.fd(), place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
        (!S_ISLNK(status.st_mode) || !isTrustedOwner(status.st_uid)))
        return true;
    return !pathIsMissing(path);
}

/// True unless `path` is claimed and another run has put a file of its own there.
bool isOurs(const FileTransaction& transaction, const std::string& path)
{
    const auto claimed = transaction.claims.find(path);
    struct stat status = {};
    return claimed == transaction.claims.end() || statPath(path, status) != 0 ||
           identityOf(status) == claimed->second;
}

/// Renames the backup of `path` back. What cannot be renamed stays where it is.
void restoreBackup(const std::string& path)
{
    Place place;
    if (findPlace(path, LastLink::Keep, place) == 0)
        (void)renameat(place.fd(), backupName(place.name).c_str(), place.fd(), place.name.c_str());
}

/// True if the entry at `index` is a claimed file whose backup the entry before it will restore.
bool isReplacedByBackup(const FileTransaction& transaction, std::size_t index)
{
    if (index == 0)
        return false;
    const JournalEntry& previous = transaction.journal[index - 1];
    return previous.kind == BackedUp && previous.path == transaction.journal[index].path &&
           transaction.claims.contains(previous.path);
}

/// Undoes the entry at `index` of the journal.
void undo(const FileTransaction& transaction, std::size_t index)
{
    const auto& [kind, path] = transaction.journal[index];
    switch (kind) {
    case BackedUp:
        if (isOurs(transaction, path))
            restoreBackup(path);
        break;
    case Created:
        // A claimed file is replaced by its backup in one step, so that there is one at any time.
        if (!isReplacedByBackup(transaction, index) && isOurs(transaction, path))
            (void)unlinkPath(path);
        break;
    case DirectoryCreated:
        (void)removeDirectoryPath(path); // remains if it contains anything else
        break;
    default:
        break;
    }
}

} // namespace

void record(FileTransaction& transaction, int kind, const std::string& path)
{
    transaction.journal.push_back({kind, path});
}

void claim(FileTransaction& transaction, const std::string& path, const FileIdentity& ours)
{
    transaction.claims[path] = ours;
}

int backupFile(FileTransaction& transaction, const std::string& path)
{
    struct stat moved = {};
    return backupFile(transaction, path, moved);
}

int backupFile(FileTransaction& transaction, const std::string& path, struct stat& moved)
{
    if (!transaction.backup)
        return FileOk;
    Place place;
    if (findPlace(path, LastLink::Keep, place) != 0)
        return pathIsMissing(path) ? FileOk : CannotRename;
    struct stat status = {};
    if (!isInTheWay(place, path, status))
        return FileOk;

    const char* const name = place.name.c_str();
    const std::string backup = backupName(place.name);
    if (renameat2(place.fd(), name, place.fd(), backup.c_str(), RENAME_NOREPLACE) != 0) {
        // A backup of an older run. If it cannot be deleted, the rename fails.
        (void)unlinkat(place.fd(), backup.c_str(), 0);
        if (renameat(place.fd(), name, place.fd(), backup.c_str()) != 0)
            return CannotRename;
    }

    // Recorded only now: an entry without a backup would have nothing to restore.
    record(transaction, BackedUp, path);
    moved = status;
    return FileOk;
}

std::size_t changeCount(const FileTransaction& transaction)
{
    return transaction.journal.size();
}

bool lastFileReplacedAnother(const FileTransaction& transaction)
{
    const auto& journal = transaction.journal;
    return journal.size() >= 2 && journal[journal.size() - 2].kind == BackedUp;
}

std::vector<std::string> changedDirectories(const FileTransaction& transaction)
{
    std::vector<std::string> directories;
    for (const JournalEntry& entry : transaction.journal) {
        std::string directory = parentOf(entry.path);
        if (directories.empty() || directories.back() != directory)
            directories.push_back(std::move(directory));
    }
    return directories;
}

int commit(FileTransaction& transaction)
{
    const ScopedDirectoryReuse reuse;
    const auto& journal = transaction.journal;
    for (auto entry = journal.rbegin(); entry != journal.rend(); ++entry) {
        if (entry->kind == BackedUp)
            (void)unlinkPath(backupName(entry->path)); // remains if this fails
    }
    transaction.journal.clear();
    transaction.claims.clear();
    return FileOk;
}

int rollback(FileTransaction& transaction)
{
    const ScopedDirectoryReuse reuse;
    for (std::size_t index = transaction.journal.size(); index-- != 0;)
        undo(transaction, index);
    transaction.journal.clear();
    transaction.claims.clear();
    return FileOk;
}

int saveJournal(const FileTransaction& transaction, const std::string& path)
{
    const ScopedFile file = openStream(path, Existing::Truncate, NewFileMode);
    if (!file)
        return CannotOpenForWriting;
    for (const JournalEntry& entry : transaction.journal)
        (void)std::fprintf(file.get(), "%c %s\n", letterOf(entry.kind), entry.path.c_str());
    return FileOk;
}

int loadJournal(FileTransaction& transaction, const std::string& path)
{
    transaction.journal.clear();
    const ScopedFile file = openForReading(path);
    if (!file)
        return CannotOpenForReading;

    std::string line;
    while (readLine(file.get(), line)) {
        const int kind = line.size() < 3 ? 0 : kindOf(line[0]);
        if (kind == 0)
            return CannotRead;
        record(transaction, kind, line.substr(2));
    }
    return std::ferror(file.get()) == 0 ? FileOk : CannotRead;
}

void setVariable(FileTransaction& transaction, const std::string& name, const std::string& value)
{
    for (auto& [knownName, knownValue] : transaction.variables) {
        if (knownName == name) {
            knownValue = value;
            return;
        }
    }
    transaction.variables.emplace_back(name, value);
}

std::string getVariable(const FileTransaction& transaction, const std::string& name)
{
    for (const auto& [knownName, value] : transaction.variables) {
        if (knownName == name)
            return value;
    }
    return {};
}

int substituteVariables(const FileTransaction& transaction, std::string& text)
{
    int count = 0;
    for (const auto& [name, value] : transaction.variables)
        count += replaceEach(text, VariablePrefix + name, value);
    return count;
}
