// Goes through a package as a fresh installation does, and finds what would go wrong.
#pragma once

#include "extraction_model.h"
#include "findings.h"
#include "package_file.h"

#include <functional>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// Whether the installer fills in placeholders in the file that lands at `place`: the check looks
/// into its content.
[[nodiscard]] bool hasPlaceholders(std::string_view place);

/// Reads entry number `i` to its end.
using EntryReader = std::function<EntryContent(std::size_t number, const ContentSink& sink)>;

/// Checks entries, of a package or of one that is about to be written.
class Checker {
public:
    /// `entries` and their `details` must outlive the checker; `read` gives their content.
    Checker(const std::vector<ZipEntry>& entries, std::function<HeaderDetails(std::size_t)> details,
            EntryReader read, Findings& findings);

    /// Adds to the findings. Returns 0, or EFBIG when the names of the entries lead to more than a
    /// million files and directories: nothing can be said then. `shown`: with its progress on a
    /// terminal.
    [[nodiscard]] int run(bool shown);

private:
    void checkNames();
    void checkName(std::size_t number);
    void checkPlace(const std::string& place);
    void checkExtraction(bool shown);
    void checkStep(std::size_t number, bool again);
    void checkFile(std::size_t number);
    void checkData(std::size_t number);
    void checkBackupNames();
    void checkRequiredFiles();
    void checkPlaceholders();

    const std::vector<ZipEntry>& entries_;
    std::function<HeaderDetails(std::size_t)> details_;
    EntryReader read_;
    Findings& findings_;
    std::vector<std::string> places_; ///< empty: passed over
    ExtractionModel target_;
    std::set<std::string> landed_;
    std::set<std::pair<std::string_view, std::string>> stepsFound_;
    std::map<std::string, std::string, std::less<>> contents_; ///< of files with placeholders
};

/// Checks `package`: run() on its entries.
[[nodiscard]] int checkPackage(const PackageFile& package, Findings& findings);
