#include "commands.h"
#include "installer_fixtures.h"
#include "interruption.h"
#include "process_limits.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <iostream>

namespace {

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

TEST_F(RunCommandTest, ATabInThePathOfAProgramIsNotABlank)
{
    const std::string program = plantProgram("two\twords");

    EXPECT_NE(0, runCommand(program, "/usr/bin", ""));

    EXPECT_EQ(0U, log.text().find("Exec '" + program + " >/dev/null 2>&1' returned "));
}

TEST_F(RunCommandTest, PassesArgumentsUnchanged)
{
    const std::string program = plantProgram("program");

    EXPECT_EQ(0, runCommand(program, "/usr/bin", "a b \"c d\" 'e'"));

    EXPECT_EQ("[a][b][c d][e]", readFile(dir / "arguments"));
}

TEST_F(RunCommandTest, ReturnsAndLogsTheRawStatus)
{
    plantScript(dir / "failing", "exit 3\n");

    EXPECT_EQ(3 << 8, runCommand(dir / "failing", "/usr/bin", ""));
    EXPECT_EQ("Exec '" + dir / "failing" + " >/dev/null 2>&1' returned 768\n", log.text());
}

TEST_F(RunCommandTest, AMissingProgramReturnsTheStatusOfTheShell)
{
    EXPECT_EQ(127 << 8, runCommand(dir / "missing", "/usr/bin", ""));
}

TEST_F(RunCommandTest, ACommandThatTheKeyboardKillsIsASignalToTheRun)
{
    EXPECT_TRUE(passesInChild([] {
        const ScopedInterruptible interruptible;
        EXPECT_EQ(0, runCommand("true", "", ""));
        EXPECT_FALSE(isInterrupted());

        EXPECT_EQ(130 * 256, runCommand("exit", "", "130"));
        EXPECT_TRUE(isInterrupted());
    }));
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

TEST_F(RunCommandTest, TheOutputAppearsBetweenTheLinesBeforeAndAfterIt)
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

using LibraryPathTest = InstallerTest;

TEST_F(LibraryPathTest, IsExactlyTheBinDirectoryWhenItWasNotSet)
{
    setLibraryPath("/opt/corvan/zor");

    EXPECT_EQ("/opt/corvan/zor/bin", libraryPathNow());
    EXPECT_EQ("", log.text());
}

TEST_F(LibraryPathTest, KeepsTheOldDirectoriesAfterIt)
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

} // namespace
