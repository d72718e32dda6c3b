#include "installer_fixtures.h"
#include "paths.h"
#include "private_mode.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

namespace {

class PrivateModeTest : public MachineTest {
protected:
    PrivateModeTest()
    {
        commandLine.request.exploiters = "ABC";
        commandLine.privatePath = home;
        commandLine.request.version = {9, 2, 30, 0, 0};
    }

    int perform(char action, int status = -1)
    {
        usePackage(dir / "package.spb", toolkit);
        commandLine.privateAction = action;
        return performPrivateAction(commandLine, status);
    }

    [[nodiscard]] bool logHolds(const std::string& text) const
    {
        return log.text().find(text) != std::string::npos;
    }

    const std::string home = dir / "private";
    CommandLine commandLine;
    PackageFiles toolkit = toolkitFiles(dir / "calls");
};

TEST_F(PrivateModeTest, InstallsToThePrivatePathWithoutARegistry)
{
    localInstall = true;

    EXPECT_EQ(0, perform('i'));

    EXPECT_EQ("hardware scanner\n", readFile(home + "/bin/trawlhw"));
    EXPECT_EQ("ZOR_InstallType=local\n", readFile(home + "/install/zor_install.properties"));
    EXPECT_TRUE(pathExists(home + "/ZOR_files"));
    EXPECT_FALSE(pathExists("/root/.zor"));
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(PrivateModeTest, AnInstallationLogsItsSteps)
{
    localInstall = true;

    EXPECT_EQ(0, perform('i'));

    EXPECT_EQ(0U, log.text().find("Now perform privateMode\n"
                                  "Performing private installation\n"
                                  "Performing private installation to " +
                                  home + "\nPerforming fresh install on " + home +
                                  " (config=" + home + "/config)\n"));
    const std::string last = "PrivMode Action finished with RC: 0\n";
    EXPECT_EQ(log.text().size() - last.size(), log.text().rfind(last));
    EXPECT_FALSE(logHolds("committing"));
}

TEST_F(PrivateModeTest, AnInstallationKeepsNoBackups)
{
    localInstall = true;
    makeDirectories(home + "/bin");
    writeFile(home + "/bin/trawlhw", "old");

    EXPECT_EQ(0, perform('i'));

    EXPECT_EQ("hardware scanner\n", readFile(home + "/bin/trawlhw"));
    EXPECT_FALSE(pathExists(home + "/bin/trawlhw.bak"));
    EXPECT_FALSE(pathExists(home + "/config/xss/schema.xss.bak"));
}

TEST_F(PrivateModeTest, AFailedInstallationReturnsItsCodeAndIsNotRolledBack)
{
    localInstall = true;
    toolkit = without(toolkit, "config/ZorTrace.properties");

    EXPECT_EQ(2, perform('i', 0));

    EXPECT_TRUE(logHolds("PrivMode Action finished with RC: 2\n"));
    EXPECT_FALSE(logHolds("rolling back"));
    EXPECT_TRUE(pathExists(home + "/bin/trawlhw"));
}

TEST_F(PrivateModeTest, AnInstallationTakesTheCustomTracePath)
{
    localInstall = true;
    custom_log_path_available = true;
    new_log_path = dir / "traces";

    EXPECT_EQ(0, perform('i'));

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [" + dir / "traces" + "]\n",
              readFile(dir / "calls"));
}

TEST_F(PrivateModeTest, ARemovalStopsTheScannersAndDeletesThePrivatePath)
{
    plantScanners(home, dir / "calls");
    makeDirectories(home + "/of the user/deep");
    writeFile(home + "/of the user/deep/file", "");

    EXPECT_EQ(0, perform('r'));

    EXPECT_FALSE(pathExists(home));
    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              readFile(dir / "calls"));
}

TEST_F(PrivateModeTest, ARemovalLogsItsLineAfterTheDeletions)
{
    makeDirectories(home);

    EXPECT_EQ(0, perform('r'));

    EXPECT_EQ(0U, log.text().find("Now perform privateMode\nExec '" + home + "/bin/trawlfs "));
    const std::string last = "RMDIR: " + home + "\nPerforming private remove\n";
    EXPECT_EQ(log.text().size() - last.size(), log.text().rfind(last));
}

TEST_F(PrivateModeTest, ARemovalSucceedsWhateverHappened)
{
    ignoreUpdateErrors = false;

    EXPECT_EQ(0, perform('r', -1));

    EXPECT_TRUE(logHolds("Performing private remove\n"));
}

TEST_F(PrivateModeTest, ScannersThatCannotBeStoppedDoNotPreventTheRemoval)
{
    ignoreUpdateErrors = false;
    plantScanners(home, dir / "calls", "-shutdown");

    EXPECT_EQ(0, perform('r'));

    EXPECT_EQ("trawlfs [-shutdown]\n", readFile(dir / "calls"));
    EXPECT_FALSE(pathExists(home));
}

TEST_F(PrivateModeTest, AnyOtherLetterIsNotSupportedAndKeepsTheStatus)
{
    EXPECT_EQ(5, perform(' ', 5));
    EXPECT_EQ(0, perform('t', 0));

    EXPECT_EQ("Now perform privateMode\nUnsupported action for private mode\n"
              "Now perform privateMode\nUnsupported action for private mode\n",
              log.text());
}

} // namespace
