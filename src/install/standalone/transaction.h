// The journal of a run: what was changed, so that it can be committed or undone.
//
// Every operation that changes the disk appends what it did, oldest first. commit() deletes the
// backups, rollback() undoes the changes, newest first, so that files go before their directories
// and a file that was backed up and rewritten is first deleted and then restored. The journal lives
// in memory: if the process is killed, the backups remain next to the files.
#pragma once

#include "safe_path.h"

#include <cstddef>
#include <map>
#include <string>
#include <utility>
#include <vector>

/// Kinds of journal entries. The numbers are fixed; 3 does not exist.
enum JournalKind : int {
    BackedUp = 1,         ///< the previous content of the path is at its backup name
    Created = 2,          ///< the path is a file that this run wrote
    DirectoryCreated = 4, ///< the path is a directory that this run created
};

struct JournalEntry {
    int kind = 0; ///< a JournalKind; others are skipped by commit and rollback
    std::string path;
};

/// The state of one run; owned by the driver, passed by reference to every file operation.
///
/// Without commit or rollback nothing on the disk changes.
struct FileTransaction {
    bool backup = true;     ///< keep what is replaced under its backup name
    bool journalled = true; ///< set together with `backup`; nothing reads it
    std::vector<JournalEntry> journal;
    std::vector<std::pair<std::string, std::string>> variables; ///< name and value
    std::map<std::string, FileIdentity> claims;                 ///< by path; see claim()
};

/// Precedes the name of a variable in a text.
inline const std::string VariablePrefix = "$";

/// Appends an entry to the journal.
void record(FileTransaction& transaction, int kind, const std::string& path);

/// Notes which file this run put at `path`, for its entries in the journal. Another run may replace
/// such a file meanwhile; a rollback then leaves its file alone.
void claim(FileTransaction& transaction, const std::string& path, const FileIdentity& ours);

/// Moves what is at `path` to its backup name and journals that; an older backup is deleted.
///
/// Does nothing if the transaction keeps no backups or nothing at `path` can be reached
/// (pathIsMissing()), except that a stranger's link is always moved. Afterwards the name
/// is free, or a dangling link of root or the running user. Returns 0 or CannotRename (9).
[[nodiscard]] int backupFile(FileTransaction& transaction, const std::string& path);

/// backupFile() that sets `moved` to the status of what it moved, and leaves it as it is if it
/// moved nothing.
[[nodiscard]] int backupFile(FileTransaction& transaction, const std::string& path,
                             struct stat& moved);

/// The number of changes in the journal.
[[nodiscard]] std::size_t changeCount(const FileTransaction& transaction);

/// True if the last file that was written replaced another.
[[nodiscard]] bool lastFileReplacedAnother(const FileTransaction& transaction);

/// The directories in which something changed, in the order of the changes; one of them may occur
/// more than once.
[[nodiscard]] std::vector<std::string> changedDirectories(const FileTransaction& transaction);

/// Deletes every backup and empties the journal. Failures are ignored; returns 0.
int commit(FileTransaction& transaction);

/// Undoes every change, newest first, and empties the journal. Failures are ignored: a directory
/// that is not empty and a backup that cannot be moved remain. Returns 0.
int rollback(FileTransaction& transaction);

/// Writes the journal to the file at `path`: per entry a letter ("B", "C", "D", a blank for an
/// unknown kind), a blank and the path. Returns 0, or CannotOpenForWriting (2). No flow calls it.
[[nodiscard]] int saveJournal(const FileTransaction& transaction, const std::string& path);

/// Replaces the journal by what saveJournal() wrote to `path`. Returns 0, CannotOpenForReading (1)
/// with an empty journal, or CannotRead (4) at a malformed line or a failed read: the entries
/// before it stay. No flow calls it.
[[nodiscard]] int loadJournal(FileTransaction& transaction, const std::string& path);

/// Sets the variable `name`; a new one is added at the end. No flow calls it.
void setVariable(FileTransaction& transaction, const std::string& name, const std::string& value);

/// The value of the variable `name`; empty if there is none. No flow calls it.
[[nodiscard]] std::string getVariable(const FileTransaction& transaction, const std::string& name);

/// Replaces every "$" + name in `text` by the variable's value, variable by variable, each time
/// searching from the start of the text again; returns the number of replacements. A value must not
/// contain "$" + its own name: that would never end. No flow calls it.
int substituteVariables(const FileTransaction& transaction, std::string& text);
