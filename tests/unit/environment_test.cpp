#include "environment.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <iostream>

#include <sys/stat.h>
#include <sys/wait.h>

namespace {

/// A shell script at `path`.
void plantScript(const std::string& path, const std::string& commands)
{
    writeFile(path, "#!/bin/sh\n" + commands);
    ASSERT_EQ(0, chmod(path.c_str(), 0755));
}

std::string libraryPathNow()
{
    const char* const value = std::getenv("LD_LIBRARY_PATH");
    return value == nullptr ? "(unset)" : value;
}

class RunCommandTest : public InstallerTest {
protected:
    /// A program that writes its arguments, each in brackets, to the file "arguments".
    std::string plantProgram(const std::string& name)
    {
        plantScript(dir / name, "for a in \"$@\"; do printf '[%s]' \"$a\"; done >\"" +
                                    dir / "arguments" + "\"\n");
        return dir / name;
    }
};

TEST_F(RunCommandTest, RunsTheProgramAndLogsTheCommandWithItsStatus)
{
    const std::string program = plantProgram("program");

    EXPECT_EQ(0, runCommand(program, "/usr/bin", "-enable all"));

    EXPECT_EQ("[-enable][all]", readFile(dir / "arguments"));
    EXPECT_EQ("Exec '" + program + " -enable all >/dev/null 2>&1' returned 0\n", log.text());
}

TEST_F(RunCommandTest, WithoutArgumentsNoBlankFollowsTheProgram)
{
    const std::string program = plantProgram("program");

    EXPECT_EQ(0, runCommand(program, "/usr/bin", ""));

    EXPECT_EQ("", readFile(dir / "arguments"));
    EXPECT_EQ("Exec '" + program + " >/dev/null 2>&1' returned 0\n", log.text());
}

TEST_F(RunCommandTest, QuotesAProgramWithABlankInItsPath)
{
    const std::string program = plantProgram("two words");

    EXPECT_EQ(0, runCommand(program, "/usr/bin", "-shutdown"));

    EXPECT_EQ("[-shutdown]", readFile(dir / "arguments"));
    EXPECT_EQ("Exec '\"" + program + "\" -shutdown >/dev/null 2>&1' returned 0\n", log.text());
}

TEST_F(RunCommandTest, ATabInThePathOfAProgramIsNoBlank)
{
    const std::string program = plantProgram("two\twords");

    EXPECT_NE(0, runCommand(program, "/usr/bin", ""));

    EXPECT_EQ(0U, log.text().find("Exec '" + program + " >/dev/null 2>&1' returned "));
}

TEST_F(RunCommandTest, PassesArgumentsAsTheyStand)
{
    const std::string program = plantProgram("program");

    EXPECT_EQ(0, runCommand(program, "/usr/bin", "a b \"c d\" 'e'"));

    EXPECT_EQ("[a][b][c d][e]", readFile(dir / "arguments"));
}

TEST_F(RunCommandTest, GivesTheStatusAsTheSystemDoes)
{
    plantScript(dir / "failing", "exit 3\n");

    EXPECT_EQ(3 << 8, runCommand(dir / "failing", "/usr/bin", ""));

    EXPECT_EQ("Exec '" + dir / "failing" + " >/dev/null 2>&1' returned 768\n", log.text());
}

TEST_F(RunCommandTest, AMissingProgramIsTheStatusOfTheShell)
{
    EXPECT_EQ(127 << 8, runCommand(dir / "missing", "/usr/bin", ""));
}

TEST_F(RunCommandTest, TheDirectoryIsNotUsed)
{
    plantScript(dir / "program", "pwd >\"" + dir / "directory" + "\"\n");
    plantScript(dir / "reference", "pwd >\"" + dir / "reference directory" + "\"\n");

    EXPECT_EQ(0, runCommand(dir / "program", "/nonexistent", ""));
    EXPECT_EQ(0, std::system((dir / "reference").c_str()));

    EXPECT_EQ(readFile(dir / "reference directory"), readFile(dir / "directory"));
}

TEST_F(RunCommandTest, TheOutputOfTheProgramIsNotShown)
{
    plantScript(dir / "loud", "echo output; echo error >&2\n");
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();

    EXPECT_EQ(0, runCommand(dir / "loud", "/usr/bin", ""));

    EXPECT_EQ("", testing::internal::GetCapturedStdout());
    EXPECT_EQ("", testing::internal::GetCapturedStderr());
}

TEST_F(RunCommandTest, InDebugModeTheOutputIsShownAndTheLogHasNoRedirection)
{
    debugMode = true;
    plantScript(dir / "loud", "echo output; echo error >&2\n");
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();

    EXPECT_EQ(0, runCommand(dir / "loud", "/usr/bin", "-x"));

    EXPECT_EQ("output\n", testing::internal::GetCapturedStdout());
    EXPECT_EQ("error\n", testing::internal::GetCapturedStderr());
    EXPECT_EQ("Exec '" + dir / "loud" + " -x' returned 0\n", log.text());
}

TEST_F(RunCommandTest, TheOutputStandsBetweenTheLinesBeforeAndAfterIt)
{
    debugMode = true;
    logstream = &std::cout;
    plantScript(dir / "loud", "echo output\n");
    testing::internal::CaptureStdout();

    *logstream << "before\n";
    EXPECT_EQ(0, runCommand(dir / "loud", "/usr/bin", ""));

    EXPECT_EQ("before\noutput\nExec '" + dir / "loud" + "' returned 0\n",
              testing::internal::GetCapturedStdout());
}

using SubdirTest = InstallerTest;

TEST_F(SubdirTest, IsCreatedWithWhatIsMissingAboveIt)
{
    EXPECT_EQ(0, makeSubdir(transaction, dir / "zor/bin", "etc", 0750));

    const std::vector<std::string> expected = {"d 0750 zor", "d 0750 zor/bin",
                                               "d 0750 zor/bin/etc"};
    EXPECT_EQ(expected, treeOf(dir.path()));
    EXPECT_EQ("4 " + dir / "zor" + "\n4 " + dir / "zor/bin" + "\n4 " + dir / "zor/bin/etc" + "\n",
              journalText(transaction));
    EXPECT_EQ("", log.text());
}

TEST_F(SubdirTest, ThatExistsIsLeftAsItIs)
{
    makeDirectories(dir / "etc");

    EXPECT_EQ(0, makeSubdir(transaction, dir.path(), "etc", 0700));

    EXPECT_EQ(0755U, modeOf(dir / "etc"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(SubdirTest, ThatCannotBeCreatedIsCode11AndIsLogged)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(11, makeSubdir(transaction, dir / "file", "etc", 0755));

    EXPECT_EQ("Error creating dir etc in " + dir / "file" +
                  " result=11 (Cannot create directory)\n",
              log.text());
}

using InstallDirTest = InstallerTest;

TEST_F(InstallDirTest, IsCreatedWithMode0750UnderTheInstallersUmask)
{
    (void)umask(077);

    EXPECT_EQ(0, createInstallDir(transaction, dir.path()));

    EXPECT_EQ(0750U, modeOf(dir / "install"));
    EXPECT_EQ("4 " + dir / "install" + "\n", journalText(transaction));
}

TEST_F(InstallDirTest, FollowsTheInstallersUmaskAndRestoresThePreviousOne)
{
    globalFilesUmask = 0027;
    (void)umask(003);

    EXPECT_EQ(0, createInstallDir(transaction, dir.path()));

    EXPECT_EQ(0750U, modeOf(dir / "install"));
    EXPECT_EQ(003U, umask(022));
}

TEST_F(InstallDirTest, ThatCannotBeCreatedIsMinus1)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(-1, createInstallDir(transaction, dir / "file"));

    EXPECT_EQ("Error creating dir install in " + dir / "file" +
                  " result=11 (Cannot create directory)\n",
              log.text());
}

class SelinuxTest : public MachineTest {
protected:
    /// Stand-ins for the SELinux tools, which write their arguments to "probe" and "label".
    void plantTools(int probeStatus, int labelStatus)
    {
        plantScript("/usr/sbin/selinuxenabled",
                    "echo \"$*\" >" + dir / "probe" + "; exit " + std::to_string(probeStatus));
        plantScript(dir / "chcon",
                    "echo \"$*\" >" + dir / "label" + "; exit " + std::to_string(labelStatus));
        chcon_.emplace(dir / "chcon", "/usr/bin/chcon");
    }

private:
    std::optional<FileInPlace> chcon_;
};

TEST_F(SelinuxTest, AMachineWithoutTheProbeGetsNoLabel)
{
    EXPECT_EQ(127 << 8, setSelinuxContext(dir.path()));

    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512\n"
              "SELinux not enabled or not supported\n",
              log.text());
}

TEST_F(SelinuxTest, AMachineWhereItIsNotEnabledGetsNoLabel)
{
    plantTools(1, 0);

    EXPECT_EQ(1 << 8, setSelinuxContext(dir.path()));

    EXPECT_FALSE(pathExists(dir / "label"));
    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 256\n"
              "SELinux not enabled or not supported\n",
              log.text());
}

