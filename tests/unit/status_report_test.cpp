#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "settings.h"
#include "status_report.h"

#include <gtest/gtest.h>

#include <iostream>

namespace {

/// As the action "t" runs: the log is standard output.
class StatusReportTest : public MachineTest {
protected:
    StatusReportTest() { logstream = &std::cout; }

    static void plantRegistry(const std::string& directory, const std::string& text)
    {
        makeDirectories(directory);
        writeFile(directory + "/zor.ini", text);
    }

    static std::string report()
    {
        testing::internal::CaptureStdout();
        EXPECT_EQ(0, showStatus());
        return testing::internal::GetCapturedStdout();
    }

    static std::string block(bool local)
    {
        testing::internal::CaptureStdout();
        showInstallation(local);
        return testing::internal::GetCapturedStdout();
    }
};

TEST_F(StatusReportTest, AMachineWithoutAnyRegistryShowsTwoEmptyBlocks)
{
    EXPECT_EQ("ZOR installer version: 22/12/02zor_9.2.30.0000\n"
              "Default install type: global\n"
              "Corvan common dir = /usr/kel/corvan/common\n"
              "\n"
              "Status of shared (global) installation:\n"
              "INI file = /etc/zor/zor.ini\n"
              "Not installed\n"
              "\n"
              "Status of installation for current user:\n"
              "INI file = /root/.zor/zor.ini\n"
              "Not installed\n",
              report());
}

TEST_F(StatusReportTest, ShowsWhatIsInstalled)
{
    plantRegistry("/etc/zor", "ZOR_Version = 9.2.30.0\n"
                              "ZOR_HomeDirectory = /opt/corvan/zor\n"
                              "ZOR_Exploiters = ABC:XYZ:\n");
    plantRegistry("/root/.zor", "ZOR_Version = 9.1.2.3.4\n"
                                "ZOR_HomeDirectory = /root/corvan/zor\n"
                                "ZOR_Exploiters = ABC:\n");

    EXPECT_EQ("ZOR installer version: 22/12/02zor_9.2.30.0000\n"
              "Default install type: global\n"
              "Corvan common dir = /usr/kel/corvan/common\n"
              "\n"
              "Status of shared (global) installation:\n"
              "INI file = /etc/zor/zor.ini\n"
              "Install dir = /opt/corvan/zor\n"
              "Install version = 9.2.30.0000\n"
              "Exploiter list = ABC:XYZ:\n"
              "\n"
              "Status of installation for current user:\n"
              "INI file = /root/.zor/zor.ini\n"
              "Install dir = /root/corvan/zor\n"
              "Install version = 9.1.2.0003.4\n"
              "Exploiter list = ABC:\n",
              report());
}

TEST_F(StatusReportTest, ChangesNothingOnDisk)
{
    report();

    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_FALSE(pathExists("/etc/zor"));
    EXPECT_FALSE(pathExists("/root/.zor"));
}

TEST_F(StatusReportTest, ShowsTheCommonDirectoryOfItsSetting)
{
    makeDirectories("/etc/kel/corvan/common/cfg");
    writeFile("/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir = /common\n");

    EXPECT_NE(std::string::npos, report().find("\nCorvan common dir = /common\n"));
}

TEST_F(StatusReportTest, TheChosenInstallTypeHasNoEffect)
{
    localInstall = true;

    EXPECT_NE(std::string::npos, report().find("\nDefault install type: global\n"));
}

TEST_F(StatusReportTest, AnIncompleteRegistryIsNotInstalled)
{
    plantRegistry("/etc/zor", "ZOR_Version = 1.2\nZOR_Exploiters = ABC:\n");

    EXPECT_EQ("INI file = /etc/zor/zor.ini\nNot installed\n", block(false));
}

TEST_F(StatusReportTest, ARegistryWithABadVersionIsNotInstalled)
{
    plantRegistry("/etc/zor", "ZOR_HomeDirectory = /opt\nZOR_Exploiters = ABC:\nZOR_Version = x\n");

    EXPECT_EQ("INI file = /etc/zor/zor.ini\nNot installed\n", block(false));
}

TEST_F(StatusReportTest, AnInstallationWithoutItsFilesIsShownAnyway)
{
    plantRegistry("/root/.zor",
                  "ZOR_HomeDirectory = /nowhere\nZOR_Exploiters = ABC:\nZOR_Version = 1\n");

    EXPECT_EQ("INI file = /root/.zor/zor.ini\n"
              "Install dir = /nowhere\n"
              "Install version = 1.0.0.0000\n"
              "Exploiter list = ABC:\n",
              block(true));
}

TEST_F(StatusReportTest, AnEmptyExploiterListIsShownEmpty)
{
    plantRegistry("/etc/zor", "ZOR_HomeDirectory = /opt\nZOR_Exploiters =\nZOR_Version = 1\n");

    EXPECT_EQ("INI file = /etc/zor/zor.ini\n"
              "Install dir = /opt\n"
              "Install version = 1.0.0.0000\n"
              "Exploiter list = \n",
              block(false));
}

TEST_F(StatusReportTest, AUserWithoutAHomeSeesTheGlobalRegistryTwice)
{
    EXPECT_TRUE(passesInChild([] {
        becomeUser(4711);

        EXPECT_EQ("ZOR installer version: 22/12/02zor_9.2.30.0000\n"
                  "Default install type: local\n"
                  "Corvan common dir = /usr/kel/corvan/common\n"
                  "\n"
                  "Status of shared (global) installation:\n"
                  "INI file = /etc/zor/zor.ini\n"
                  "Not installed\n"
                  "\n"
                  "Status of installation for current user:\n"
                  "*** Error: cannot retrieve home directory for current user.\n"
                  "INI file = /etc/zor/zor.ini\n"
                  "Not installed\n",
                  report());
    }));
}

TEST_F(StatusReportTest, TheVersionAndTheInstallTypeGoToTheLog)
{
    std::ostringstream other;
    logstream = &other;

    EXPECT_EQ(0U, report().find("Corvan common dir = "));

    EXPECT_EQ("ZOR installer version: 22/12/02zor_9.2.30.0000\nDefault install type: global\n",
              other.str());
}

} // namespace
