#include "extraction.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "registry.h"
#include "safe_path.h"
#include "settings.h"
#include "text.h"
#include "toolkit_package.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace {

using Lines = std::vector<std::string>;

const std::string Root = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/";

/// `index` without the time in its first line, if there is one.
std::string withoutTime(const std::string& index)
{
    const std::size_t at = index.find(" installed on ");
    const std::size_t end = index.find('\n');
    if (at == std::string::npos || end != at + 14 + 19) // as in "2022-12-02T08:00:00"
        return index;
    return index.substr(0, at) + " installed on TIME" + index.substr(end);
}

class ExtractEntriesTest : public InstallerTest {
protected:
    /// Extracts what begins with "pkg/" in an archive of `items` to "to"; no skip list, no index.
    int extract(const std::vector<ZipItem>& items, mode_t mode = 0755)
    {
        return extractEntries(transaction, archiveOf(items), "pkg/", dir / "to", mode, nullptr,
                              nullptr, false);
    }

    const ZipFile& archiveOf(const std::vector<ZipItem>& items)
    {
        writeFile(dir / "package.spb", zipBytes({items}));
        return archive_.emplace((dir / "package.spb").c_str());
    }

    /// What extract() prints on standard output with its trace on.
    std::string traceOf(const std::vector<ZipItem>& items, const std::string* skipList,
                        int expectedCode = 0)
    {
        const ZipFile& archive = archiveOf(items);
        testing::internal::CaptureStdout();
        EXPECT_EQ(expectedCode, extractEntries(transaction, archive, "pkg/", dir / "to", 0755,
                                               skipList, nullptr, true));
        return testing::internal::GetCapturedStdout();
    }

    /// What was extracted.
    [[nodiscard]] Lines tree() const { return treeOf(dir / "to"); }

private:
    std::optional<ZipFile> archive_;
};

TEST_F(ExtractEntriesTest, CreatesDirectoriesAndFilesWithTheirMode)
{
    EXPECT_EQ(0, extract({storedItem("pkg/", ""), storedItem("pkg/a", "1"),
                          storedItem("pkg/sub/", ""), storedItem("pkg/sub/b", "2")},
                         0751));

    EXPECT_EQ(Lines({"f 0751 a", "d 0751 sub", "f 0751 sub/b"}), tree());
    EXPECT_EQ(0751U, modeOf(dir / "to"));
    EXPECT_EQ("1", readFile(dir / "to/a"));
    EXPECT_EQ("2", readFile(dir / "to/sub/b"));
}

TEST_F(ExtractEntriesTest, TheUmaskCutsTheModeOfDirectoriesButNotOfFiles)
{
    (void)umask(077);

    EXPECT_EQ(0, extract({storedItem("pkg/", ""), storedItem("pkg/a", "1")}, 0755));

    EXPECT_EQ(0700U, modeOf(dir / "to"));
    EXPECT_EQ(0755U, modeOf(dir / "to/a"));
}

TEST_F(ExtractEntriesTest, TheEntryOfThePackageDirectoryItselfCreatesTheDestination)
{
    EXPECT_EQ(0, extract({storedItem("pkg/", "")}));

    EXPECT_EQ("4 " + dir / "to" + "\n", journalText(transaction));
}

TEST_F(ExtractEntriesTest, EverythingIsJournalledInTheOrderOfTheArchive)
{
    makeDirectories(dir / "to");
    writeFile(dir / "to/a", "old");

    EXPECT_EQ(0, extract({storedItem("pkg/b", "2"), storedItem("pkg/a", "1"),
                          storedItem("pkg/sub/", "")}));

    EXPECT_EQ("2 " + dir / "to/b" + "\n1 " + dir / "to/a" + "\n2 " + dir / "to/a" + "\n4 " +
                  dir / "to/sub" + "\n",
              journalText(transaction));
}

TEST_F(ExtractEntriesTest, SkipsOtherNamesSilently)
{
    makeDirectories(dir / "to");

    EXPECT_EQ(0, extract({storedItem("other/a", "1"), storedItem("pk", "2"),
                          storedItem("x/pkg/b", "3"), storedItem("pkg", "4")}));

    EXPECT_TRUE(tree().empty());
    EXPECT_EQ("", log.text());
}

