#include "installer_fixtures.h"
#include "process_limits.h"
#include "scoped.h"
#include "settings.h"
#include "single_user_mode.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <sys/stat.h>

namespace {

using Tree = std::vector<std::string>;

class SingleUserFlagTest : public InstallerTest {
protected:
    SingleUserFlagTest() { makeDirectories(dir / "home/config"); }

    std::string home = dir / "home";
    std::string flag = dir / "home/config/SingleUserMode";
    std::string index = dir / "ZOR_files";
};

TEST_F(SingleUserFlagTest, IsAFileOfTheConfiguration)
{
    EXPECT_EQ("/opt/corvan/zor/config/SingleUserMode", singleUserFlagPath("/opt/corvan/zor"));
}

TEST_F(SingleUserFlagTest, AFlagTurnsSingleUserModeOn)
{
    writeFile(flag, "");

    detectSingleUserMode(home);

    EXPECT_EQ("Single user mode file found\n", log.text());
    EXPECT_EQ(022U, globalFilesUmask);
    EXPECT_EQ(0755U, LogDirMode);
    EXPECT_EQ(0755U, CommonLogDirMode);
    EXPECT_EQ(0755U, CacheDirRootMode);
    EXPECT_EQ(0755U, EtcDirMode);
    EXPECT_TRUE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, TheContentOfAFlagDoesNotMatter)
{
    writeFile(flag, "no");

    detectSingleUserMode(home);

    EXPECT_TRUE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, DetectionDoesNotAskForAFlag)
{
    writeFile(flag, "");

    detectSingleUserMode(home);

    EXPECT_FALSE(createSingleUserModeFile);
}

TEST_F(SingleUserFlagTest, WithoutAFlagNothingChanges)
{
    writeFile(home + "/SingleUserMode", "in the wrong directory");

    detectSingleUserMode(home);

    EXPECT_EQ("", log.text());
    EXPECT_EQ(0U, globalFilesUmask);
    EXPECT_EQ(0777U, LogDirMode);
    EXPECT_EQ(0777U, CommonLogDirMode);
    EXPECT_EQ(0777U, CacheDirRootMode);
    EXPECT_EQ(0777U, EtcDirMode);
    EXPECT_FALSE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, AFlagThatMayNotBeReadCountsAsNone)
{
    writeFile(flag, "");
    ASSERT_EQ(0, chmod(flag.c_str(), 0));
    const OrdinaryRights ordinary;

    detectSingleUserMode(home);

    EXPECT_FALSE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, TheFlagIsAnEmptyFile)
{
    writeFile(flag, "of before");

    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ("", readFile(flag));
    EXPECT_EQ("Creating single user mode flag file: " + flag + "\n", log.text());
}

TEST_F(SingleUserFlagTest, TheFlagIsMadeUnderTheUmaskOfTheInstallation)
{
    const ScopedUmask strict(077);
    globalFilesUmask = 022;

    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ(0644U, modeOf(flag));
    EXPECT_EQ(077U, umask(077));
}

TEST_F(SingleUserFlagTest, TheFlagIsNotJournalled)
{
    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ("", journalText(transaction));
}

TEST_F(SingleUserFlagTest, TheFlagIsAppendedToTheIndex)
{
    writeFile(index, "# header\n/z\n");

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("# header\n/z\n" + flag + "\n", readFile(index));
}

TEST_F(SingleUserFlagTest, AMissingIndexIsMadeWithItsDirectories)
{
    index = dir / "etc/zor/ZOR_files";
    globalFilesUmask = 022;

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ(flag + "\n", readFile(index));
    EXPECT_EQ((Tree{"d 0755 zor", "f 0644 zor/ZOR_files"}), treeOf(dir / "etc"));
    EXPECT_EQ("4 " + (dir / "etc") + "\n4 " + (dir / "etc/zor") + "\n", journalText(transaction));
}

TEST_F(SingleUserFlagTest, AnIndexThatCannotBeOpenedIsSkippedSilently)
{
    index = dir / "home"; // a directory

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("", readFile(flag));
    EXPECT_EQ("Creating single user mode flag file: " + flag + "\n", log.text());
}

TEST_F(SingleUserFlagTest, AFlagThatCannotBeMadeIsLoggedAndNotListed)
{
    home = dir / "nowhere";
    writeFile(index, "/z\n");

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("Creating single user mode flag file: " + home + "/config/SingleUserMode\n" +
                  "Unable to create single user mode flag file\n",
              log.text());
    EXPECT_EQ("/z\n", readFile(index));
}

} // namespace
