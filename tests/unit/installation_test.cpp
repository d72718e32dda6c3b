#include "installation.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "registry.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace {

const std::string Home = "/opt/corvan/zor";
const std::string Index = "/opt/corvan/zor/ZOR_files";

class InstallationTest : public MachineTest {
protected:
    InstallationTest()
    {
        request.version = {9, 2, 30, 0, 0};
        request.buildDate = "22/12/02";
        request.exploiters = "XYZ";
        request.homeDirectory = Home;
        request.configRootDirectory = Home;
        installed = request;
        installed.exploiters = "ABC:";
        installed.version = {9, 0, 0, 0, 0};
    }

    int run(bool upgrade)
    {
        usePackage(dir / "package.spb", toolkit);
        return installWithTransaction(upgrade, transaction, installed, request, Index, true, false,
                                      "");
    }

    /// The end of the log, as many characters as `text` has.
    [[nodiscard]] std::string endOfLog(const std::string& text) const
    {
        const std::string all = log.text();
        return all.size() < text.size() ? all : all.substr(all.size() - text.size());
    }

    /// An installation that an upgrade finds.
    void plantInstallation()
    {
        plantScanners(Home, dir / "calls");
        makeDirectories(Home + "/config");
        writeFile(Home + "/config/Zor.properties", "");
        makeDirectories("/etc/zor");
        writeFile("/etc/zor/zor.ini", "old registry\n");
    }

    InstallRegistry installed;
    InstallRegistry request;
    PackageFiles toolkit = toolkitFiles(dir / "calls");
};

TEST_F(InstallationTest, AFreshInstallationUsesTheRequestAndIsCommitted)
{
    EXPECT_EQ(0, run(false));

    EXPECT_NE(std::string::npos, readFile("/etc/zor/zor.ini").find("ZOR_Exploiters = XYZ:\n"));
    const std::string last = "Installation successful, committing changes\n";
    EXPECT_EQ(last, endOfLog(last));
    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_FALSE(pathExists(Home + "/config/xss/schema.xss.bak"));
}

TEST_F(InstallationTest, AnUpgradeChangesTheRegisteredInstallationAndIsCommitted)
{
    plantInstallation();

    EXPECT_EQ(0, run(true));

    EXPECT_NE(std::string::npos, readFile("/etc/zor/zor.ini").find("ZOR_Exploiters = ABC:XYZ:\n"));
    const std::string last = "Installation successful, committing changes\n";
    EXPECT_EQ(last, endOfLog(last));
    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_FALSE(pathExists("/etc/zor/zor.ini.bak"));
    EXPECT_FALSE(pathExists(Home + "/bin/trawlcfg.bak"));
}

TEST_F(InstallationTest, TheFlagDisablesTheScannersDuringAnUpgrade)
{
    plantInstallation();

    EXPECT_EQ(0, run(true));

    EXPECT_NE(std::string::npos, readFile(dir / "calls").find("trawlcfg [-disable] [all]\n"));
}

TEST_F(InstallationTest, WithoutTheFlagNothingIsDisabledAndNoRegistryIsWritten)
{
    usePackage(dir / "package.spb", toolkit);
    plantScanners(Home, dir / "calls");
    makeDirectories(Home + "/config");
    writeFile(Home + "/config/Zor.properties", "");
    localInstall = true;
    makeDirectories("/root/.zor");

    EXPECT_EQ(
        0, installWithTransaction(true, transaction, installed, request, Index, false, false, ""));
    EXPECT_EQ(std::string::npos, readFile(dir / "calls").find("-disable"));
    EXPECT_EQ(0, std::remove("/root/.zor/zor.ini"));
    EXPECT_EQ(
        0, installWithTransaction(false, transaction, installed, request, Index, false, false, ""));

    EXPECT_FALSE(pathExists("/root/.zor/zor.ini"));
}

TEST_F(InstallationTest, AFailedFreshInstallationIsRolledBackAndReturnsItsCode)
{
    toolkit = toolkitFiles(dir / "calls", "common_trace_path");

    EXPECT_EQ(768, run(false));

    const std::string last = "Installation failed, rolling back\n";
    EXPECT_EQ(last, endOfLog(last));
    EXPECT_FALSE(pathExists("/etc/zor"));
    EXPECT_FALSE(pathExists(Home + "/bin"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(InstallationTest, AFailedUpgradeIsRolledBackAndReturnsItsCode)
{
    plantInstallation();
    toolkit = without(toolkit, "config/ZorTrace.properties");
    const std::string scanner = readFile(Home + "/bin/trawlcfg");
    contentOf(toolkit, "bin/trawlcfg") = "#!/bin/sh\nexit 0\n";

    EXPECT_EQ(2, run(true));

    const std::string last = "Installation failed, rolling back\n";
    EXPECT_EQ(last, endOfLog(last));
    EXPECT_EQ(scanner, readFile(Home + "/bin/trawlcfg"));
    EXPECT_FALSE(pathExists(Home + "/bin/trawlcfg.bak"));
    EXPECT_EQ("old registry\n", readFile("/etc/zor/zor.ini"));
}

TEST_F(InstallationTest, NoRollbackLeavesEverythingAsItIs)
{
    norollback = true;
    plantInstallation();
    toolkit = without(toolkit, "config/ZorTrace.properties");

    EXPECT_EQ(2, run(true));

    const std::string last = "Installation failed\n";
    EXPECT_EQ(last, endOfLog(last));
    EXPECT_TRUE(pathExists(Home + "/bin/trawlcfg.bak"));
    EXPECT_TRUE(pathExists(Home + "/bin/trawlhw"));
    EXPECT_FALSE(transaction.journal.empty());
}

TEST_F(InstallationTest, NoRollbackStillCommitsASuccess)
{
    norollback = true;

    EXPECT_EQ(0, run(false));

    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_FALSE(pathExists(Home + "/config/xss/schema.xss.bak"));
}

TEST_F(InstallationTest, TheIndexIsReadableForEverybodyWhateverTheUmask)
{
    globalFilesUmask = 077;

    EXPECT_EQ(0, run(false));

    EXPECT_EQ(0644U, modeOf(Index));
}

TEST_F(InstallationTest, TheIndexIsReadableForEverybodyAlsoAfterAFailure)
{
    globalFilesUmask = 077;
    toolkit = toolkitFiles(dir / "calls", "common_trace_path");

    EXPECT_EQ(768, run(false));

    EXPECT_EQ(0644U, modeOf(Index));
}

TEST_F(InstallationTest, AMissingIndexIsNotAFailure)
{
    contentOf(toolkit, "bin/trawlhw") = "";

    EXPECT_EQ(1, run(false));

    EXPECT_FALSE(pathExists(Index));
    EXPECT_FALSE(pathExists("/opt/corvan"));
}

} // namespace