TEST_F(ExtractEntriesTest, ADestinationHasNoTwoSlashesInARow)
{
    EXPECT_EQ(0, extract({storedItem("pkg//sub///", ""), storedItem("pkg/sub//a", "1")}));

    EXPECT_EQ(Lines({"d 0755 sub", "f 0755 sub/a"}), tree());
    EXPECT_EQ("4 " + dir / "to" + "\n4 " + dir / "to/sub" + "\n2 " + dir / "to/sub/a" + "\n",
              journalText(transaction));
}

TEST_F(ExtractEntriesTest, ADestinationOfOneCharacterIsSkipped)
{
    const ZipFile& archive = archiveOf({storedItem("pkg/", ""), storedItem("pkg///", "")});

    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", "", 0755, nullptr, nullptr, false));
    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", "//", 0755, nullptr, nullptr, false));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(ExtractEntriesTest, NamesOnTheSkipListAreSkipped)
{
    makeDirectories(dir / "to");
    std::string skipList;
    appendToNameList(skipList, "pkg/b");
    appendToNameList(skipList, "pkg/c");
    const ZipFile& archive = archiveOf({storedItem("pkg/a", "1"), storedItem("pkg/b", "2"),
                                        storedItem("pkg/c", "3"), storedItem("pkg/bb", "4")});

    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", dir / "to", 0755, &skipList, nullptr,
                                false));

    EXPECT_EQ(Lines({"f 0755 a", "f 0755 bb"}), tree());
}

TEST_F(ExtractEntriesTest, AnEmptySkipListSkipsNothing)
{
    makeDirectories(dir / "to");
    const std::string skipList;
    const ZipFile& archive = archiveOf({storedItem("pkg/a", "1")});

    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", dir / "to", 0755, &skipList, nullptr,
                                false));

    EXPECT_EQ(Lines{"f 0755 a"}, tree());
}

TEST_F(ExtractEntriesTest, TheIndexGetsEveryFileAndNoDirectory)
{
    const ZipFile& archive =
        archiveOf({storedItem("pkg/", ""), storedItem("pkg/b", "1"), storedItem("pkg/sub/", ""),
                   storedItem("pkg/a", "2"), storedItem("other", "3")});
    {
        const ScopedFile index(std::fopen((dir / "index").c_str(), "w"));
        EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", dir / "to", 0755, nullptr,
                                    index.get(), false));
    }

    EXPECT_EQ(dir / "to/b" + "\n" + dir / "to/a" + "\n", readFile(dir / "index"));
}

TEST_F(ExtractEntriesTest, TheIndexGetsAFileThatFailedAsWell)
{
    const ZipFile& archive = archiveOf({storedItem("pkg/empty", ""), storedItem("pkg/b", "1")});
    {
        const ScopedFile index(std::fopen((dir / "index").c_str(), "w"));
        EXPECT_EQ(1, extractEntries(transaction, archive, "pkg/", dir / "to", 0755, nullptr,
                                    index.get(), false));
    }

    EXPECT_EQ(dir / "to/empty" + "\n", readFile(dir / "index"));
}

TEST_F(ExtractEntriesTest, TheFirstFailureEndsTheExtraction)
{
    makeDirectories(dir / "to");

    EXPECT_EQ(1, extract({storedItem("pkg/a", "1"), storedItem("pkg/empty", ""),
                          storedItem("pkg/b", "2")}));

    EXPECT_EQ(Lines{"f 0755 a"}, tree());
}

TEST_F(ExtractEntriesTest, ADirectoryThatCannotBeMadeIsCode11)
{
    makeDirectories(dir / "to");
    writeFile(dir / "to/sub", "");

    EXPECT_EQ(11, extract({storedItem("pkg/sub/below/", "")}));
}

TEST_F(ExtractEntriesTest, AFileWithoutItsDirectoryIsCode2)
{
    EXPECT_EQ(2, extract({storedItem("pkg/missing/a", "1")}));
}

TEST_F(ExtractEntriesTest, WithoutDebugNothingIsPrinted)
{
    testing::internal::CaptureStdout();

    EXPECT_EQ(0, extract({storedItem("pkg/", ""), storedItem("pkg/a", "1")}));

    EXPECT_EQ("", testing::internal::GetCapturedStdout());
}

