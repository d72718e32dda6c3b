#include "installer_fixtures.h"
#include "paths.h"
#include "permissions.h"
#include "process_limits.h"
#include "safe_path.h"
#include "settings.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include <sys/stat.h>
#include <sys/syscall.h>

namespace {

using Lines = std::vector<std::string>;

/// A complete installed tree below the test's directory, everything in it with mode 0700 or 0600.
class PermissionsTest : public MachineTest {
protected:
    PermissionsTest()
    {
        found.currentZorHome = home;
        found.currentCfgHome = home;
        found.homeExists = true;
    }

    void SetUp() override
    {
        MachineTest::SetUp();
        if (HasFatalFailure())
            return;
        (void)umask(077);
        for (const char* const name :
             {"cache_data", "config/xss", "bin/customscanners", "bin/etc/trawlfs",
              "bin/etc/trawlhw", "bin/etc/trawlvpd", "bin/etc/trawlsw", "bin/etc/trawlcfg",
              "bin/etc/other", "bin/plugins", "install", "logs", "_uninst", "properties"})
            makeDirectories(home + "/" + name);
        for (const char* const name :
             {"config/Zor.properties", "config/ZorTrace.properties", "config/ZorHWConfig.xml",
              "config/other", "install/zor_install.properties", "install/trawlcfg.sh",
              "install/rmdirs.sh", "cache_data/file"})
            writeFile(home + "/" + name, "");
        makeDirectories("/etc/zor");
        writeFile("/etc/zor/zor.ini", "");
    }

    const std::string home = dir / "zor";
    Discovery found;
};

TEST_F(PermissionsTest, EverythingOfASharedInstallationGetsItsMode)
{
    applyPermissions(found);

    EXPECT_EQ(Lines({"d 0750 _uninst",
                     "d 0755 bin",
                     "d 0777 bin/customscanners",
                     "d 0777 bin/etc",
                     "d 0700 bin/etc/other",
                     "d 0777 bin/etc/trawlcfg",
                     "d 0777 bin/etc/trawlfs",
                     "d 0777 bin/etc/trawlhw",
                     "d 0777 bin/etc/trawlsw",
                     "d 0777 bin/etc/trawlvpd",
                     "d 0755 bin/plugins",
                     "d 0777 cache_data",
                     "f 0600 cache_data/file",
                     "d 0755 config",
                     "f 0644 config/Zor.properties",
                     "f 0644 config/ZorHWConfig.xml",
                     "f 0644 config/ZorTrace.properties",
                     "f 0600 config/other",
                     "d 0755 config/xss",
                     "d 0750 install",
                     "f 0600 install/rmdirs.sh",
                     "f 0750 install/trawlcfg.sh",
                     "f 0640 install/zor_install.properties",
                     "d 0777 logs",
                     "d 0700 properties"}),
              treeOf(home));
    EXPECT_EQ("", log.text());
}

TEST_F(PermissionsTest, TheRegistryAndItsDirectoryGetTheirModes)
{
    applyPermissions(found);

    EXPECT_EQ(0755U, modeOf("/etc/zor"));
    EXPECT_EQ(0644U, modeOf("/etc/zor/zor.ini"));
}

TEST_F(PermissionsTest, APerUserInstallationSetsTheModesOfItsOwnRegistry)
{
    localInstall = true;
    makeDirectories("/root/.zor");
    writeFile("/root/.zor/zor.ini", "");

    applyPermissions(found);

    EXPECT_EQ(0755U, modeOf("/root/.zor"));
    EXPECT_EQ(0644U, modeOf("/root/.zor/zor.ini"));
    EXPECT_EQ(0600U, modeOf("/etc/zor/zor.ini"));
}

TEST_F(PermissionsTest, TheCacheOfAPerUserInstallationIsClosedToOthers)
{
    localInstall = true;

    applyPermissions(found);

    EXPECT_EQ(0770U, modeOf(home + "/cache_data"));
    EXPECT_EQ(0777U, modeOf(home + "/bin/etc"));
}

TEST_F(PermissionsTest, SingleUserModeLowersTheModesOfDirectories)
{
    enterSingleUserMode();

    applyPermissions(found);

    for (const char* const name :
         {"cache_data", "logs", "bin/customscanners", "bin/etc", "bin/etc/trawlfs",
          "bin/etc/trawlhw", "bin/etc/trawlvpd", "bin/etc/trawlsw", "bin/etc/trawlcfg"})
        EXPECT_EQ(0755U, modeOf(home + "/" + name)) << name;
}

TEST_F(PermissionsTest, TheCacheOfAPerUserInstallationHas0770InSingleUserModeToo)
{
    enterSingleUserMode();
    localInstall = true;

    applyPermissions(found);

    EXPECT_EQ(0770U, modeOf(home + "/cache_data"));
}

TEST_F(PermissionsTest, AHomeThatWasThereKeepsItsMode)
{
    applyPermissions(found);

    EXPECT_EQ(0700U, modeOf(home));
}

TEST_F(PermissionsTest, AHomeThatThisRunMadeIsOpened)
{
    found.homeExists = false;

    applyPermissions(found);

    EXPECT_EQ(0755U, modeOf(home));
}

TEST_F(PermissionsTest, TheHomeOfASharedInstallationIsOpenedInSingleUserMode)
{
    enterSingleUserMode();

    applyPermissions(found);

    EXPECT_EQ(0755U, modeOf(home));
}

TEST_F(PermissionsTest, TheHomeOfAPerUserInstallationIsNotOpenedInSingleUserMode)
{
    enterSingleUserMode();
    localInstall = true;

    applyPermissions(found);

    EXPECT_EQ(0700U, modeOf(home));
}

TEST_F(PermissionsTest, WhatDoesNotExistIsSkippedSilently)
{
    std::filesystem::remove_all(home + "/bin");
    std::filesystem::remove_all(home + "/config/xss");
    std::filesystem::remove_all("/etc/zor");

    applyPermissions(found);

    EXPECT_EQ("", log.text());
    EXPECT_EQ(0750U, modeOf(home + "/_uninst"));
}

TEST_F(PermissionsTest, AModeThatCannotBeSetIsLoggedAndTheWalkGoesOn)
{
    std::filesystem::remove_all(home);
    makeDirectories(home + "/config");
    makeDirectories(home + "/logs");
    found.homeExists = false;

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_chmod, EPERM);

        applyPermissions(found);

        EXPECT_EQ("Unable to change permissions to '" + home + "/' file/directory\n" +
                      "Unable to change permissions to '" + home + "/config' file/directory\n" +
                      "Unable to change permissions to '" + home + "/logs' file/directory\n" +
                      "Unable to change permissions to '/etc/zor/' file/directory\n"
                      "Unable to change permissions to '/etc/zor/zor.ini' file/directory\n",
                  log.text());
    }));
}

TEST_F(PermissionsTest, TheProcessUmaskIsRestored)
{
    globalFilesUmask = 022;

    applyPermissions(found);

    EXPECT_EQ(077U, umask(022));
}

TEST_F(PermissionsTest, TheScannerCacheOfAnUpgradeIsNotDeletedHere)
{
    found.upgradeNeeded = true;

    applyPermissions(found);

    EXPECT_TRUE(pathExists(home + "/cache_data/file"));
}

} // namespace
