#include "exit_status.h"
#include "landed_files.h"
#include "package_layout.h"
#include "property_file.h"
#include "registry.h"
#include "settings_upgrade.h"
#include "sha256.h"
#include "shown_text.h"
#include "subcommands.h"
#include "text.h"
#include "tool_output.h"

#include <algorithm>
#include <cerrno>
#include <iomanip>
#include <iostream>

#include <sys/stat.h>

namespace {

/// What is printed of a package.
struct PackageInfo {
    std::uint64_t fileSize = 0;
    std::string sha256;
    std::uint64_t contentSize = 0;
    std::size_t files = 0;
    std::size_t directories = 0;
    std::size_t passedOver = 0;
    std::string version;              ///< of the toolkit, by its main property file
    std::vector<std::string> added;   ///< keys that an upgrade adds to that file
    std::vector<std::string> blanked; ///< lines that it empties
};

std::vector<std::string> linesOf(const std::string& content)
{
    std::vector<std::string> lines;
    for (std::size_t at = 0; at < content.size();) {
        const std::size_t end = std::min(content.find('\n', at), content.size());
        lines.push_back(content.substr(at, end - at));
        at = end + 1;
    }
    return lines;
}

/// Lets the installer's own upgrade edit the main property file, and notes what that does.
void predictUpgrade(const LandedFiles& files, PackageInfo& info)
{
    const auto found = files.find(std::string(MainProperties));
    if (found == files.end())
        return;
    const auto properties = propertiesOf(found->second.content);
    const auto version = properties.find("version");
    info.version = version == properties.end() ? "" : version->second;

    PropertyFile file;
    file.lines = linesOf(found->second.content);
    const std::vector<std::string> before = file.lines;
    upgradeProperties(file, "/opt/corvan/zor", InstallRegistry(), "/usr/kel/corvan/common");
    for (std::size_t i = 0; i < file.lines.size(); ++i) {
        if (i >= before.size())
            info.added.push_back(file.lines[i]);
        else if (file.lines[i].empty() && !before[i].empty())
            info.blanked.push_back(keyOfLine(before[i]));
    }
}

int gather(const PackageFile& package, const LandedFiles& files, PackageInfo& info)
{
    struct stat status = {};
    if (fstat(package.fd(), &status) != 0)
        return errno;
    info.fileSize = static_cast<std::uint64_t>(status.st_size);
    for (const auto& [place, file] : files) {
        ++(place.ends_with('/') ? info.directories : info.files);
        info.contentSize += file.size;
    }
    info.passedOver = static_cast<std::size_t>(
        std::count_if(package.entries().begin(), package.entries().end(),
                      [](const ZipEntry& entry) { return !landingOf(entry.name); }));
    predictUpgrade(files, info);
    return sha256OfFile(package.fd(), info.sha256);
}

void printText(const std::string& file, const PackageInfo& info, const LandedFiles& files)
{
    std::cout << "file: " << shown(file) << "\nsize: " << info.fileSize
              << "\nsha256: " << info.sha256 << "\nversion: " << shown(info.version)
              << "\nfiles: " << info.files << "\ndirectories: " << info.directories
              << "\npassed over: " << info.passedOver << "\ncontent: " << info.contentSize << '\n';
    for (const std::string& line : info.added)
        std::cout << "upgrade adds: " << shown(line) << '\n';
    for (const std::string& key : info.blanked)
        std::cout << "upgrade blanks: " << shown(key) << '\n';
    for (const auto& [place, landed] : files) {
        if (!place.ends_with('/'))
            std::cout << landed.sha256 << "  " << std::setw(10) << landed.size << "  "
                      << shown(place) << (landed.sound ? "" : "  (damaged)") << '\n';
    }
}

Json shownList(const std::vector<std::string>& texts)
{
    Json list = Json::array();
    for (const std::string& text : texts)
        list.push_back(shown(text));
    return list;
}

void printAsJson(const std::string& file, const PackageInfo& info, const LandedFiles& files)
{
    Json entries = Json::array();
    for (const auto& [place, landed] : files) {
        if (!place.ends_with('/'))
            entries.push_back({{"place", shown(place)},
                               {"size", landed.size},
                               {"sha256", landed.sha256},
                               {"sound", landed.sound}});
    }
    printJson({{"file", shown(file)},
               {"size", info.fileSize},
               {"sha256", info.sha256},
               {"version", shown(info.version)},
               {"directories", info.directories},
               {"passed_over", info.passedOver},
               {"content", info.contentSize},
               {"upgrade_adds", shownList(info.added)},
               {"upgrade_blanks", shownList(info.blanked)},
               {"files", std::move(entries)}});
}

} // namespace

int infoCommand(const FileOptions& options)
{
    const auto package = openPackage(options.file);
    if (!package)
        return ToolTrouble;
    const LandedFiles files = landedFiles(*package);
    PackageInfo info;
    const int error = gather(*package, files, info);
    if (error != 0) {
        complainOf(options.file, error);
        return ToolTrouble;
    }
    if (options.json)
        printAsJson(options.file, info, files);
    else
        printText(options.file, info, files);
    return ToolOk;
}