TEST_F(ExtractEntriesTest, DebugTracesEveryStep)
{
    const std::string to = dir / "to";
    std::string skipList;
    appendToNameList(skipList, "pkg/skipped");

    EXPECT_EQ("Src path: pkg/\n"
              "Dst path: " +
                  to +
                  "\n"
                  "Mode: 493\n"
                  "Looking at file pkg/ inside spb\n"
                  "dstName: " +
                  to +
                  "/\n"
                  "createPath: " +
                  to +
                  "/\n"
                  "Skip: pkg/skipped\n"
                  "Looking at file other inside spb\n"
                  "Looking at file pkg//a inside spb\n"
                  "dstName: " +
                  to +
                  "/a\n"
                  "extractFile: " +
                  to + "/a\n",
              traceOf({storedItem("pkg/", ""), storedItem("pkg/skipped", "1"),
                       storedItem("other", "2"), storedItem("pkg//a", "3")},
                      &skipList));
}

TEST_F(ExtractEntriesTest, DebugTracesAFailure)
{
    const std::string to = dir / "to";

    EXPECT_EQ("Src path: pkg/\nDst path: " + to + "\nMode: 493\n" +
                  "Looking at file pkg/empty inside spb\ndstName: " + to +
                  "/empty\nextractFile: " + to + "/empty\ncreatePath or extractFile failed\n",
              traceOf({storedItem("pkg/empty", "")}, nullptr, 1));
}

TEST_F(ExtractEntriesTest, DebugTracesASkippedDestination)
{
    const ZipFile& archive = archiveOf({storedItem("pkg/", "")});
    testing::internal::CaptureStdout();

    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", "", 0700, nullptr, nullptr, true));

    EXPECT_EQ("Src path: pkg/\nDst path: \nMode: 448\nLooking at file pkg/ inside spb\n"
              "dstName: /\nSkipping dstName: /\n",
              testing::internal::GetCapturedStdout());
}

TEST_F(ExtractEntriesTest, ADestinationOfTwoCharactersIsNotSkipped)
{
    const ZipFile& archive = archiveOf({storedItem("pkg/", "")});
    testing::internal::CaptureStdout();

    EXPECT_EQ(0, extractEntries(transaction, archive, "pkg/", ".", 0700, nullptr, nullptr, true));

    EXPECT_EQ("Src path: pkg/\nDst path: .\nMode: 448\nLooking at file pkg/ inside spb\n"
              "dstName: ./\ncreatePath: ./\n",
              testing::internal::GetCapturedStdout());
}

TEST_F(ExtractEntriesTest, ASignalStopsItBeforeTheNextEntry)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt start("");

        EXPECT_EQ(14, extract({storedItem("pkg/a", "1")}));
    }));

    EXPECT_FALSE(pathExists(dir / "to"));
}

class ExtractPackageTest : public InstallerTest {
protected:
    ExtractPackageTest() { installation.homeDirectory = home; }

    int extract(const PackageFiles& files, bool fresh = true)
    {
        usePackage(dir / "package.spb", files);
        return extractPackage(spbPackage, transaction, installation, fresh, &indexPath);
    }

    const std::string home = dir / "zor";
    const std::string indexPath = dir / "index/ZOR_files";
    InstallRegistry installation;
    PackageFiles toolkit = toolkitFiles("/dev/null");
};

TEST_F(ExtractPackageTest, ADirOfThePackageGoesToTheSameDirOfTheTarget)
{
    usePackage(dir / "package.spb", toolkit);
    const ZipFile archive(spbPackage.c_str());

    EXPECT_EQ(0, extractDir(transaction, archive, home, "config/xss", 0755, nullptr, false));

    EXPECT_EQ(Lines({"d 0755 config", "d 0755 config/xss", "f 0755 config/xss/schema.xss"}),
              treeOf(home));
}

TEST_F(ExtractPackageTest, ADirOfThePackageIsListedAndTraced)
{
    usePackage(dir / "package.spb", {{"bin/", ""}, {"bin/a", "1"}});
    const ZipFile archive(spbPackage.c_str());
    testing::internal::CaptureStdout();
    {
        const ScopedFile index(std::fopen((dir / "list").c_str(), "w"));
        EXPECT_EQ(0, extractDir(transaction, archive, home + "/", "bin", 0700, index.get(), true));
    }

    EXPECT_EQ(home + "/bin/a\n", readFile(dir / "list"));
    EXPECT_EQ(0U, testing::internal::GetCapturedStdout().find(
                      "Src path: " + Root + "bin/\n" + "Dst path: " + home + "/bin\nMode: 448\n"));
}

