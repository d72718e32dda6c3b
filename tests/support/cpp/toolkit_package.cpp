#include "toolkit_package.h"

#include "settings.h"
#include "test_files.h"
#include "zip_builder.h"

#include <gtest/gtest.h>

#include <algorithm>

#include <sys/stat.h>

namespace {

const std::string ImageRoot = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/";

ZipItem itemOf(const std::string& name, const std::string& content)
{
    // Small files are stored, so that both kinds of stream are used.
    return content.size() < 100 ? storedItem(ImageRoot + name, content)
                                : deflatedItem(ImageRoot + name, content);
}

} // namespace

std::string scannerProgram(const std::string& log, const std::string& failing)
{
    std::string script = "#!/bin/sh\n"
                         "line=${0##*/}\n"
                         "for argument in \"$@\"; do line=\"$line [$argument]\"; done\n"
                         "echo \"$line\" >>\"" +
                         log + "\"\n";
    if (!failing.empty())
        script += "case \"$*\" in *\"" + failing + "\"*) exit 3 ;; esac\n";
    return script + "exit 0\n";
}

void plantScript(const std::string& path, const std::string& commands)
{
    writeFile(path, "#!/bin/sh\n" + commands);
    ASSERT_EQ(0, chmod(path.c_str(), 0755));
}

void plantScanners(const std::string& home, const std::string& log, const std::string& failing)
{
    makeDirectories(home + "/bin");
    for (const char* const name : {"/bin/trawlcfg", "/bin/trawlfs"}) {
        writeFile(home + name, scannerProgram(log, failing));
        ASSERT_EQ(0, chmod((home + name).c_str(), 0755));
    }
}

PackageFiles toolkitFiles(const std::string& log, const std::string& failing)
{
    return {
        {"bin/", ""},
        {"bin/trawlcfg", scannerProgram(log, failing)},
        {"bin/trawlfs", scannerProgram(log, failing)},
        {"bin/trawlhw", "hardware scanner\n"},
        {"properties/", ""},
        {"properties/scan.properties", "depth=4\n"},
        {"config/", ""},
        {"config/Zor.properties", "version=9.2.30.0000\n"
                                  "build_date=22/12/02\n"
                                  "trace_level=3\n"
                                  "trace_file_path=$(ZOR_DestinationDir)$(FileSeparator)logs\n"
                                  "trace_file=zor.trc\n"
                                  "provider=$(fscanner_mode)\n"
                                  "cache=$(ZOR_ConfigRootDirectory)$(FileSeparator)cache_data\n"
                                  "common=$(CorvanCommonDir)\n"},
        {"config/ZorTrace.properties", "handlers.traceFile.fileName=$(ZOR_DestinationDir)/x.trc\n"
                                       "zor.loggers.trcLogger.level=DEBUG_MIN\n"
                                       "root=$(ZOR_ConfigRootDirectory)\n"
                                       "separator=$(FileSeparator)\n"},
        {"config/ZorHWConfig.xml", "<hardware/>\n"},
        {"config/xss/", ""},
        {"config/xss/schema.xss", "<schema/>\n"},
        {"install/", ""},
        {"install/trawlcfg.sh", "home=$(ZOR_DestinationDir)\n"
                                "config=$(ZOR_ConfigRootDirectory)\n"
                                "common=$(CorvanCommonDir)\n"},
        {"install/rmdirs.sh", "rmdir $(CorvanCommonDir)/ZOR\n"},
    };
}

std::string& contentOf(PackageFiles& files, const std::string& name)
{
    static std::string missing;
    const auto found = std::find_if(files.begin(), files.end(),
                                    [&](const auto& file) { return file.first == name; });
    EXPECT_TRUE(found != files.end()) << name;
    return found != files.end() ? found->second : missing;
}

PackageFiles without(const PackageFiles& files, const std::string& name)
{
    PackageFiles others;
    std::copy_if(files.begin(), files.end(), std::back_inserter(others),
                 [&](const auto& file) { return file.first != name; });
    return others;
}

void usePackage(const std::string& path, const PackageFiles& files)
{
    ZipArchive archive;
    for (const auto& [name, content] : files)
        archive.items.push_back(itemOf(name, content));
    writeFile(path, zipBytes(archive));
    spbPackage = path;
    useCompleteLayoutNames();
}

void useCompleteLayoutNames()
{
    spbFileRoot = ImageRoot;
    trawlcfgExe = "bin/trawlcfg";
    trawlfsExe = "bin/trawlfs";
}
