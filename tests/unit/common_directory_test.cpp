#include "common_directory.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "settings.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include <sys/stat.h>

namespace {

const std::string SettingPath = "/etc/kel/corvan/common/cfg/log.properties";

class CommonDirectoryTest : public MachineTest {
protected:
    /// The common directory that a setting file of this content names.
    static std::string directoryOf(const std::string& content)
    {
        makeDirectories("/etc/kel/corvan/common/cfg");
        writeFile(SettingPath, content);
        return readCommonDirectory(true);
    }
};

TEST_F(CommonDirectoryTest, TheKeyHasItsText)
{
    EXPECT_EQ("corvan_common_dir", KeyCorvanCommonDir);
}

TEST_F(CommonDirectoryTest, TheSettingNamesTheDirectory)
{
    EXPECT_EQ("/var/corvan", directoryOf("corvan_common_dir=/var/corvan\n"));
}

TEST_F(CommonDirectoryTest, KeyAndValueAreTrimmed)
{
    EXPECT_EQ("/var/my corvan", directoryOf(" corvan_common_dir\t=  /var/my corvan \r\n"));
}

TEST_F(CommonDirectoryTest, AValueKeepsItsEqualsSigns)
{
    EXPECT_EQ("/var/a=b", directoryOf("corvan_common_dir=/var/a=b"));
}

TEST_F(CommonDirectoryTest, TheFirstLineOfTheKeyCounts)
{
    EXPECT_EQ("/first", directoryOf("# comment\n"
                                    "corvan_common_dir\n"
                                    "corvan_common_dirs=/other\n"
                                    "Corvan_Common_Dir=/other\n"
                                    "corvan_common_dir=/first\n"
                                    "corvan_common_dir=/second\n"));
}

TEST_F(CommonDirectoryTest, AnEmptyValueIsAnEmptyDirectory)
{
    EXPECT_EQ("", directoryOf("corvan_common_dir=\n"));
}

TEST_F(CommonDirectoryTest, AValueOfBlanksIsNotTrimmed)
{
    EXPECT_EQ("  ", directoryOf("corvan_common_dir=  \n"));
}

TEST_F(CommonDirectoryTest, WithoutTheKeyTheDefaultIsUsed)
{
    EXPECT_EQ("/usr/kel/corvan/common", directoryOf("other=/x\n"));
    EXPECT_EQ("/usr/kel/corvan/common", directoryOf(""));
}

TEST_F(CommonDirectoryTest, AFileWithoutTheKeyIsNotWritten)
{
    (void)directoryOf("other=/x\n");

    EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(false));

    EXPECT_EQ("other=/x\n", readFile(SettingPath));
}

TEST_F(CommonDirectoryTest, ReadingOnlyCreatesNothing)
{
    EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(true));

    EXPECT_FALSE(std::filesystem::exists("/etc/kel"));
}

TEST_F(CommonDirectoryTest, AMissingSettingIsWrittenWithTheDefault)
{
    EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(false));

    EXPECT_EQ("corvan_common_dir=/usr/kel/corvan/common\n", readFile(SettingPath));
    EXPECT_EQ((std::vector<std::string>{"d 0775 corvan", "d 0775 corvan/common",
                                        "d 0775 corvan/common/cfg",
                                        "f 0664 corvan/common/cfg/log.properties"}),
              treeOf("/etc/kel"));
    EXPECT_EQ(0775U, modeOf("/etc/kel"));
}

TEST_F(CommonDirectoryTest, TheDirectoryItselfIsNotCreated)
{
    (void)readCommonDirectory(false);

    EXPECT_FALSE(std::filesystem::exists("/usr/kel"));
}

TEST_F(CommonDirectoryTest, TheUmaskOfTheInstallationGovernsTheDirectoriesOnly)
{
    globalFilesUmask = 022;

    (void)readCommonDirectory(false);

    EXPECT_EQ((std::vector<std::string>{"d 0755 corvan", "d 0755 corvan/common",
                                        "d 0755 corvan/common/cfg",
                                        "f 0664 corvan/common/cfg/log.properties"}),
              treeOf("/etc/kel"));
}

TEST_F(CommonDirectoryTest, TheUmaskOfTheProcessIsRestored)
{
    (void)readCommonDirectory(false);

    const mode_t after = umask(022);
    EXPECT_EQ(022U, after);
}

TEST_F(CommonDirectoryTest, ExistingDirectoriesKeepTheirModes)
{
    makeDirectories("/etc/kel/corvan");
    ASSERT_EQ(0, chmod("/etc/kel/corvan", 0700));

    (void)readCommonDirectory(false);

    EXPECT_EQ(0700U, modeOf("/etc/kel/corvan"));
    EXPECT_EQ("corvan_common_dir=/usr/kel/corvan/common\n", readFile(SettingPath));
}

TEST_F(CommonDirectoryTest, ASettingThatMayNotBeReadIsLeftAlone)
{
    (void)directoryOf("corvan_common_dir=/var/corvan\n");
    ASSERT_EQ(0, chmod(SettingPath.c_str(), 0200));
    {
        const OrdinaryRights ordinary;
        EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(true));
        EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(false));
    }
    EXPECT_EQ("corvan_common_dir=/var/corvan\n", readFile(SettingPath));
    EXPECT_EQ(0200U, modeOf(SettingPath));
}

TEST_F(CommonDirectoryTest, ADirectoryInPlaceOfTheSettingNamesNone)
{
    makeDirectories(SettingPath);

    EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(false));
}

TEST_F(CommonDirectoryTest, WhatCannotBeCreatedIsNotReported)
{
    writeFile("/etc/kel", "a file in the way");

    EXPECT_EQ("/usr/kel/corvan/common", readCommonDirectory(false));

    EXPECT_EQ("a file in the way", readFile("/etc/kel"));
    EXPECT_EQ("", log.text());
}

} // namespace
