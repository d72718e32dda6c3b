#include "command_line.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "settings.h"

#include <gtest/gtest.h>

#include <initializer_list>

#include <sys/stat.h>
#include <unistd.h>

namespace {

const std::string Usage =
    "Usage: wzorinst i|r|t <exploiterID> [-o <log file>] [-s <spblock_path>] [-d <target_dir>] "
    "[-f <fs_provider>] [-n] [-r]\n"
    "\n"
    "  i                 install/upgrade specified software package block\n"
    "  r                 remove ZOR for specified exploiter\n"
    "  t                 display install info\n"
    "  <exploiterID>     name of exploiter that is installing/removing ZOR\n"
    "  -s <spblock_path> full path of SPB file (required to install or upgrade)\n"
    "  -o <log file>     redirect output to a file\n"
    "  -d <target_dir>   directory where ZOR must be installed\n"
    "  -f <fs_provider>  default provider for file system scanner\n"
    "  -n                does not add <exploiterID> to the ZOR install registry\n"
    "  -r                enable single user mode\n"
    "  -p                private mode\n"
    "  -c <target_path>  directory for ZOR trace files\n"
    "\n";

class CommandLineTest : public InstallerTest {
protected:
    /// Parses `arguments`, which follow the program's name; keeps what was printed.
    int parse(std::initializer_list<const char*> arguments)
    {
        std::vector<std::string> texts = {"wzorinst"};
        texts.insert(texts.end(), arguments.begin(), arguments.end());
        std::vector<char*> argv;
        argv.reserve(texts.size() + 1);
        for (std::string& text : texts)
            argv.push_back(text.data());
        argv.push_back(nullptr);

        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int code = parseCommandLine(static_cast<int>(texts.size()), argv.data(), commandLine);
        output = testing::internal::GetCapturedStdout();
        errors = testing::internal::GetCapturedStderr();
        return code;
    }

    /// Expects `arguments` to end the run with `message` on standard error and the usage.
    void expectUsageError(std::initializer_list<const char*> arguments, const std::string& message)
    {
        EXPECT_EQ(1, parse(arguments)) << message;
        EXPECT_EQ(message, errors);
        EXPECT_EQ(Usage, output) << message;
    }

    CommandLine commandLine;
    std::string output;
    std::string errors;
};

TEST_F(CommandLineTest, TheUsageGoesToStandardOutputAndReturns1)
{
    testing::internal::CaptureStdout();
    const int code = printUsage();

    EXPECT_EQ(Usage, testing::internal::GetCapturedStdout());
    EXPECT_EQ(1, code);
    EXPECT_EQ("", log.text());
}

TEST_F(CommandLineTest, FewerThanTwoArgumentsShowTheUsageAlone)
{
    expectUsageError({}, "");
    expectUsageError({"i"}, "");
    expectUsageError({"x"}, "");
}

TEST_F(CommandLineTest, AnActionOtherThanInstallAndRemoveIsInvalid)
{
    expectUsageError({"t", "ABC"}, "Invalid command: t\n");
    expectUsageError({"install", "ABC"}, "Invalid command: install\n");
    expectUsageError({"", "ABC"}, "Invalid command: \n");
    expectUsageError({"I", "ABC"}, "Invalid command: I\n");
}

TEST_F(CommandLineTest, TakesTheActionAndTheExploiter)
{
    EXPECT_EQ(0, parse({"r", "ABC"}));

    EXPECT_EQ('r', commandLine.action);
    EXPECT_EQ("ABC", commandLine.request.exploiters);
    EXPECT_EQ("", commandLine.destDir);
    EXPECT_EQ("", commandLine.privatePath);
    EXPECT_EQ(' ', commandLine.privateAction);
    EXPECT_EQ("", output + errors + log.text());
}

TEST_F(CommandLineTest, KnowsTheVersionAndBuildDateOfThisInstaller)
{
    EXPECT_EQ(0, parse({"r", "ABC"}));

    EXPECT_EQ("9.2.30.0000", formatVersion(commandLine.request.version));
    EXPECT_EQ("22/12/02", commandLine.request.buildDate);
}

TEST_F(CommandLineTest, AColonInTheExploiterEndsTheRunWithoutTheUsage)
{
    EXPECT_EQ(1, parse({"i", "AB:C", "-s", "x.spb"}));

    EXPECT_EQ("Exploiter name must not contain ':'\n", errors);
    EXPECT_EQ("", output);
    EXPECT_EQ("", spbPackage);
}

TEST_F(CommandLineTest, TheActionIsCheckedBeforeTheExploiter)
{
    expectUsageError({"x", "AB:C"}, "Invalid command: x\n");
}

TEST_F(CommandLineTest, WithoutOptionsTheSettingsStayAsTheyStarted)
{
    EXPECT_EQ(0, parse({"r", "ABC"}));

    EXPECT_FALSE(localInstall);
    EXPECT_FALSE(skipExploiterRegistration);
    EXPECT_FALSE(privateMode);
    EXPECT_FALSE(debugMode);
    EXPECT_FALSE(norollback);
    EXPECT_FALSE(ignoreNonFatalErrors);
    EXPECT_TRUE(ignoreUpdateErrors);
    EXPECT_FALSE(createSingleUserModeFile);
    EXPECT_FALSE(applySingleUserMode);
    EXPECT_FALSE(custom_log_path_available);
    EXPECT_EQ("", spbPackage);
    EXPECT_EQ("provider_cache", fileScannerMode);
    EXPECT_EQ("", new_log_path);
    EXPECT_EQ(0U, globalFilesUmask);
    EXPECT_EQ(0777U, LogDirMode);
    EXPECT_EQ(0777U, CommonLogDirMode);
    EXPECT_EQ(0777U, CacheDirRootMode);
    EXPECT_EQ(0777U, EtcDirMode);
    EXPECT_EQ(0777U, CorvanCommonDirMode);
}

TEST_F(CommandLineTest, SNamesThePackage)
{
    EXPECT_EQ(0, parse({"i", "ABC", "-s", "/media/x.spb"}));

    EXPECT_EQ("/media/x.spb", spbPackage);
    EXPECT_EQ("SPB file: /media/x.spb\n", log.text());
}

TEST_F(CommandLineTest, DNamesTheTargetAndThePrivatePath)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-d", "/opt/x/"}));