TEST_F(ExtractPackageTest, ExtractsEveryPackageDirectoryWithItsMode)
{
    EXPECT_EQ(0, extract(toolkit));

    EXPECT_EQ(
        Lines({"d 0755 bin", "f 0755 bin/trawlcfg", "f 0755 bin/trawlfs", "f 0755 bin/trawlhw",
               "d 0755 config", "f 0755 config/Zor.properties", "f 0755 config/ZorHWConfig.xml",
               "f 0755 config/ZorTrace.properties", "d 0755 config/xss",
               "f 0755 config/xss/schema.xss", "f 0755 config/xss/schema.xss.bak", "d 0750 install",
               "f 0750 install/rmdirs.sh", "f 0750 install/trawlcfg.sh", "d 0755 properties",
               "f 0755 properties/scan.properties"}),
        treeOf(home));
    EXPECT_EQ("depth=4\n", readFile(home + "/properties/scan.properties"));
}

TEST_F(ExtractPackageTest, LogsItsSteps)
{
    EXPECT_EQ(0, extract(toolkit));

    EXPECT_EQ("Starting file extraction...\nExtracting configs to '" + home + "/config'\n",
              log.text());
}

TEST_F(ExtractPackageTest, TheTransactionUndoesTheWholeExtraction)
{
    ASSERT_EQ(0, extract(toolkit));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_FALSE(pathExists(home));
}

TEST_F(ExtractPackageTest, TheXssFilesAreExtractedTwice)
{
    EXPECT_EQ(0, extract({{"config/", ""}, {"config/xss/", ""}, {"config/xss/a", "new"}}));

    const std::string file = home + "/config/xss/a";
    EXPECT_EQ("4 " + dir / "index" + "\n4 " + home + "\n4 " + home + "/config\n4 " + home +
                  "/config/xss\n2 " + file + "\n1 " + file + "\n2 " + file + "\n",
              journalText(transaction));
    EXPECT_EQ("new", readFile(file + ".bak"));
}

TEST_F(ExtractPackageTest, FilesOutsideOfThePackageDirectoriesAreIgnored)
{
    EXPECT_EQ(0, extract({{"bin/", ""}, {"docs/readme", "1"}, {"readme", "2"}, {"bin2/a", "3"}}));

    EXPECT_EQ(Lines{"d 0755 bin"}, treeOf(home));
}

TEST_F(ExtractPackageTest, NamesOfAnotherPlatformExtractNothingAndSucceed)
{
    ZipArchive archive;
    archive.items.push_back(storedItem("bin/a", "1"));
    archive.items.push_back(
        storedItem("/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/aix-ppc/bin/a", "2"));
    writeFile(dir / "package.spb", zipBytes(archive));
    useCompleteLayoutNames();

    EXPECT_EQ(0, extractPackage(dir / "package.spb", transaction, installation, true, nullptr));

    EXPECT_FALSE(pathExists(home));
}

TEST_F(ExtractPackageTest, AFreshInstallationReplacesTheMainPropertyFile)
{
    makeDirectories(home + "/config");
    writeFile(home + "/config/Zor.properties", "mine");

    EXPECT_EQ(0, extract({{"config/Zor.properties", "theirs"}}, true));

    EXPECT_EQ("theirs", readFile(home + "/config/Zor.properties"));
    EXPECT_EQ("mine", readFile(home + "/config/Zor.properties.bak"));
}

TEST_F(ExtractPackageTest, AnUpgradeLeavesTheMainPropertyFileAloneWithoutAMessage)
{
    debugMode = true;
    makeDirectories(home + "/config");
    writeFile(home + "/config/Zor.properties", "mine");
    testing::internal::CaptureStdout();

    EXPECT_EQ(0, extract({{"config/Zor.properties", "theirs"},
                          {"config/ZorTrace.properties", "theirs"},
                          {"config/xss/Zor.properties/", ""}},
                         false));

    EXPECT_EQ("mine", readFile(home + "/config/Zor.properties"));
    EXPECT_FALSE(pathExists(home + "/config/Zor.properties.bak"));
    EXPECT_EQ("theirs", readFile(home + "/config/ZorTrace.properties"));
    EXPECT_TRUE(pathExists(home + "/config/xss/Zor.properties"));
    EXPECT_EQ(std::string::npos, testing::internal::GetCapturedStdout().find("Skip: "));
}

TEST_F(ExtractPackageTest, EveryDirectoryButTheConfigurationIsTracedInDebugMode)
{
    debugMode = true;
    testing::internal::CaptureStdout();

    EXPECT_EQ(0, extract(toolkit));

    const std::string traces = testing::internal::GetCapturedStdout();
    Lines sources;
    std::istringstream lines(traces);
    for (std::string line; std::getline(lines, line);) {
        if (line.starts_with("Src path: "))
            sources.push_back(line);
    }
    EXPECT_EQ(Lines({"Src path: " + Root + "bin/", "Src path: " + Root + "properties/",
                     "Src path: " + Root + "config/xss/", "Src path: " + Root + "install/"}),
              sources);
}

