#include "settings.h"
#include "settings_guard.h"

#include <gtest/gtest.h>

#include <iostream>

namespace {

TEST(SettingsTest, FlagsStartCleared)
{
    EXPECT_FALSE(localInstall);
    EXPECT_FALSE(skipExploiterRegistration);
    EXPECT_FALSE(privateMode);
    EXPECT_FALSE(debugMode);
    EXPECT_FALSE(norollback);
    EXPECT_FALSE(ignoreNonFatalErrors);
    EXPECT_FALSE(createSingleUserModeFile);
    EXPECT_FALSE(applySingleUserMode);
    EXPECT_FALSE(custom_log_path_available);
}

TEST(SettingsTest, UpdateErrorsAreIgnoredFromTheStart)
{
    EXPECT_TRUE(ignoreUpdateErrors);
}

TEST(SettingsTest, ModesStartOpen)
{
    EXPECT_EQ(0U, globalFilesUmask);
    EXPECT_EQ(0777U, LogDirMode);
    EXPECT_EQ(0777U, CommonLogDirMode);
    EXPECT_EQ(0777U, CacheDirRootMode);
    EXPECT_EQ(0777U, EtcDirMode);
    EXPECT_EQ(0777U, CorvanCommonDirMode);
}

TEST(SettingsTest, TextsStartWithTheirDefaults)
{
    EXPECT_EQ("", spbPackage);
    EXPECT_EQ("", new_log_path);
    EXPECT_EQ("provider_cache", fileScannerMode);
    EXPECT_EQ("linux-ix86", interp);
    EXPECT_EQ("/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/", spbFileRoot);
    EXPECT_EQ("trawlcfg", trawlcfgExe);
    EXPECT_EQ("trawlfs", trawlfsExe);
}

TEST(SettingsTest, TheLayoutHasItsNames)
{
    EXPECT_EQ("bin", spbBinDir);
    EXPECT_EQ("properties", spbPropertiesDir);
    EXPECT_EQ("config", spbCfgDir);
    EXPECT_EQ("xss", spbCfgXssDir);
    EXPECT_EQ("plugins", spbBinPluginsDir);
    EXPECT_EQ("customscanners", spbBinCustomScannersDir);
    EXPECT_EQ("install", auxDirInstall);
    EXPECT_EQ("bin", binDir);
    EXPECT_EQ("bin/etc", binEtcDir);
    EXPECT_EQ("etc", etcDir);
    EXPECT_EQ("logs", logDir);
    EXPECT_EQ("cache_data", cacheDir);
    EXPECT_EQ("ZOR", zorCommonDir);
    EXPECT_EQ("Zor.properties", zorProps);
    EXPECT_EQ("ZorTrace.properties", traceProps);
    EXPECT_EQ("zor_install.properties", installProps);
    EXPECT_EQ("_uninst", UninstallFileName);
    EXPECT_EQ("ZOR_files", ZOR_FILE_INDEX);
}

TEST(SettingsTest, TheLogIsStandardOutputAndNoIndexIsOpen)
{
    EXPECT_EQ(&std::cout, logstream);
    EXPECT_EQ(nullptr, zor_file_handle);
}

TEST(SettingsTest, SingleUserModeLowersTheModes)
{
    const SettingsGuard guard;

    enterSingleUserMode();

    EXPECT_EQ(022U, globalFilesUmask);
    EXPECT_EQ(0755U, LogDirMode);
    EXPECT_EQ(0755U, CommonLogDirMode);
    EXPECT_EQ(0755U, CacheDirRootMode);
    EXPECT_EQ(0755U, EtcDirMode);
    EXPECT_TRUE(applySingleUserMode);
}

TEST(SettingsTest, SingleUserModeAsksForNoFlagByItself)
{
    const SettingsGuard guard;

    enterSingleUserMode();

    EXPECT_FALSE(createSingleUserModeFile);
}

TEST(SettingsTest, TheLayoutNamesAreCompletedWithTheirDirectories)
{
    const SettingsGuard guard;

    completeLayoutNames();

    EXPECT_EQ("bin/trawlcfg", trawlcfgExe);
    EXPECT_EQ("bin/trawlfs", trawlfsExe);
    EXPECT_EQ("/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/", spbFileRoot);
}

} // namespace