    EXPECT_EQ("/opt/x/", commandLine.destDir);
    EXPECT_EQ("/opt/x/", commandLine.privatePath);
    EXPECT_EQ("Target directory: /opt/x/\n", log.text());
}

TEST_F(CommandLineTest, TheLastOfTwoTargetsWins)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-d", "/a", "-d", "/b"}));

    EXPECT_EQ("/b", commandLine.destDir);
    EXPECT_EQ("/b", commandLine.privatePath);
    EXPECT_EQ("Target directory: /a\nTarget directory: /b\n", log.text());
}

TEST_F(CommandLineTest, FTakesEachOfTheSixProviders)
{
    for (const char* const provider :
         {"provider_standard", "provider_cache", "provider_cache2", "provider_cache3",
          "provider_remote_cache", "provider_remote_cache2"}) {
        const std::size_t before = log.text().size();
        EXPECT_EQ(0, parse({"r", "ABC", "-f", provider}));
        EXPECT_EQ(provider, fileScannerMode);
        EXPECT_EQ("File scanner mode: " + std::string(provider) + "\n", log.text().substr(before));
    }
}

TEST_F(CommandLineTest, FRefusesAnyOtherProviderInTheLog)
{
    for (const char* const provider : {"cache", "provider_cache4", "PROVIDER_CACHE", "provider_"}) {
        const std::size_t before = log.text().size();
        expectUsageError({"r", "ABC", "-f", provider}, "");
        EXPECT_EQ("Invalid provider specified: " + std::string(provider) + "\n",
                  log.text().substr(before));
    }
    EXPECT_EQ("provider_cache", fileScannerMode);
}

TEST_F(CommandLineTest, AProviderMayMatchAcrossTwoNames)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-f", "provider_cache||provider_cache2"}));

    EXPECT_EQ("provider_cache||provider_cache2", fileScannerMode);
}

TEST_F(CommandLineTest, AnEmptyProviderMatchesBetweenTwoNames)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-f", ""}));

    EXPECT_EQ("", fileScannerMode);
}

TEST_F(CommandLineTest, CNamesTheTracePath)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-c", "/var/traces"}));

    EXPECT_EQ("/var/traces", new_log_path);
    EXPECT_TRUE(custom_log_path_available);
    EXPECT_EQ("ZOR custom trace path: /var/traces\n", log.text());
}

TEST_F(CommandLineTest, ORedirectsWhatFollowsIt)
{
    writeFile(dir / "log", "of an earlier run\n");

    EXPECT_EQ(0, parse({"i", "ABC", "-s", "x.spb", "-o", (dir / "log").c_str(), "-d", "/opt/x"}));
    logstream->flush();

    EXPECT_EQ("SPB file: x.spb\n", log.text());
    EXPECT_EQ("Target directory: /opt/x\n", readFile(dir / "log"));
}