TEST_F(ExtractPackageTest, TheInstallersUmaskIsInForceAndThePreviousOneRestored)
{
    globalFilesUmask = 022;
    (void)umask(077);

    EXPECT_EQ(0, extract({{"bin/", ""}, {"properties/", ""}, {"config/", ""}, {"install/", ""}}));

    EXPECT_EQ(Lines({"d 0755 bin", "d 0755 config", "d 0750 install", "d 0755 properties"}),
              treeOf(home));
    EXPECT_EQ(0755U, modeOf(dir / "index"));
    EXPECT_EQ(0644U, modeOf(indexPath));
    EXPECT_EQ(077U, umask(022));
}

TEST_F(ExtractPackageTest, AMissingOrEmptyOrInvalidPackageIsCode1AndChangesNothing)
{
    writeFile(dir / "empty.spb", zipBytes({}));
    writeFile(dir / "invalid.spb", "no archive");
    for (const char* const name : {"missing.spb", "empty.spb", "invalid.spb"})
        EXPECT_EQ(1, extractPackage(dir / name, transaction, installation, true, &indexPath))
            << name;

    const std::string message = "Starting file extraction...\n"
                                "*** Error: package not found or not valid.\n";
    EXPECT_EQ(message + message + message, log.text());
    EXPECT_FALSE(pathExists(dir / "index"));
    EXPECT_FALSE(pathExists(home));
}

TEST_F(ExtractPackageTest, AMissingPackageLeavesTheIndex)
{
    makeDirectories(dir / "index");
    writeFile(indexPath, "/of/an/earlier/installation\n");

    EXPECT_EQ(1, extractPackage(dir / "missing", transaction, installation, true, &indexPath));

    EXPECT_EQ("/of/an/earlier/installation\n", readFile(indexPath));
}

TEST_F(ExtractPackageTest, TheIndexListsEachFileOnceAndTheInstallersOwnFiles)
{
    EXPECT_EQ(0, extract({{"bin/", ""},
                          {"bin/a", "1"},
                          {"config/", ""},
                          {"config/xss/", ""},
                          {"config/xss/b", "2"}}));

    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on TIME\n" + home +
                  "/bin/a\n" + home + "/bin/libzor.so\n" + home + "/config/SingleUserMode\n" +
                  home + "/config/Zor.tmp\n" + home + "/config/xss/b\n" + home + "/zor.log\n" +
                  home + "/zor.log.bak\n",
              withoutTime(readFile(indexPath)));
    EXPECT_EQ(nullptr, zor_file_handle);
}

TEST_F(ExtractPackageTest, TheIndexKeepsTheFilesOfEarlierInstallations)
{
    makeDirectories(dir / "index");
    writeFile(indexPath, "# an older header\n/earlier/a\n" + home + "/bin/a\n");

    EXPECT_EQ(0, extract({{"bin/", ""}, {"bin/a", "1"}}));

    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on TIME\n"
              "/earlier/a\n" +
                  home + "/bin/a\n" + home + "/bin/libzor.so\n" + home +
                  "/config/SingleUserMode\n" + home + "/config/Zor.tmp\n" + home + "/zor.log\n" +
                  home + "/zor.log.bak\n",
              withoutTime(readFile(indexPath)));
}

TEST_F(ExtractPackageTest, WithoutAnIndexPathNoIndexIsWritten)
{
    usePackage(dir / "package.spb", toolkit);

    EXPECT_EQ(0, extractPackage(spbPackage, transaction, installation, true, nullptr));

    EXPECT_FALSE(pathExists(dir / "index"));
    EXPECT_TRUE(pathExists(home + "/bin/trawlcfg"));
}

TEST_F(ExtractPackageTest, AFailureWithoutAnIndexPathHasItsCode)
{
    usePackage(dir / "package.spb", {{"bin/", ""}, {"bin/empty", ""}});

    EXPECT_EQ(1, extractPackage(spbPackage, transaction, installation, true, nullptr));

    EXPECT_EQ(Lines{"d 0755 bin"}, treeOf(home));
}