TEST_F(SelinuxTest, TheBinariesAreLabelledWhereItIsEnabled)
{
    plantTools(0, 0);

    EXPECT_EQ(0, setSelinuxContext("/opt/corvan/zor"));

    EXPECT_EQ("\n", readFile(dir / "probe"));
    EXPECT_EQ("-R -t texrel_shlib_t /opt/corvan/zor/bin\n", readFile(dir / "label"));
    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 0\n"
              "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin >/dev/null 2>&1' "
              "returned 0\n",
              log.text());
}

TEST_F(SelinuxTest, TheStatusIsThatOfTheLabelling)
{
    plantTools(0, 2);

    EXPECT_EQ(2 << 8, setSelinuxContext("/opt/corvan/zor"));
}

using LibraryPathTest = InstallerTest;

TEST_F(LibraryPathTest, IsExactlyTheBinDirectoryWhenItWasNotSet)
{
    setLibraryPath("/opt/corvan/zor");

    EXPECT_EQ("/opt/corvan/zor/bin", libraryPathNow());
    EXPECT_EQ("", log.text());
}

TEST_F(LibraryPathTest, KeepsTheOldDirectoriesBehind)
{
    (void)setenv("LD_LIBRARY_PATH", "/a:/b", 1);

    setLibraryPath("/opt/corvan/zor/");

    EXPECT_EQ("/opt/corvan/zor/bin:/a:/b", libraryPathNow());
}

