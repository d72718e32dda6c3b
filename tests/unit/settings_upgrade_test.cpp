#include "installer_fixtures.h"
#include "process_limits.h"
#include "registry.h"
#include "safe_path.h"
#include "settings.h"
#include "settings_upgrade.h"

#include <gtest/gtest.h>

#include <string>

#include <sys/stat.h>

namespace {

const std::string Home = "/opt/corvan/zor";
const std::string Properties = "/opt/corvan/zor/config/Zor.properties";
const std::string TraceProperties = "/opt/corvan/zor/config/ZorTrace.properties";

/// The property files of an installation in /opt/corvan/zor, upgraded to 9.2.30.0 of 22/12/02.
class SettingsUpgradeTest : public MachineTest {
protected:
    SettingsUpgradeTest()
    {
        request.version = {9, 2, 30, 0, 0};
        request.buildDate = "22/12/02";
    }

    void SetUp() override
    {
        MachineTest::SetUp();
        if (HasFatalFailure())
            return;
        makeDirectories(Home + "/config");
        writeFile(Properties, "version=9.2.29.0007\n");
        writeFile(TraceProperties, "");
    }

    int upgrade() { return customizeDeployment(Home, request, false); }

    /// "Zor.properties" after an upgrade of one that held `content`, without the added defaults.
    std::string upgradedProperties(const std::string& content)
    {
        writeFile(Properties, content);
        EXPECT_EQ(0, upgrade());
        std::string text = readFile(Properties);
        const std::size_t defaults = text.find("vpdscanner.default_config_file=");
        EXPECT_NE(std::string::npos, defaults);
        return text.substr(0, defaults);
    }

    [[nodiscard]] bool logHolds(const std::string& text) const
    {
        return log.text().find(text) != std::string::npos;
    }

