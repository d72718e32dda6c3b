#include "simulated_extraction.h"

#include "file_index.h"
#include "forecast.h"
#include "package_files.h"
#include "paths.h"
#include "settings.h"
#include "text.h"
#include "zip_file.h"

namespace {

using Kind = SimulatedTree::Kind;

unsigned long long roundedUp(unsigned long long size, unsigned long long block)
{
    return (size + block - 1) / block * block;
}

bool isReadable(const ZipEntry& entry)
{
    return entry.uncompressedSize != 0 && entry.compressedSize != 0 &&
           (entry.method == 0 || entry.method == 8);
}

/// What is at `path` becomes its backup, which the commit deletes; false if that fails. A
/// private installation keeps no backups and writes over it.
bool moveAway(Forecast& forecast, const std::string& path, bool keepsBackups)
{
    SimulatedTree& tree = forecast.tree;
    if (!keepsBackups)
        return tree.kindOf(path) == Kind::File;
    const std::string backup = backupName(path);
    if (tree.kindOf(backup) == Kind::Directory)
        return false;
    if (tree.exists(backup)) {
        forecast.noteLoss(backup);
        (void)tree.remove(backup);
    }
    return true;
}

bool extractOne(Forecast& forecast, const PackagedFile& file, bool keepsBackups,
                std::set<std::string>& deployed)
{
    SimulatedTree& tree = forecast.tree;
    const std::string& path = file.path;
    if (endsWithSlash(path)) {
        if (!tree.makePath(path))
            forecast.fail("the directory " + path + " cannot be created");
        return forecast.failure.empty();
    }
    if (!isReadable(*file.entry)) {
        forecast.fail("the entry for " + path +
                      " cannot be opened: it is empty or of an unknown method");
        return false;
    }
    const std::string directory = path.substr(0, path.rfind('/'));
    const bool there = tree.exists(path);
    if (!tree.canCreateIn(directory) || (there && !moveAway(forecast, path, keepsBackups))) {
        forecast.fail("the file " + path +
                      " cannot be written: its directory is missing or closed");
        return false;
    }
    // The second pass over "config/xss" takes the place of the first one's backup.
    if (there && deployed.contains(path))
        forecast.noteLoss(path);
    forecast.measureSpace();
    forecast.spaceNeeded += roundedUp(file.entry->uncompressedSize, forecast.blockSize);
    tree.write(path, file.entry->uncompressedSize);
    deployed.insert(path);
    return true;
}

} // namespace

void simulateExtraction(Forecast& forecast, const std::string& home, bool fresh, bool keepsBackups,
                        std::set<std::string>& deployed)
{
    const ZipFile archive(spbPackage.c_str());
    if (archive.entries().empty()) {
        forecast.fail("the package " + spbPackage + " is not found or not valid");
        return;
    }
    const std::string index = fileIndexPath(home);
    forecast.noteLoss(index);
    const bool indexOpened = forecast.tree.makePath(index) && forecast.tree.canCreateIn(home);
    if (indexOpened)
        forecast.tree.write(index, 0);
    for (const PackagedFile& file : packagedFiles(archive, home, fresh)) {
        if (extractOne(forecast, file, keepsBackups, deployed))
            continue;
        if (indexOpened)
            (void)forecast.tree.remove(index);
        return;
    }
}
