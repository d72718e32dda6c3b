#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

namespace {

class ScannerControlTest : public InstallerTest {
protected:
    ScannerControlTest() { useCompleteLayoutNames(); }

    /// The calls of the scanner programs so far.
    [[nodiscard]] std::string calls() const
    {
        return pathExists(commandLog) ? readFile(commandLog) : "";
    }

    const std::string home = dir / "zor";
    const std::string commandLog = dir / "calls";
};

TEST_F(ScannerControlTest, OnlyStatus0IsAcceptable)
{
    EXPECT_TRUE(isAcceptable(0));
    EXPECT_FALSE(isAcceptable(1));
    EXPECT_FALSE(isAcceptable(256));
    EXPECT_FALSE(isAcceptable(-1));
}

TEST_F(ScannerControlTest, EveryStatusIsAcceptableWhenNonFatalErrorsAreTolerated)
{
    ignoreNonFatalErrors = true;

    EXPECT_TRUE(isAcceptable(0));
    EXPECT_TRUE(isAcceptable(256));
    EXPECT_TRUE(isAcceptable(-1));
}

TEST_F(ScannerControlTest, StopsInFourStepsTheForcedShutdownFirst)
{
    plantScanners(home, commandLog);

    EXPECT_EQ(0, stopScanners(home, true, true));

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, LogsEachCommandWithItsStatus)
{
    plantScanners(home, commandLog, "-disable");

    EXPECT_EQ(0, stopScanners(home, true, true));

    const std::string bin = home + "/bin/";
    EXPECT_EQ("Exec '" + bin + "trawlfs -shutdown >/dev/null 2>&1' returned 0\n" + //
                  "Exec '" + bin + "trawlcfg -disable all >/dev/null 2>&1' returned 768\n" +
                  "Exec '" + bin + "trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1'" +
                  " returned 0\n" + //
                  "Exec '" + bin +
                  "trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' returned 0\n",
              log.text());
}

TEST_F(ScannerControlTest, LeavesTheFileScannersServiceAloneUnlessAsked)
{
    plantScanners(home, commandLog);

    EXPECT_EQ(0, stopScanners(home, true, false));

    EXPECT_EQ("trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, DoesNotDisableTheScannersUnlessAsked)
{
    plantScanners(home, commandLog);

    EXPECT_EQ(0, stopScanners(home, false, true));

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, SkippedStepsCountAsSuccesses)
{
    ignoreUpdateErrors = false;
    plantScanners(home, commandLog, "-disable");

    EXPECT_EQ(0, stopScanners(home, false, false));

    EXPECT_EQ("trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, StoppingSucceedsByDefaultWithoutAnyControlProgram)
{
    EXPECT_EQ(0, stopScanners(home, true, true));
}

TEST_F(ScannerControlTest, StatusesAreIgnoredByDefault)
{
    plantScanners(home, commandLog, "-");

    EXPECT_EQ(0, stopScanners(home, true, true));

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, AFailingStepEndsTheStopWith7WhenUpdateErrorsCount)
{
    ignoreUpdateErrors = false;
    plantScanners(home, commandLog, "-disable all");

    EXPECT_EQ(7, stopScanners(home, true, true));

    EXPECT_EQ("trawlfs [-shutdown]\ntrawlcfg [-disable] [all]\n", calls());
}

TEST_F(ScannerControlTest, EveryStepCanEndTheStop)
{
    ignoreUpdateErrors = false;
    const std::pair<const char*, const char*> cases[] = {
        {"-shutdown", "trawlfs [-shutdown]\n"},
        {"-force", "trawlfs [-shutdown]\ntrawlcfg [-disable] [all]\n"
                   "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"},
        {"120", "trawlfs [-shutdown]\ntrawlcfg [-disable] [all]\n"
                "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
                "trawlcfg [-shutdown] [all] [-timeout] [120]\n"},
    };
    for (const auto& [failing, expected] : cases) {
        writeFile(commandLog, "");
        plantScanners(home, commandLog, failing);

        EXPECT_EQ(7, stopScanners(home, true, true)) << failing;

        EXPECT_EQ(expected, calls()) << failing;
    }
}

TEST_F(ScannerControlTest, AMissingControlProgramIs7WhenUpdateErrorsCount)
{
    ignoreUpdateErrors = false;

    EXPECT_EQ(7, stopScanners(home, false, false));

    EXPECT_EQ(
        "Exec '" + home +
            "/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 32512\n",
        log.text());
}

TEST_F(ScannerControlTest, EveryStepRunsWhenNonFatalErrorsAreTolerated)
{
    ignoreUpdateErrors = false;
    ignoreNonFatalErrors = true;
    plantScanners(home, commandLog, "-");

    EXPECT_EQ(0, stopScanners(home, true, true));

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
}

TEST_F(ScannerControlTest, AHomeWithABlankInItsPathWorks)
{
    const std::string blank = dir / "two words";
    plantScanners(blank, commandLog);

    EXPECT_EQ(0, stopScanners(blank, false, false));

    EXPECT_EQ("trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              calls());
    EXPECT_EQ("Exec '\"" + blank +
                  "/bin/trawlcfg\" -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 0\n" +
                  "Exec '\"" + blank +
                  "/bin/trawlcfg\" -shutdown all -timeout 120 >/dev/null 2>&1' returned 0\n",
              log.text());
}

TEST_F(ScannerControlTest, RestartingEnablesAllScanners)
{
    plantScanners(home, commandLog);

    EXPECT_EQ(0, restartScanners(home));

    EXPECT_EQ("trawlcfg [-enable] [all]\n", calls());
    EXPECT_EQ("Exec '" + home + "/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0\n",
              log.text());
}

TEST_F(ScannerControlTest, RestartingReturnsTheRawStatusOfTheCommand)
{
    plantScanners(home, commandLog, "-enable");

    EXPECT_EQ(768, restartScanners(home));
}

TEST_F(ScannerControlTest, ASignalEndsTheStopBeforeTheNextCommand)
{
    plantScanners(home, commandLog);

    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt first("trawlfs -shutdown");
        EXPECT_EQ(0, stopScanners(home, true, true));
    }));

    EXPECT_EQ("trawlfs [-shutdown]\n", calls());
}

} // namespace
