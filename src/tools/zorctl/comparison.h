// Comparing an installation with its package or its index.
#pragma once

#include "scoped.h"
#include "verify.h"

#include <map>
#include <set>
#include <string>
#include <vector>

#include <sys/types.h>

class EntryReader;
class ZipFile;
struct Installation;
struct ZipEntry;
struct stat;

/// One line of the report.
struct Difference {
    std::string path;
    std::string kind;             ///< "missing", "changed", "customised", "foreign" or "unknown"
    std::string columns;          ///< the nine of rpm -V, for "changed" and "customised"
    bool isConfiguration = false; ///< the attribute letter "c"
    std::vector<std::string> keys;
};

/// Compares one installation.
class Comparison {
public:
    /// Both must outlive this.
    Comparison(const Installation& found, const VerifyOptions& options);

    /// Compares with the package; false when it cannot be read.
    bool withPackage();

    /// Compares with the index; false, with `state` as GuardedIndex has it, when there is none.
    bool withIndex(std::string& state);

    /// What differs, sorted by path.
    [[nodiscard]] const std::vector<Difference>& differences() const { return differences_; }

private:
    /// What is known of a file that has to be there.
    struct Expected {
        mode_t mode = 0;
        bool hasMode = false;
        bool directory = false;
        const ZipEntry* entry = nullptr; ///< its content; null when it is not known
    };
    using Plan = std::map<std::string, Expected>;

    void addModes(Plan& plan) const;
    void compareAll(const Plan& plan, EntryReader* package);
    int openParent(const std::string& path);
    void compare(const std::string& path, const Expected& expected, EntryReader* package);
    void compareContent(const std::string& path, const ZipEntry& entry, EntryReader& package,
                        const struct stat& status, Difference& difference) const;
    [[nodiscard]] char sameBytes(const std::string& path, const ZipEntry& entry,
                                 EntryReader& package) const;
    bool compareSettings(const std::string& path, const ZipEntry& entry, EntryReader& package,
                         Difference& difference) const;
    void findForeign(const Plan& plan);
    [[nodiscard]] bool isConfiguration(const std::string& path) const;

    const Installation& found_;
    const VerifyOptions& options_;
    std::string home_;
    std::string configuration_; ///< prefix of the paths of its files
    std::string scripts_;       ///< the same
    uid_t uid_ = 0;
    gid_t gid_ = 0;
    std::string parentPath_; ///< of the file that was compared last
    ScopedFd parent_{-1};
    std::vector<Difference> differences_;
};