TEST_F(ExtractPackageTest, AnIndexThatCannotBeOpenedOnlyCausesAWarning)
{
    makeDirectories(indexPath);

    EXPECT_EQ(0, extract({{"bin/", ""}, {"bin/a", "1"}}));

    EXPECT_EQ("Starting file extraction...\n"
              "Warning! Failed to create install log file: " +
                  indexPath + "\nExtracting configs to '" + home + "/config'\n",
              log.text());
    EXPECT_EQ("1", readFile(home + "/bin/a"));
}

TEST_F(ExtractPackageTest, TheDirectoriesOfTheIndexAreJournalledAndTheIndexItselfIsNot)
{
    EXPECT_EQ(0, extract({{"bin/", ""}}));

    EXPECT_EQ("4 " + dir / "index" + "\n4 " + home + "\n4 " + home + "/bin\n",
              journalText(transaction));
}

TEST_F(ExtractPackageTest, AFailureInBinIsLoggedSeparately)
{
    EXPECT_EQ(1, extract({{"bin/", ""}, {"bin/empty", ""}, {"properties/", ""}}));

    EXPECT_EQ("Starting file extraction...\n"
              "Bin dir file extraction failed\n"
              "File extraction failed, error = 1 (Cannot open file for reading)\n",
              log.text());
    EXPECT_EQ(Lines{"d 0755 bin"}, treeOf(home));
}

TEST_F(ExtractPackageTest, AFailureInPropertiesEndsTheExtraction)
{
    EXPECT_EQ(1, extract({{"properties/", ""}, {"properties/empty", ""}, {"config/", ""}}));

    EXPECT_EQ("Starting file extraction...\n"
              "File extraction failed, error = 1 (Cannot open file for reading)\n",
              log.text());
    EXPECT_EQ(Lines{"d 0755 properties"}, treeOf(home));
}

TEST_F(ExtractPackageTest, AFailureInConfigEndsTheExtraction)
{
    EXPECT_EQ(2, extract({{"config/", ""}, {"config/missing/a", "1"}, {"install/", ""}}));

    EXPECT_EQ("Starting file extraction...\n"
              "Extracting configs to '" +
                  home +
                  "/config'\n"
                  "File extraction failed, error = 2 (Cannot open file for writing)\n",
              log.text());
    EXPECT_EQ(Lines{"d 0755 config"}, treeOf(home));
}

TEST_F(ExtractPackageTest, AFailureInTheSecondPassOverXssEndsTheExtraction)
{
    makeDirectories(home + "/config/xss/a.bak");

    EXPECT_EQ(9, extract({{"config/xss/a", "1"}, {"install/", ""}}));

    EXPECT_EQ("Starting file extraction...\n"
              "Extracting configs to '" +
                  home +
                  "/config'\n"
                  "File extraction failed, error = 9 (Cannot rename file)\n",
              log.text());
    EXPECT_FALSE(pathExists(home + "/install"));
}

TEST_F(ExtractPackageTest, AFailureInInstallFailsTheExtraction)
{
    makeDirectories(home);
    writeFile(home + "/install", "in the way");

    EXPECT_EQ(11, extract({{"bin/", ""}, {"install/sub/", ""}}));

    EXPECT_EQ("Starting file extraction...\n"
              "Extracting configs to '" +
                  home +
                  "/config'\n"
                  "File extraction failed, error = 11 (Cannot create directory)\n",
              log.text());
}

TEST_F(ExtractPackageTest, AFailureDeletesTheIndex)
{
    makeDirectories(dir / "index");
    writeFile(indexPath, "/of/an/earlier/installation\n");

    EXPECT_EQ(1, extract({{"bin/", ""}, {"bin/empty", ""}}));

    EXPECT_FALSE(pathExists(indexPath));
    EXPECT_EQ(nullptr, zor_file_handle);
}

TEST_F(ExtractPackageTest, WhileItIsWrittenTheIndexListsTheXssFilesTwice)
{
    usePackage(dir / "package.spb", {{"bin/", ""},
                                     {"bin/b", "1"},
                                     {"bin/a", "2"},
                                     {"config/", ""},
                                     {"config/xss/", ""},
                                     {"config/xss/c", "3"}});
    const ZipFile archive(spbPackage.c_str());
    {
        const ScopedFile index(std::fopen((dir / "list").c_str(), "w"));
        for (const char* const name : {"bin", "config", "config/xss"})
            EXPECT_EQ(0, extractDir(transaction, archive, home, name, 0755, index.get(), false));
    }

    EXPECT_EQ(home + "/bin/b\n" + home + "/bin/a\n" + home + "/config/xss/c\n" + home +
                  "/config/xss/c\n",
              readFile(dir / "list"));
}

} // namespace
