#include "file_index.h"

#include "build_stamp.h"
#include "file_operations.h"
#include "file_reading.h"
#include "file_replacement.h"
#include "paths.h"
#include "registry.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "time_stamps.h"

#include <cstdio>
#include <iterator>
#include <ostream>

namespace {

constexpr mode_t IndexFileMode = 0644;

} // namespace

std::string fileIndexPath(const std::string& home)
{
    return home + "/" + ZOR_FILE_INDEX; // also after a slash
}

void readFileIndex(const std::string& path, std::set<std::string>& files)
{
    const ScopedFile file = openForReading(path);
    if (!file)
        return;
    std::string line;
    auto next = files.begin(); // where a line goes that follows the one before it in order
    while (readLine(file.get(), line)) {
        if (!line.empty() && line[0] != '#')
            next = std::next(files.insert(next, line));
    }
}

void addInstallerFiles(const InstallRegistry& registry, std::set<std::string>& files)
{
    const std::string& home = registry.homeDirectory;
    files.insert(joinPath(joinPath(home, spbBinDir), "libzor.so"));
    files.insert(joinPath(joinPath(home, spbCfgDir), "Zor.tmp"));
    files.insert(joinPath(home, singleUserFlag));
    files.insert(joinPath(home, "zor.log"));
    files.insert(joinPath(home, "zor.log.bak"));
}

void writeFileIndex(const std::string& path, const std::set<std::string>& files)
{
    const auto write = [&](std::FILE* file) {
        (void)std::fprintf(file, "# File created by ZOR: %s installed on %s\n",
                           zorBuildStamp.c_str(), localTimeStamp().c_str());
        for (const std::string& line : files) {
            (void)std::fwrite(line.data(), 1, line.size(), file);
            (void)std::fputc('\n', file);
        }
    };
    (void)replaceFile(path, NewFileMode, write); // a removal without an index knows fewer files
}

void refreshFileIndex(const InstallRegistry& registry, const std::string& path)
{
    std::set<std::string> files;
    readFileIndex(path, files);
    addInstallerFiles(registry, files);
    writeFileIndex(path, files);
}

void appendToFileIndex(const std::string& path, const std::string& file)
{
    const ScopedFile index = openStream(path, Existing::Append, IndexFileMode);
    if (index)
        (void)std::fprintf(index.get(), "%s\n", file.c_str());
}

void openTransientIndex(FileTransaction& transaction, const std::string& path)
{
    const ScopedUmask mask(globalFilesUmask);
    (void)createPath(transaction, path, IndexDirectoryMode); // if it fails, so does the open
    zor_file_handle = openStream(path, Existing::Truncate, IndexFileMode, O_RDWR).release();
    if (zor_file_handle == nullptr) {
        *logstream << "Warning! Failed to create install log file: " << path << '\n';
        return;
    }
    (void)std::fprintf(zor_file_handle, "# File created by ZOR: %s\n", zorBuildStamp.c_str());
}

void closeTransientIndex()
{
    if (zor_file_handle == nullptr)
        return;
    (void)std::fclose(zor_file_handle); // the final index is written from what arrived
    zor_file_handle = nullptr;
}
