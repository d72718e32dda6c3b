#include "package_files.h"

#include "extraction.h"
#include "paths.h"
#include "text.h"
#include "zip_file.h"

std::vector<PackagedFile> packagedFiles(const ZipFile& archive, const std::string& home,
                                        bool freshInstall)
{
    std::vector<PackagedFile> files;
    for (const ExtractionStep& step : extractionSteps(freshInstall)) {
        const std::string prefix = sourcePrefix(step.subdir);
        const std::string destination = joinPath(home, step.subdir);
        for (const ZipEntry& entry : archive.entries()) {
            if (!entry.name.starts_with(prefix) ||
                (!step.skipList.empty() && nameListContains(step.skipList, entry.name)))
                continue;
            std::string path = destinationName(destination, entry.name.substr(prefix.size()));
            if (path.size() > 1)
                files.push_back({std::move(path), step.mode, &entry});
        }
    }
    return files;
}
