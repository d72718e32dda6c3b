#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"
#include "trace_directory.h"

#include <gtest/gtest.h>

#include <cstdlib>

#include <sys/stat.h>

namespace {

/// With a path of the caller's own.
class CustomLogDirTest : public InstallerTest {
protected:
    int setUp(const std::string& path)
    {
        return setupCommonLogDir(transaction, "/opt/corvan/zor", true, path);
    }
};

using Lines = std::vector<std::string>;

TEST_F(CustomLogDirTest, IsCreatedWithItsParents)
{
    EXPECT_EQ(0, setUp(dir / "a/b/logs"));

    EXPECT_EQ(Lines({"d 0777 a", "d 0777 a/b", "d 0777 a/b/logs"}), treeOf(dir.path()));
    EXPECT_EQ("4 " + dir / "a" + "\n4 " + dir / "a/b" + "\n4 " + dir / "a/b/logs" + "\n",
              journalText(transaction));
    EXPECT_EQ("Setting logs dir='" + dir / "a/b/logs" + "'\n", log.text());
}

TEST_F(CustomLogDirTest, ThatExistsIsLeftAsItIsSilently)
{
    makeDirectories(dir / "logs");

    EXPECT_EQ(0, setUp(dir / "logs"));

    EXPECT_EQ(0755U, modeOf(dir / "logs"));
    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_EQ("", log.text());
}

TEST_F(CustomLogDirTest, IsNotMadeForAnEmptyPath)
{
    EXPECT_EQ(0, setUp(""));

    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_EQ("", log.text());
}

TEST_F(CustomLogDirTest, ThatCannotBeCreatedIsNoFailure)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(0, setUp(dir / "file/logs"));

    EXPECT_EQ("Setting logs dir='" + dir / "file/logs" + "'\n", log.text());
}

TEST_F(CustomLogDirTest, FollowsTheInstallersUmaskAndRestoresThePreviousOne)
{
    globalFilesUmask = 002;
    (void)umask(077);

    EXPECT_EQ(0, setUp(dir / "logs"));

    EXPECT_EQ(0775U, modeOf(dir / "logs"));
    EXPECT_EQ(077U, umask(022));
}

TEST_F(CustomLogDirTest, EveryNewDirectoryHasExactlyItsModeInSingleUserMode)
{
    enterSingleUserMode();
    globalFilesUmask = 077;

    EXPECT_EQ(0, setUp(dir / "a/b/logs"));

    EXPECT_EQ(Lines({"d 0755 a", "d 0755 a/b", "d 0755 a/b/logs"}), treeOf(dir.path()));
    EXPECT_EQ(3U, transaction.journal.size());
}

TEST_F(CustomLogDirTest, DirectoriesThatWereThereKeepTheirModeInSingleUserMode)
{
    enterSingleUserMode();
    makeDirectories(dir / "a");
    ASSERT_EQ(0, chmod((dir / "a").c_str(), 0700));

    EXPECT_EQ(0, setUp(dir / "a/b/logs"));

    EXPECT_EQ(Lines({"d 0700 a", "d 0755 a/b", "d 0755 a/b/logs"}), treeOf(dir.path()));
}

TEST_F(CustomLogDirTest, EntriesOfEarlierStepsDoNotCountInSingleUserMode)
{
    enterSingleUserMode();
    makeDirectories(dir / "a");
    ASSERT_EQ(0, chmod((dir / "a").c_str(), 0700));
    record(transaction, DirectoryCreated, "/of/an/earlier/step");

    EXPECT_EQ(0, setUp(dir / "a/logs"));

    EXPECT_EQ(0700U, modeOf(dir / "a"));
}

TEST_F(CustomLogDirTest, AFinalSlashTakesOneOfTheModesInSingleUserMode)
{
    enterSingleUserMode();
    globalFilesUmask = 077;

    EXPECT_EQ(0, setUp(dir / "a/logs/"));

    EXPECT_EQ(Lines({"d 0700 a", "d 0755 a/logs"}), treeOf(dir.path()));
}

TEST_F(CustomLogDirTest, OutsideOfSingleUserModeTheUmaskDecides)
{
    globalFilesUmask = 027;

    EXPECT_EQ(0, setUp(dir / "logs"));

    EXPECT_EQ(0750U, modeOf(dir / "logs"));
}

/// In the common directory.
class CommonLogDirTest : public MachineTest {
protected:
    int setUp() { return setupCommonLogDir(transaction, "/opt/corvan/zor", false, "/unused"); }

    void nameCommonDirectory(const std::string& path)
    {
        makeDirectories("/etc/kel/corvan/common/cfg");
        writeFile("/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir=" + path + "\n");
    }
};

TEST_F(CommonLogDirTest, IsCreatedWithTheSettingAndTheCommonDirectory)
{
    (void)umask(077);

    EXPECT_EQ(0, setUp());

    EXPECT_EQ("corvan_common_dir=/usr/kel/corvan/common\n",
              readFile("/etc/kel/corvan/common/cfg/log.properties"));
    EXPECT_EQ(Lines({"d 0777 corvan", "d 0777 corvan/common", "d 0777 corvan/common/ZOR",
                     "d 0777 corvan/common/ZOR/logs"}),
              treeOf("/usr/kel"));
    EXPECT_EQ("Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n"
              "Setting logs dir='/usr/kel/corvan/common/ZOR/logs'\n",
              log.text());
}

TEST_F(CommonLogDirTest, IsUndoneByARollbackButTheSettingStays)
{
    ASSERT_EQ(0, setUp());

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_TRUE(pathExists("/etc/kel/corvan/common/cfg/log.properties"));
}