    InstallRegistry request;
};

// The main property file.

using UpgradedPropertiesTest = SettingsUpgradeTest;

const std::string Defaults = "vpdscanner.default_config_file=config.xml\n"
                             "hwscanner.config_file=ZorHWConfig.xml\n"
                             "hwscanner.hpux.full_node_npar=\n"
                             "hwscanner.node_active_cores=\n"
                             "fscanner.provider_remote_cache.home=/opt/corvan/zor/cache_data\n"
                             "fscanner.provider_remote_cache.globalCache=false\n"
                             "swscanner.assume_remote_filesystems=\n"
                             "hwscanner.changepriority=normal\n"
                             "swscanner.changepriority=normal\n"
                             "fscanner.changepriority=normal\n"
                             "vpdscanner.changepriority=normal\n"
                             "hwscanner.cputhreshold=0:0:0:0\n"
                             "swscanner.cputhreshold=0:0:0:0\n"
                             "fsscanner.cputhreshold=0:0:0:0\n"
                             "vpdscanner.cputhreshold=0:0:0:0\n"
                             "fscanner.excludeDirs=false\n"
                             "swscanner.excludeDirs=\n"
                             "swscanner.firsttimeonly=false\n";

TEST_F(UpgradedPropertiesTest, GetEveryMissingKeyWithItsDefaultAtTheEnd)
{
    writeFile(Properties, "# mine\nbuild_date=22/01/01\n");

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("# mine\nbuild_date=22/12/02\n" + Defaults, readFile(Properties));
}

TEST_F(UpgradedPropertiesTest, KeepEveryKeyThatIsThereWithItsValue)
{
    const char* const keys[] = {"vpdscanner.default_config_file",
                                "hwscanner.config_file",
                                "hwscanner.hpux.full_node_npar",
                                "hwscanner.node_active_cores",
                                "fscanner.provider_remote_cache.home",
                                "fscanner.provider_remote_cache.globalCache",
                                "swscanner.assume_remote_filesystems",
                                "hwscanner.changepriority",
                                "swscanner.changepriority",
                                "fscanner.changepriority",
                                "vpdscanner.changepriority",
                                "hwscanner.cputhreshold",
                                "swscanner.cputhreshold",
                                "fsscanner.cputhreshold",
                                "vpdscanner.cputhreshold",
                                "fscanner.excludeDirs",
                                "swscanner.excludeDirs",
                                "swscanner.firsttimeonly"};
    for (const char* const key : keys) {
        const std::string line = std::string(key) + " = of the user\n";
        writeFile(Properties, line);

        EXPECT_EQ(0, upgrade());

        std::string expected = Defaults;
        const std::size_t at = expected.find(std::string(key) + "=");
        ASSERT_NE(std::string::npos, at) << key;
        expected.erase(at, expected.find('\n', at) + 1 - at);
        EXPECT_EQ(line + "build_date=22/12/02\n" + expected, readFile(Properties)) << key;
    }
}

TEST_F(UpgradedPropertiesTest, AKeyWithoutAnEqualsSignIsThere)
{
    EXPECT_EQ("swscanner.excludeDirs\nbuild_date=22/12/02\n",
              upgradedProperties("swscanner.excludeDirs\n"));

    EXPECT_EQ(std::string::npos, readFile(Properties).find("swscanner.excludeDirs=\n"));
}

TEST_F(UpgradedPropertiesTest, ACommentedKeyIsMissing)
{
    upgradedProperties("#swscanner.firsttimeonly=true\n");

    EXPECT_NE(std::string::npos, readFile(Properties).find("\nswscanner.firsttimeonly=false\n"));
}

TEST_F(UpgradedPropertiesTest, TheDefaultsAreAnExportedTable)
{
    EXPECT_STREQ("vpdscanner.default_config_file", ZorPropertiesUpdate[0].key);
    EXPECT_STREQ("config.xml", ZorPropertiesUpdate[0].value);
    EXPECT_STREQ("$(ZOR_ConfigRootDirectory)$(FileSeparator)cache_data",
                 ZorPropertiesUpdate[4].value);
    EXPECT_STREQ("fsscanner.cputhreshold", ZorPropertiesUpdate[13].key);
    EXPECT_STREQ("swscanner.firsttimeonly", ZorPropertiesUpdate[17].key);
    EXPECT_EQ(nullptr, ZorPropertiesUpdate[18].key);
    EXPECT_EQ(nullptr, ZorPropertiesUpdate[18].value);
}

TEST_F(UpgradedPropertiesTest, ObsoleteKeysBecomeEmptyLines)
{
    EXPECT_EQ("a=1\n\n\n\n\n\n\n\nb=2\nbuild_date=22/12/02\n",
              upgradedProperties("a=1\n"
                                 "trawlnet.cputhreshold=1\n"
                                 "trawluse.cputhreshold=2\n"
                                 "trawluse.changepriority=3\n"
                                 " trawlnet.changepriority = 4\n"
                                 "#trawluse.cache_dir=5\n"
                                 "trawlnet.cache_dir.of.somebody=6\n"
                                 "lsof.bin\n"
                                 "b=2\n"));
}

TEST_F(UpgradedPropertiesTest, AnObsoleteKeyInAValueStays)
{
    EXPECT_EQ("a=lsof.bin\nbuild_date=22/12/02\n", upgradedProperties("a=lsof.bin\n"));
}

TEST_F(UpgradedPropertiesTest, TheVersionIsReplacedFromItsFirstEqualsSignOn)
{
    request.version = {10, 1, 2, 34, 5};

    EXPECT_EQ("version =10.1.2.0034\nbuild_date=22/12/02\n", upgradedProperties("version = 9=2\n"));
}

TEST_F(UpgradedPropertiesTest, AVersionWithoutAnEqualsSignGetsOne)
{
    EXPECT_EQ("version=9.2.30.0000\nbuild_date=22/12/02\n", upgradedProperties("version\n"));
}

TEST_F(UpgradedPropertiesTest, TheLastOfTwoVersionsIsTheOneReplaced)
{
    EXPECT_EQ("version=1\nversion=9.2.30.0000\nbuild_date=22/12/02\n",
              upgradedProperties("version=1\nversion=2\n"));
}

TEST_F(UpgradedPropertiesTest, AMissingVersionIsNotAdded)
{
    EXPECT_EQ("a=1\nbuild_date=22/12/02\n", upgradedProperties("a=1\n"));
}

TEST_F(UpgradedPropertiesTest, ABuildDateIsReplacedInItsPlace)
{
    EXPECT_EQ("build_date =22/12/02\na=1\n", upgradedProperties("build_date = 22/01/01\na=1\n"));
}

TEST_F(UpgradedPropertiesTest, ABuildDateWithoutAnEqualsSignGetsOne)
{
    EXPECT_EQ("build_date=22/12/02\na=1\n", upgradedProperties("build_date\na=1\n"));
}

TEST_F(UpgradedPropertiesTest, AMissingBuildDateIsAdded)
{
    EXPECT_EQ("a=1\nbuild_date=22/12/02\n", upgradedProperties("a=1\n"));
}

TEST_F(UpgradedPropertiesTest, EveryPlaceholderIsFilledIn)
{
    fileScannerMode = "provider_standard";

    EXPECT_EQ("a=/opt/corvan/zor\n"
              "b=/opt/corvan/zor\n"
              "c=/usr/kel/corvan/common\n"
              "d=/\n"
              "e=provider_standard\n"
              "f=$(other)\n"
              "build_date=22/12/02\n",
              upgradedProperties("a=$(ZOR_DestinationDir)\n"
                                 "b=$(ZOR_ConfigRootDirectory)\n"
                                 "c=$(CorvanCommonDir)\n"
                                 "d=$(FileSeparator)\n"
                                 "e=$(fscanner_mode)\n"
                                 "f=$(other)\n"));
}

TEST_F(UpgradedPropertiesTest, AFileThatCannotBeSavedIsAnError)
{
    ASSERT_EQ(0, chmod(Properties.c_str(), 0444));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(13, upgrade());
    }