TEST_F(CommandLineTest, OMayRedirectAgain)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-o", (dir / "a").c_str(), "-d", "/a", "-o",
                        (dir / "b").c_str(), "-d", "/b"}));
    logstream->flush();

    EXPECT_EQ("Target directory: /a\n", readFile(dir / "a"));
    EXPECT_EQ(0644U, modeOf(dir / "a"));
    EXPECT_EQ("Target directory: /b\n", readFile(dir / "b"));
}

TEST_F(CommandLineTest, ALogThatCannotBeOpenedLosesWhatFollows)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-o", (dir / "missing/log").c_str(), "-d", "/opt/x"}));

    EXPECT_EQ("/opt/x", commandLine.destDir);
    EXPECT_TRUE(logstream->fail());
    EXPECT_EQ("", output + errors + log.text());
}

/// Whether a log to `path` empties a file that somebody else may have planted there as a hard link.
bool emptiesHardLink(const TempDir& dir, const std::string& directory, const std::string& name,
                     const std::string& start = "")
{
    makeDirectories(dir / directory);
    EXPECT_EQ(0, chmod((dir / directory).c_str(), 0777));
    writeFile(dir / "victim", "kept");
    EXPECT_EQ(0, link((dir / "victim").c_str(), (dir / directory + "/" + name).c_str()));
    EXPECT_TRUE(passesInChild([&] {
        ASSERT_EQ(0, chdir(dir.path().c_str()));
        const std::string path = start + directory + "/" + name;
        const char* arguments[] = {"wzorinst", "r", "ABC", "-o", path.c_str(), nullptr};
        CommandLine commandLine;
        EXPECT_EQ(0, parseCommandLine(5, const_cast<char**>(arguments), commandLine));
    }));
    return readFile(dir / "victim") != "kept";
}

TEST_F(CommandLineTest, OnlyThePathOfADescriptorIsOpenedWhateverItLeadsTo)
{
    EXPECT_FALSE(emptiesHardLink(dir, "open", "log"));
    EXPECT_FALSE(emptiesHardLink(dir, "open", "5"));
    EXPECT_FALSE(emptiesHardLink(dir, "a/b/c/open", "5")) << "as deep as descriptors in /proc";
    EXPECT_FALSE(emptiesHardLink(dir, "a/b/c/fd", "5")) << "and in a directory of that name";
    EXPECT_FALSE(emptiesHardLink(dir, "fd", "5", "/proc/self/cwd/"));
}

TEST_F(CommandLineTest, AnInvalidProviderIsLoggedToTheRedirectedLogAndTheUsageIsNot)
{
    expectUsageError({"r", "ABC", "-o", (dir / "log").c_str(), "-f", "x"}, "");
    logstream->flush();

    EXPECT_EQ("Invalid provider specified: x\n", readFile(dir / "log"));
}

TEST_F(CommandLineTest, NSkipsTheRegistration)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-n"}));

    EXPECT_TRUE(skipExploiterRegistration);
}

TEST_F(CommandLineTest, RTurnsSingleUserModeOn)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-r"}));

    EXPECT_EQ(022U, globalFilesUmask);
    EXPECT_EQ(0755U, LogDirMode);
    EXPECT_EQ(0755U, CommonLogDirMode);
    EXPECT_EQ(0755U, CacheDirRootMode);
    EXPECT_EQ(0755U, EtcDirMode);
    EXPECT_TRUE(createSingleUserModeFile);
    EXPECT_TRUE(applySingleUserMode);
}

TEST_F(CommandLineTest, PTurnsPrivateModeOnWithTheActionOfTheRun)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-p", "-d", "/opt/x"}));

    EXPECT_TRUE(privateMode);
    EXPECT_EQ('r', commandLine.privateAction);
}

TEST_F(CommandLineTest, PNeedsATarget)
{
    EXPECT_EQ(1, parse({"r", "ABC", "-p"}));

    EXPECT_EQ("For privatePath -d parameter is mandatory\n", errors);
    EXPECT_EQ("", output + log.text());
}

TEST_F(CommandLineTest, AMissingPrivatePathIsReportedBeforeAMissingPackage)
{
    EXPECT_EQ(1, parse({"i", "ABC", "-p"}));

    EXPECT_EQ("For privatePath -d parameter is mandatory\n", errors);
    EXPECT_EQ("", output + log.text());
}

TEST_F(CommandLineTest, VTurnsDebugModeOn)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-v"}));

    EXPECT_TRUE(debugMode);
}

