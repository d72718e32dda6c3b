#include "installer_fixtures.h"
#include "process_limits.h"
#include "property_file.h"
#include "template_variables.h"

#include <gtest/gtest.h>

#include <sys/stat.h>
#include <sys/syscall.h>

namespace {

TEST(PlaceholderTest, EachHasItsOwnText)
{
    EXPECT_EQ("$(ZOR_DestinationDir)", tokenZorDestDir);
    EXPECT_EQ("$(ZOR_ConfigRootDirectory)", tokenZorCfgRoot);
    EXPECT_EQ("$(CorvanCommonDir)", tokenCorvanCommonDir);
    EXPECT_EQ("$(FileSeparator)", tokenFileSeparator);
    EXPECT_EQ("$(fscanner_mode)", tokenScannerMode);
}

TEST(PlaceholderTest, BeginsWithThePrefixOfVariables)
{
    EXPECT_EQ("$", VariablePrefix);
}

TEST(ReplaceAllTest, ReplacesEveryOccurrenceInEveryLineAndCountsThem)
{
    PropertyFile file;
    file.lines = {"a=$(x):$(x)", "", "b=$(y)", "$(x)"};

    EXPECT_EQ(3, replaceAll(file, "$(x)", "/opt"));

    EXPECT_EQ((std::vector<std::string>{"a=/opt:/opt", "", "b=$(y)", "/opt"}), file.lines);
}

TEST(ReplaceAllTest, AnEmptyListHasNothingToReplace)
{
    PropertyFile file;

    EXPECT_EQ(0, replaceAll(file, "$(x)", "/opt"));
}

TEST(ReplaceAllTest, SearchesFromTheStartOfTheLineAfterEachReplacement)
{
    PropertyFile file;
    file.lines = {"$($(x)x)"};

    EXPECT_EQ(2, replaceAll(file, "$(x)", ""));

    EXPECT_EQ(std::vector<std::string>{""}, file.lines);
}

class UpdateScriptTest : public InstallerTest {
protected:
    void SetUp() override { makeDirectories(dir / "install"); }

    /// What the script holds after its update for a home in this directory.
    std::string updated(const std::string& content)
    {
        writeFile(script, content);
        EXPECT_EQ(0, updateScript("trawlcfg.sh", dir.path(), "/usr/kel/corvan/common"));
        return readFile(script);
    }

    const std::string script = dir / "install/trawlcfg.sh";
};

TEST_F(UpdateScriptTest, ReplacesEveryPlaceholderOfALine)
{
    EXPECT_EQ("A=" + dir.path() + ":" + dir.path() + "\nB=/usr/kel/corvan/common\n",
              updated("A=$(ZOR_DestinationDir):$(ZOR_DestinationDir)\nB=$(CorvanCommonDir)\n"));
}

TEST_F(UpdateScriptTest, TheConfigurationRootIsTheHomeDirectory)
{
    EXPECT_EQ("C=" + dir.path() + "/config\n", updated("C=$(ZOR_ConfigRootDirectory)/config\n"));
}

TEST_F(UpdateScriptTest, LeavesOtherPlaceholdersAsTheyAre)
{
    EXPECT_EQ("$(FileSeparator) $(fscanner_mode) $(Other) $HOME ${x}\n",
              updated("$(FileSeparator) $(fscanner_mode) $(Other) $HOME ${x}\n"));
}

TEST_F(UpdateScriptTest, RewritesAScriptWithoutPlaceholdersToo)
{
    EXPECT_EQ("#!/bin/sh\r\n\nlast line without newline\n",
              updated("#!/bin/sh\r\n\nlast line without newline"));
}

TEST_F(UpdateScriptTest, APlaceholderIsReplacedInWhatTheEarlierStepsLeft)
{
    const std::string home = dir / "$(CorvanCommonDir)";
    makeDirectories(home + "/install");
    writeFile(home + "/install/rmdirs.sh", "$(ZOR_DestinationDir)\n");

    EXPECT_EQ(0, updateScript("rmdirs.sh", home, "common"));

    EXPECT_EQ(dir / "common\n", readFile(home + "/install/rmdirs.sh"));
}

TEST_F(UpdateScriptTest, LogsWhatItDoes)
{
    updated("");

    EXPECT_EQ("Updating file with variables " + script + "\nUpdating: " + script + "\n",
              log.text());
}

TEST_F(UpdateScriptTest, AMissingScriptIsNotAFailure)
{
    EXPECT_EQ(0, updateScript("trawlcfg.sh", dir.path(), "/common"));

    EXPECT_EQ("Updating file with variables " + script + "\nScript does not exist " + script + "\n",
              log.text());
}

TEST_F(UpdateScriptTest, AHomeThatEndsInASlashGetsNoSecondOne)
{
    EXPECT_EQ(0, updateScript("rmdirs.sh", "/nonexistent/", "/common"));

    EXPECT_EQ("Updating file with variables /nonexistent/install/rmdirs.sh\n"
              "Script does not exist /nonexistent/install/rmdirs.sh\n",
              log.text());
}

TEST_F(UpdateScriptTest, AScriptThatCannotBeLoadedReturnsTheErrorAndStays)
{
    writeFile(script, "$(ZOR_DestinationDir)\n");
    ASSERT_EQ(0, chmod(script.c_str(), 0));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(13, updateScript("trawlcfg.sh", dir.path(), "/common"));
    }

