#include "common_directory.h"

#include "file_operations.h"
#include "paths.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"

#include <cstdio>

#include <sys/stat.h>

const std::string KeyCorvanCommonDir = "corvan_common_dir";

namespace {

constexpr const char* DefaultCommonDirectory = "/usr/kel/corvan/common";
constexpr const char* SettingDirectory = "/etc/kel/corvan/common/cfg";
constexpr const char* SettingFileName = "log.properties";
constexpr mode_t SettingDirectoryMode = 0775;
constexpr mode_t SettingFileMode = 0664;

std::string commonDirectoryOf(std::FILE* file)
{
    std::string line;
    while (readLine(file, line)) {
        if (line.find('=') == std::string::npos || keyOfLine(line) != KeyCorvanCommonDir)
            continue;
        std::string directory = textAfterEquals(line);
        trim(directory);
        return directory;
    }
    return DefaultCommonDirectory;
}

void writeDefaultSetting(const std::string& path)
{
    const ScopedUmask mask(globalFilesUmask);
    // Dropped without commit or rollback: the setting is the house's, not this installation's.
    FileTransaction scratch;
    (void)createPath(scratch, path, SettingDirectoryMode); // the open tells

    const ScopedFile file(std::fopen(path.c_str(), "w"));
    if (!file)
        return;
    (void)std::fprintf(file.get(), "%s=%s\n", KeyCorvanCommonDir.c_str(), DefaultCommonDirectory);
    (void)fchmod(fileno(file.get()), SettingFileMode);
}

} // namespace

std::string commonSettingPath()
{
    return joinPath(SettingDirectory, SettingFileName);
}

std::string readCommonDirectory(bool readOnly)
{
    const std::string path = commonSettingPath();
    const ScopedFile file(std::fopen(path.c_str(), "r"));
    if (file)
        return commonDirectoryOf(file.get());
    if (!readOnly)
        writeDefaultSetting(path);
    return DefaultCommonDirectory;
}
