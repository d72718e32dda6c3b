#include "extraction.h"

#include "entry_extraction.h"
#include "file_index.h"
#include "file_operations.h"
#include "interruption.h"
#include "paths.h"
#include "registry.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"
#include "zip_file.h"

#include <iostream>
#include <memory>
#include <set>
#include <string_view>
#include <vector>

namespace {

constexpr mode_t PublicMode = 0755;

void trace(bool debug, const char* what, const std::string& value)
{
    if (debug)
        std::cout << what << value << '\n';
}

/// Extracts one entry to `destination`; a trailing slash means a directory.
int extractEntry(FileTransaction& transaction, OpenPackage& package, const ZipEntry& entry,
                 const std::string& destination, mode_t mode, std::FILE* index, bool debug)
{
    if (endsWithSlash(destination)) {
        trace(debug, "createPath: ", destination);
        return createPath(transaction, destination, mode);
    }

    trace(debug, "extractFile: ", destination);
    const int code = extractOpenFile(transaction, package, &entry, destination, mode);
    if (index != nullptr) // also after a failure: part of the file may exist
        (void)std::fprintf(index, "%s\n", destination.c_str());
    return code;
}

/// extractEntries() of an open package.
int extractMatching(FileTransaction& transaction, OpenPackage& package,
                    const std::string& srcPrefix, const std::string& dstDir, mode_t mode,
                    const std::string* skipList, std::FILE* index, bool debug)
{
    trace(debug, "Src path: ", srcPrefix);
    trace(debug, "Dst path: ", dstDir);
    trace(debug, "Mode: ", std::to_string(mode));

    for (const ZipEntry& entry : package.archive().entries()) {
        if (skipList != nullptr && nameListContains(*skipList, entry.name)) {
            trace(debug, "Skip: ", entry.name);
            continue;
        }
        if (debug)
            std::cout << "Looking at file " << entry.name << " inside spb\n";
        if (!entry.name.starts_with(srcPrefix))
            continue;

        const std::string destination =
            destinationName(dstDir, std::string_view(entry.name).substr(srcPrefix.size()));
        trace(debug, "dstName: ", destination);
        if (destination.size() <= 1) {
            trace(debug, "Skipping dstName: ", destination);
            continue;
        }

        if (isInterrupted())
            return RunInterrupted;
        const int code = extractEntry(transaction, package, entry, destination, mode, index, debug);
        if (code != FileOk) {
            trace(debug, "createPath or extractFile failed", "");
            return code;
        }
    }
    return FileOk;
}

/// Extracts the package directories in their order; returns the first failing code.
int extractDirs(FileTransaction& transaction, const ZipFile& archive, const std::string& home,
                bool freshInstall)
{
    OpenPackage package(archive);
    const ScopedDirectoryReuse reuse;
    const ScopedUmask mask(globalFilesUmask);
    for (const ExtractionStep& step : extractionSteps(freshInstall)) {
        const std::string destination = joinPath(home, step.subdir);
        const bool isConfig = step.subdir == spbCfgDir; // is logged, and never traced
        if (isConfig)
            *logstream << "Extracting configs to '" << destination << "'\n" << std::flush;
        const int code = extractMatching(
            transaction, package, sourcePrefix(step.subdir), destination, step.mode,
            isConfig ? &step.skipList : nullptr, zor_file_handle, debugMode && !isConfig);
        if (code == FileOk)
            continue;
        if (step.subdir == spbBinDir)
            *logstream << "Bin dir file extraction failed\n";
        return code;
    }
    return FileOk;
}

} // namespace

std::string sourcePrefix(const std::string& subdir)
{
    return spbFileRoot + subdir + "/";
}

std::string destinationName(const std::string& dstDir, std::string_view rest)
{
    std::string name;
    name.reserve(dstDir.size() + 1 + rest.size());
    name.append(dstDir).append("/").append(rest);
    for (std::size_t at = name.find("//"); at != std::string::npos; at = name.find("//", at))
        name.erase(at, 1);
    return name;
}

std::vector<ExtractionStep> extractionSteps(bool freshInstall)
{
    std::string settings; // may have been edited
    if (!freshInstall)
        appendToNameList(settings, sourcePrefix(spbCfgDir) + zorProps);
    return {
        {spbBinDir, PublicMode, ""},
        {spbPropertiesDir, PublicMode, ""},
        {spbCfgDir, PublicMode, settings},
        // Deliberate: the step above has already extracted these files. The second pass backs them
        // up and lists them again.
        {joinPath(spbCfgDir, spbCfgXssDir), PublicMode, ""},
        {auxDirInstall, InstallDirMode, ""},
    };
}

int extractPackage(const std::string& spbPath, FileTransaction& transaction,
                   InstallRegistry& installation, bool freshInstall, const std::string* indexPath)
{
    *logstream << "Starting file extraction...\n" << std::flush; // a bad entry may end the process
    auto archive = std::make_unique<const ZipFile>(spbPath.c_str());
    if (archive->entries().empty()) {
        *logstream << "*** Error: package not found or not valid.\n";
        return CannotOpenForReading;
    }

    std::set<std::string> files;
    if (indexPath != nullptr) {
        readFileIndex(*indexPath, files); // of earlier installations
        openTransientIndex(transaction, *indexPath);
    }

    const int code = extractDirs(transaction, *archive, installation.homeDirectory, freshInstall);

    archive.reset(); // a long list of entries makes room for as long an index
    closeTransientIndex();
    if (indexPath != nullptr) {
        const ScopedUmask mask(globalFilesUmask);
        readFileIndex(*indexPath, files);
        addInstallerFiles(installation, files);
        writeFileIndex(*indexPath, files);
    }
    if (code != FileOk) {
        *logstream << "File extraction failed, error = " << code << " ("
                   << fileErrorText(static_cast<unsigned>(code)) << ")\n";
        if (indexPath != nullptr)
            (void)unlinkPath(*indexPath); // it lists what the rollback deletes
    }
    return code;
}

int extractDir(FileTransaction& transaction, const ZipFile& archive, const std::string& targetDir,
               const std::string& subdir, mode_t mode, std::FILE* index, bool debug)
{
    return extractEntries(transaction, archive, sourcePrefix(subdir), joinPath(targetDir, subdir),
                          mode, nullptr, index, debug);
}

int extractEntries(FileTransaction& transaction, const ZipFile& archive,
                   const std::string& srcPrefix, const std::string& dstDir, mode_t mode,
                   const std::string* skipList, std::FILE* index, bool debug)
{
    OpenPackage package(archive);
    return extractMatching(transaction, package, srcPrefix, dstDir, mode, skipList, index, debug);
}