TEST_F(LibraryPathTest, AnEmptyOldValueLeavesItsColon)
{
    (void)setenv("LD_LIBRARY_PATH", "", 1);

    setLibraryPath("/opt/corvan/zor");

    EXPECT_EQ("/opt/corvan/zor/bin:", libraryPathNow());
}

TEST_F(LibraryPathTest, GetsTheDirectoryTwiceFromTwoCalls)
{
    setLibraryPath("/opt/corvan/zor");
    setLibraryPath("/opt/corvan/zor");

    EXPECT_EQ("/opt/corvan/zor/bin:/opt/corvan/zor/bin", libraryPathNow());
}

TEST_F(LibraryPathTest, IsLoggedInDebugModeWithItsName)
{
    debugMode = true;
    (void)setenv("LD_LIBRARY_PATH", "/a", 1);

    setLibraryPath("/opt/corvan/zor");

    EXPECT_EQ("Setting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin:/a'\n",
              log.text());
}

TEST_F(LibraryPathTest, ReachesTheCommandsThatAreRun)
{
    plantScript(dir / "program", "echo \"$LD_LIBRARY_PATH\" >" + dir / "seen" + "\n");

    setLibraryPath("/opt/corvan/zor");
    EXPECT_EQ(0, runCommand(dir / "program", "/usr/bin", ""));

    EXPECT_EQ("/opt/corvan/zor/bin\n", readFile(dir / "seen"));
}

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

TEST_F(CustomLogDirTest, ThatExistsIsLeftAsItIsWithoutAWord)
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

TEST_F(CommonLogDirTest, LiesWhereTheSettingSays)
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

TEST_F(CommonLogDirTest, ACommonDirectoryThatCannotBeCreatedShowsInTheLogOnly)
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

    EXPECT_EQ(home + "/bin", libraryPathNow());
}

} // namespace
