// What is installed on the machine, and whether it is intact: a look that changes nothing.
//
// A field that could not be determined is unknown (an empty optional, or the text "unknown"); it
// never makes a survey fail. Nothing is read that is not a regular file, and nothing without limit.
#pragma once

#include "registry.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include <sys/types.h>

/// A longer registry is not read.
inline constexpr std::size_t RegistryLimit = std::size_t{1} << 20;

/// How an installation is.
enum class Health {
    Intact,
    Damaged, ///< something is wrong: see its problems
    Absent,  ///< nothing is registered, and nothing hints that something was
    Unknown, ///< the registry may not be read
};

/// One thing that is wrong. Codes are an interface: scripts compare them.
struct Problem {
    std::string code;
    std::string text; ///< for people
};

/// One installation, or the place where it would be registered.
struct Installation {
    bool local = false; ///< of one user, not the shared one
    uid_t uid = 0;      ///< whose it is, if it is local
    std::string user;   ///< that user's name; empty if unknown

    Health health = Health::Absent;
    std::vector<Problem> problems;

    std::string registryPath;
    /// "complete", "missing", "empty", "incomplete", "bad-version", "unreadable", "not-regular" or
    /// "too-large".
    std::string registryState = "missing";
    std::string registryBackupState = "missing"; ///< the same, of its ".bak" file
    InstallRegistry registry;                    ///< valid if the state is "complete"

    /// Whether the home directory is as the installer wants it: "intact", "missing",
    /// "not-writable", "control-missing", "control-empty" or "unknown".
    std::string homeState = "unknown";
    /// The index of installed files: "complete", "interrupted" (an extraction was writing it),
    /// "missing", "unreadable", "not-regular" or "too-large".
    std::string indexState = "missing";
    std::optional<std::size_t> indexedFiles;
    std::string recordedType = "unknown"; ///< "global", "local", "missing" or "unknown"
    std::optional<bool> singleUserMode;
    std::vector<std::string> backups; ///< left by an interrupted run
    bool backupsKnown = false;        ///< every directory could be searched
};

/// A user, as the user database has it.
struct Account {
    uid_t uid = 0;
    gid_t gid = 0;
    std::string name;
    std::string home;
};

/// What the registry of the shared installation, or of the current user's, says, and whether it is
/// one in single-user mode; nothing about health, index and backups.
[[nodiscard]] Installation surveyRegistry(bool local);

/// Surveys the shared installation.
[[nodiscard]] Installation surveyShared();

/// Surveys the installation of the current user.
[[nodiscard]] Installation surveyOwn();

/// Surveys the installation of `account`, with the rights of this process.
[[nodiscard]] Installation surveyAccount(const Account& account);

/// The users of the user database whose home directories differ, in its order.
[[nodiscard]] std::vector<Account> allAccounts();

/// "intact", "damaged", "absent" or "unknown".
[[nodiscard]] const char* healthName(Health health);

/// The exploiters of the list of a registry, in its order.
[[nodiscard]] std::vector<std::string> exploiterList(const std::string& list);

/// Backups below the package directories of the installation in `home`, sorted. `complete` is set
/// to false if a directory could not be searched, or more than a million names are there.
[[nodiscard]] std::vector<std::string> findBackups(const std::string& home, bool& complete);