TEST_F(CommonLogDirTest, IsWhereTheSettingSays)
{
    nameCommonDirectory(dir / "common");

    EXPECT_EQ(0, setUp());

    EXPECT_EQ(Lines({"d 0777 common", "d 0777 common/ZOR", "d 0777 common/ZOR/logs"}),
              treeOf(dir.path()));
    EXPECT_FALSE(pathExists("/usr/kel"));
}

TEST_F(CommonLogDirTest, ThatExistsIsNotMentioned)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");

    EXPECT_EQ(0, setUp());

    EXPECT_EQ("Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n", log.text());
    EXPECT_EQ(0755U, modeOf("/usr/kel/corvan/common/ZOR/logs"));
}

TEST_F(CommonLogDirTest, ACommonDirectoryThatCannotBeCreatedIsOnlyLogged)
{
    writeFile(dir / "file", "");
    nameCommonDirectory(dir / "file/common");

    EXPECT_EQ(0, setUp());

    EXPECT_EQ("Created Corvan Common Dir='" + dir / "file/common" +
                  "' result=11\nSetting logs dir='" + dir / "file/common/ZOR/logs" + "'\n",
              log.text());
}

TEST_F(CommonLogDirTest, InSingleUserModeTheNewLogDirectoriesHave0755)
{
    enterSingleUserMode();
    makeDirectories("/usr/kel/corvan/common");
    ASSERT_EQ(0, chmod("/usr/kel/corvan/common", 0700));
    globalFilesUmask = 077;

    EXPECT_EQ(0, setUp());

    EXPECT_EQ(Lines({"d 0755 corvan", "d 0700 corvan/common", "d 0755 corvan/common/ZOR",
                     "d 0755 corvan/common/ZOR/logs"}),
              treeOf("/usr/kel"));
}

TEST_F(CommonLogDirTest, InSingleUserModeANewCommonDirectoryHas0755AsWell)
{
    enterSingleUserMode();

    EXPECT_EQ(0, setUp());

    EXPECT_EQ(Lines({"d 0755 corvan", "d 0755 corvan/common", "d 0755 corvan/common/ZOR",
                     "d 0755 corvan/common/ZOR/logs"}),
              treeOf("/usr/kel"));
}

class TracePathTest : public MachineTest {
protected:
    void SetUp() override
    {
        MachineTest::SetUp();
        useCompleteLayoutNames();
        plantScanners(home, calls);
    }

    const std::string home = dir / "zor";
    const std::string calls = dir / "calls";
};

TEST_F(TracePathTest, IsTheLogDirectoryInTheCommonOne)
{
    EXPECT_EQ(0, updateCommonTracePath(transaction, home, false, "/unused"));

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [/usr/kel/corvan/common/ZOR/logs]\n",
              readFile(calls));
    EXPECT_TRUE(pathExists("/usr/kel/corvan/common/ZOR/logs"));
    EXPECT_TRUE(pathExists("/etc/kel/corvan/common/cfg/log.properties"));
}

TEST_F(TracePathTest, ALogShowsTheCommonDirectoryAndThenTheWholePath)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");

    EXPECT_EQ(0, updateCommonTracePath(transaction, home, false, "/unused"));

    EXPECT_EQ("Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n"
              "Updating common trace path='/usr/kel/corvan/common' result=0\n"
              "Exec '" +
                  home +
                  "/bin/trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs "
                  ">/dev/null 2>&1' returned 0\n"
                  "Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=0\n",
              log.text());
}

TEST_F(TracePathTest, ACustomPathIsTakenAndShownAsItIs)
{
    EXPECT_EQ(0, updateCommonTracePath(transaction, home, true, dir / "traces"));

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [" + dir / "traces" + "]\n", readFile(calls));
    EXPECT_EQ("Setting logs dir='" + dir / "traces" + "'\nUpdating common trace path='" +
                  dir / "traces" + "' result=0\nExec '" + home +
                  "/bin/trawlcfg -s common_trace_path " + dir / "traces" +
                  " >/dev/null 2>&1' returned 0\nSetting common trace path='" + dir / "traces" +
                  "' result=0\n",
              log.text());
}

TEST_F(TracePathTest, ACustomPathLeavesTheCommonDirectoryAlone)
{
    EXPECT_EQ(0, updateCommonTracePath(transaction, home, true, dir / "traces"));

    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_FALSE(pathExists("/usr/kel"));
}

TEST_F(TracePathTest, APathWithABlankIsQuoted)
{
    EXPECT_EQ(0, updateCommonTracePath(transaction, home, true, dir / "my traces"));

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [" + dir / "my traces" + "]\n", readFile(calls));
    EXPECT_NE(std::string::npos, log.text().find("-s common_trace_path \"" + dir / "my traces" +
                                                 "\" >/dev/null 2>&1' returned 0\n"));
}

TEST_F(TracePathTest, TheStatusOfTheControlProgramIsTheResult)
{
    plantScanners(home, calls, "common_trace_path");

    EXPECT_EQ(768, updateCommonTracePath(transaction, home, true, dir / "traces"));

    EXPECT_NE(std::string::npos,
              log.text().find("Setting common trace path='" + dir / "traces" + "' result=768\n"));
}

TEST_F(TracePathTest, TheControlProgramFindsItsLibraries)
{
    EXPECT_EQ(0, updateCommonTracePath(transaction, home, true, dir / "traces"));

    EXPECT_EQ(home + "/bin", std::getenv("LD_LIBRARY_PATH"));
}

TEST_F(TracePathTest, ASignalLeavesTheTracePathUnchanged)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt update("Updating common trace path");
        EXPECT_EQ(14, updateCommonTracePath(transaction, home, true, dir / "traces"));
    }));

    EXPECT_FALSE(pathExists(calls));
}

} // namespace