    EXPECT_TRUE(logHolds("Saving file /opt/corvan/zor/config/Zor.properties error: 13 "
                         "(Permission denied)\n"
                         "Could not save property file\n"));
    EXPECT_FALSE(logHolds("Looking for Trace Dir"));
}

// Trace settings.

class UpgradedTracesTest : public SettingsUpgradeTest {
protected:
    /// "ZorTrace.properties" after an upgrade with this "Zor.properties".
    std::string tracesOf(const std::string& properties)
    {
        writeFile(Properties, properties);
        EXPECT_EQ(0, upgrade());
        return readFile(TraceProperties);
    }
};

TEST_F(UpgradedTracesTest, TheOldSettingsAreCarriedOver)
{
    writeFile(TraceProperties, "a=1\n"
                               " handlers.traceFile.fileName = default\n"
                               "zor.loggers.trcLogger.level=DEBUG_MIN\n"
                               "x.loggers.trcLogger.levels = y\n"
                               "#y.loggers.trcLogger.level=z\n");

    EXPECT_EQ("a=1\n"
              "handlers.traceFile.fileName=/var/traces/my.trc\n"
              "zor.loggers.trcLogger.level=DEBUG_3\n"
              "x.loggers.trcLogger.levels=DEBUG_3\n"
              "#y.loggers.trcLogger.level=DEBUG_3\n",
              tracesOf("trace_level=3\ntrace_file_path=/var/traces\ntrace_file=my.trc\n"));
}

TEST_F(UpgradedTracesTest, TheTextsAfterTheEqualsSignAreTakenUnchanged)
{
    writeFile(TraceProperties, "handlers.traceFile.fileName=x\n"
                               "a.loggers.trcLogger.level=x\n");

    EXPECT_EQ("handlers.traceFile.fileName= $(ZOR_DestinationDir) / a=b\n"
              "a.loggers.trcLogger.level=DEBUG_ 3 \n",
              tracesOf("trace_level = 3 \ntrace_file_path = $(ZOR_DestinationDir) \n"
                       "trace_file= a=b\n"));
}

