#include "foreign_files.h"

#include "directory_names.h"

#include <algorithm>
#include <iterator>
#include <utility>

ForeignFiles findForeignFiles(const std::string& home, const LeftOut& isLeftOut)
{
    ForeignFiles found;
    std::vector<std::string> pending = {home};
    std::size_t left = MostNames;
    while (!pending.empty()) {
        DirectoryNames names;
        const std::string directory = std::move(pending.back());
        pending.pop_back();
        if (listDirectory(directory, left, names) != Listed::All)
            found.notSearched.push_back(directory);
        std::erase_if(names.directories, [&](const auto& path) { return isLeftOut(path, true); });
        std::erase_if(names.files, [&](const auto& path) { return isLeftOut(path, false); });
        left -= names.count();
        std::move(names.directories.begin(), names.directories.end(), std::back_inserter(pending));
        std::move(names.files.begin(), names.files.end(), std::back_inserter(found.files));
    }
    return found;
}