TEST_F(CommandLineTest, NorollbackIsALongOption)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-norollback"}));

    EXPECT_TRUE(norollback);
    EXPECT_FALSE(skipExploiterRegistration);
}

TEST_F(CommandLineTest, LAndGAndZAreHiddenUntilEeo)
{
    expectUsageError({"r", "ABC", "-l"}, "Invalid option: -l\n");
    expectUsageError({"r", "ABC", "-g", "-eeo"}, "Invalid option: -g\n");
    expectUsageError({"r", "ABC", "-z"}, "Invalid option: -z\n");
}

TEST_F(CommandLineTest, LChoosesAPerUserInstallation)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-eeo", "-l"}));

    EXPECT_TRUE(localInstall);
    EXPECT_EQ("", log.text());
}

TEST_F(CommandLineTest, GChoosesASharedInstallation)
{
    localInstall = true;

    EXPECT_EQ(0, parse({"r", "ABC", "-eeo", "-g"}));

    EXPECT_FALSE(localInstall);
    EXPECT_EQ("", log.text());
}

TEST_F(CommandLineTest, ZToleratesNonFatalErrors)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-eeo", "-z"}));

    EXPECT_TRUE(ignoreNonFatalErrors);
}

TEST_F(CommandLineTest, TheLastOfTwoInstallTypesWinsWithAWarning)
{
    EXPECT_EQ(0, parse({"i", "ABC", "-s", "x.spb", "-eeo", "-l", "-g"}));

    EXPECT_FALSE(localInstall);
    EXPECT_EQ("SPB file: x.spb\nWarning: install type has been specified multiple times\n",
              log.text());
}

TEST_F(CommandLineTest, OtherOptionsWorkAfterEeo)
{
    EXPECT_EQ(0, parse({"i", "ABC", "-eeo", "-s", "x.spb", "-n", "-eeo", "-v"}));

    EXPECT_EQ("x.spb", spbPackage);
    EXPECT_TRUE(skipExploiterRegistration);
    EXPECT_TRUE(debugMode);
}

TEST_F(CommandLineTest, AnythingElseIsAnInvalidOption)
{
    for (const char* const option : {"-x", "x", "--", "-", "", "-sd", "ab", "-S", "-eeo2", "-i"})
        expectUsageError({"r", "ABC", option}, "Invalid option: " + std::string(option) + "\n");
}

TEST_F(CommandLineTest, TheFirstWrongOptionEndsTheParse)
{
    expectUsageError({"r", "ABC", "-n", "-x", "-v"}, "Invalid option: -x\n");

    EXPECT_TRUE(skipExploiterRegistration);
    EXPECT_FALSE(debugMode);
}

TEST_F(CommandLineTest, AnOptionWithoutItsArgumentIsAnError)
{
    for (const char* const option : {"-d", "-f", "-s", "-o", "-c"})
        expectUsageError({"i", "ABC", option},
                         "Missing argument for option: " + std::string(option) + "\n");
}

TEST_F(CommandLineTest, AnArgumentIsTakenAsItIs)
{
    EXPECT_EQ(0, parse({"r", "ABC", "-d", "-n", "-c", ""}));

    EXPECT_EQ("-n", commandLine.destDir);
    EXPECT_FALSE(skipExploiterRegistration);
    EXPECT_EQ("", new_log_path);
    EXPECT_TRUE(custom_log_path_available);
}

TEST_F(CommandLineTest, AnInstallationNeedsAPackage)
{
    EXPECT_EQ(1, parse({"i", "ABC"}));

    EXPECT_EQ("Error: an SPB file is required to install or upgrade\n", log.text());
    EXPECT_EQ(Usage, output);
    EXPECT_EQ("", errors);
}

TEST_F(CommandLineTest, ARemovalNeedsNoPackage)
{
    EXPECT_EQ(0, parse({"r", "ABC"}));
}

TEST_F(CommandLineTest, TheDestinationIsTheGivenDirectoryWithoutItsFinalSlash)
{
    commandLine.destDir = "/opt/x/";

    EXPECT_EQ(0, fixDestination(commandLine, "/opt/default"));

    EXPECT_EQ("/opt/x", commandLine.request.homeDirectory);
    EXPECT_EQ("/opt/x", commandLine.request.configRootDirectory);
}

TEST_F(CommandLineTest, WithoutAnyDestinationTheUsageIsShown)
{
    testing::internal::CaptureStdout();

    EXPECT_EQ(1, fixDestination(commandLine, ""));

    EXPECT_EQ(Usage, testing::internal::GetCapturedStdout());
    EXPECT_EQ("*** Error: no destination directory.\n", log.text());
}

} // namespace