TEST_F(UpgradedTracesTest, SettingsThatAreMissingAreEmpty)
{
    writeFile(TraceProperties, "handlers.traceFile.fileName=x\n"
                               "a.loggers.trcLogger.level=x\n");

    EXPECT_EQ("handlers.traceFile.fileName=/\na.loggers.trcLogger.level=DEBUG_\n", tracesOf(""));
}

TEST_F(UpgradedTracesTest, ASettingWithoutAnEqualsSignIsEmpty)
{
    writeFile(TraceProperties, "handlers.traceFile.fileName=x\n");

    EXPECT_EQ("handlers.traceFile.fileName=/f\n", tracesOf("trace_file_path\ntrace_file=f\n"));
}

TEST_F(UpgradedTracesTest, TheLastOfTwoSettingsCounts)
{
    writeFile(TraceProperties, "a.loggers.trcLogger.level=x\n");

    EXPECT_EQ("a.loggers.trcLogger.level=DEBUG_2\n", tracesOf("trace_level=1\ntrace_level=2\n"));
}

TEST_F(UpgradedTracesTest, KeysThatAreMissingAreNotAdded)
{
    writeFile(TraceProperties, "a=1\n");

    EXPECT_EQ("a=1\n", tracesOf("trace_level=3\ntrace_file_path=/var/traces\ntrace_file=f\n"));
}

TEST_F(UpgradedTracesTest, PlaceholdersOfTheTracePropertiesStay)
{
    writeFile(TraceProperties, "a=$(ZOR_DestinationDir)\n");

    EXPECT_EQ("a=$(ZOR_DestinationDir)\n", tracesOf(""));
}

TEST_F(UpgradedTracesTest, AnOrdinaryFileNamesNoTraceDirectory)
{
    tracesOf("trace_file_path=/var/traces\n");

    EXPECT_TRUE(logHolds("Looking for Trace Dir\nCustomizing property file: "));
}

TEST_F(UpgradedTracesTest, TheOldPathItselfIsTheKeyOfTheTraceDirectory)
{
    tracesOf("trace_file_path=/var/traces\n/var/traces= /elsewhere \n");

    EXPECT_TRUE(logHolds("Looking for Trace Dir\nTrace Dir:  /elsewhere \n"
                         "Customizing property file: "));
}

TEST_F(UpgradedTracesTest, WithoutAnOldPathAnEmptyLineNamesAnEmptyTraceDirectory)
{
    tracesOf("a=1\n\nb=2\n");

    EXPECT_TRUE(logHolds("Looking for Trace Dir\nTrace Dir: \nCustomizing property file: "));
}

TEST_F(UpgradedTracesTest, TheKeyIsLookedUpInTheEditedFile)
{
    tracesOf("trace_file_path=/opt/corvan/zor\n$(ZOR_DestinationDir)=/found\n");

    EXPECT_TRUE(logHolds("Trace Dir: /found\n"));
}

TEST_F(UpgradedTracesTest, AnUntrimmedOldPathMatchesNoKey)
{
    tracesOf("trace_file_path= /var/traces\n/var/traces=/elsewhere\n");

    EXPECT_FALSE(logHolds("Trace Dir: "));
}

TEST_F(UpgradedTracesTest, AFileThatCannotBeSavedIsAnError)
{
    writeFile(TraceProperties, "a=1\n");
    ASSERT_EQ(0, chmod(TraceProperties.c_str(), 0444));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(13, upgrade());
    }

    EXPECT_TRUE(logHolds("Could not save property file\n"));
    EXPECT_FALSE(logHolds("File saved successfully"));
    EXPECT_FALSE(logHolds("Updating file with variables"));
}

} // namespace