    EXPECT_EQ("Updating file with variables " + script + "\nUpdating: " + script +
                  "\nLoading file " + script + " error: 13 (Permission denied)\n",
              log.text());
    EXPECT_EQ(0U, modeOf(script));
    ASSERT_EQ(0, chmod(script.c_str(), 0644));
    EXPECT_EQ("$(ZOR_DestinationDir)\n", readFile(script));
}

TEST_F(UpdateScriptTest, AScriptThatCannotBeSavedReturnsTheError)
{
    writeFile(script, "$(ZOR_DestinationDir)\n");
    ASSERT_EQ(0, chmod(script.c_str(), 0444));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(13, updateScript("trawlcfg.sh", dir.path(), "/common"));
    }

    EXPECT_EQ("Updating file with variables " + script + "\nUpdating: " + script +
                  "\nSaving file " + script + " error: 13 (Permission denied)\n" +
                  "Could not save script file " + script + "\n",
              log.text());
    EXPECT_EQ("$(ZOR_DestinationDir)\n", readFile(script));
}

TEST_F(UpdateScriptTest, TheModeOfTheScriptStays)
{
    writeFile(script, "$(ZOR_DestinationDir)\n");
    ASSERT_EQ(0, chmod(script.c_str(), 0750));

    EXPECT_EQ(0, updateScript("trawlcfg.sh", dir.path(), "/common"));

    EXPECT_EQ(0750U, modeOf(script));
}

TEST_F(UpdateScriptTest, BothScriptsAreUpdatedInTheirOrder)
{
    writeFile(dir / "install/trawlcfg.sh", "$(CorvanCommonDir)\n");
    writeFile(dir / "install/rmdirs.sh", "rmdir $(CorvanCommonDir)\n");

    updateScripts(dir.path(), "/common");

    EXPECT_EQ("/common\n", readFile(dir / "install/trawlcfg.sh"));
    EXPECT_EQ("rmdir /common\n", readFile(dir / "install/rmdirs.sh"));
    EXPECT_EQ("Updating file with variables " + dir / "install/trawlcfg.sh" +
                  "\nUpdating: " + dir / "install/trawlcfg.sh" + "\nUpdating file with variables " +
                  dir / "install/rmdirs.sh" + "\nUpdating: " + dir / "install/rmdirs.sh" + "\n",
              log.text());
}

TEST_F(UpdateScriptTest, AScriptThatCannotBeUpdatedDoesNotStopTheOther)
{
    makeDirectories(dir / "install/trawlcfg.sh");
    writeFile(dir / "install/rmdirs.sh", "rmdir $(CorvanCommonDir)\n");

    updateScripts(dir.path(), "/common");

    EXPECT_EQ("rmdir /common\n", readFile(dir / "install/rmdirs.sh"));
}

} // namespace
