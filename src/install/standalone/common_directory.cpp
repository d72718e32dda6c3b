#include "common_directory.h"

#include "file_operations.h"
#include "file_reading.h"
#include "file_replacement.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"

#include <cstdio>

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
    {
        // Neither committed nor rolled back: other products use the setting, too.
        FileTransaction scratch;
        const ScopedUmask mask(globalFilesUmask);
        (void)createPath(scratch, path, SettingDirectoryMode); // if it fails, so does the next step
    }
    const ScopedUmask mask(0);
    (void)replaceFile(path, SettingFileMode, [](std::FILE* file) { // the default applies anyway
        (void)std::fprintf(file, "%s=%s\n", KeyCorvanCommonDir.c_str(), DefaultCommonDirectory);
    });
}

} // namespace

std::string commonSettingPath()
{
    return joinPath(SettingDirectory, SettingFileName);
}

std::string readCommonDirectory(bool readOnly)
{
    const std::string path = commonSettingPath();
    const ScopedFile file = openForReading(path);
    if (file)
        return commonDirectoryOf(file.get());
    // A setting that exists but cannot be read may name another directory: it is kept.
    if (!readOnly && pathIsMissing(path))
        writeDefaultSetting(path);
    return DefaultCommonDirectory;
}
