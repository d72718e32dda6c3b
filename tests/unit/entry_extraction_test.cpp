#include "entry_extraction.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "safe_path.h"
#include "sample_bytes.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

#ifdef SYS_fcntl64
constexpr long FcntlCall = SYS_fcntl64;
constexpr long SeekCall = SYS__llseek;
#else
constexpr long FcntlCall = SYS_fcntl;
constexpr long SeekCall = SYS_lseek;
#endif

class ExtractFileTest : public InstallerTest {
protected:
    /// Extracts the one entry of an archive that holds `item`.
    int extract(const ZipItem& item, const std::string& destination, mode_t mode)
    {
        const std::string path = dir / "package.spb";
        writeFile(path, zipBytes({{item}}));
        const ZipFile archive(path.c_str());
        EXPECT_EQ(1U, archive.entries().size());
        return extractFile(transaction, archive, &archive.entries().at(0), destination, mode);
    }

    /// Expects `code` for a damaged entry while the system call `number` fails with `error`.
    void expectOfDamaged(int code, long number, int error)
    {
        const std::string path = dir / "package.spb";
        ZipItem damaged = deflatedItem("a", textBytes(500, 1));
        damaged.data[0] = '\xFF';
        writeFile(path, zipBytes({{damaged}}));
        const ZipFile archive(path.c_str());
        EXPECT_TRUE(passesInChild([&] {
            failSystemCall(number, error);
            EXPECT_EQ(code,
                      extractFile(transaction, archive, &archive.entries().at(0), dir / "a", 0));
        }));
    }
};

TEST_F(ExtractFileTest, WritesStoredAndDeflatedEntriesOfAnySize)
{
    for (const std::size_t size : {1U, 8191U, 8192U, 8193U, 16384U, 300000U}) {
        EXPECT_EQ(0, extract(storedItem("a", noiseBytes(size, 1)), dir / "stored", 0644)) << size;
        EXPECT_EQ(0, extract(deflatedItem("a", noiseBytes(size, 1)), dir / "deflated", 0644))
            << size;

        EXPECT_EQ(noiseBytes(size, 1), readFile(dir / "stored")) << size;
        EXPECT_EQ(noiseBytes(size, 1), readFile(dir / "deflated")) << size;
    }
}

TEST_F(ExtractFileTest, RecordsANewFileAsCreated)
{
    EXPECT_EQ(0, extract(storedItem("a", "new"), dir / "file", 0644));

    EXPECT_EQ("2 " + dir / "file" + "\n", journalText(transaction));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
}

TEST_F(ExtractFileTest, BacksUpTheFileThatItReplaces)
{
    writeFile(dir / "file", "old");

    EXPECT_EQ(0, extract(storedItem("a", "new"), dir / "file", 0644));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ("old", readFile(dir / "file.bak"));
    EXPECT_EQ("1 " + dir / "file" + "\n2 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(ExtractFileTest, OverwritesInPlaceInATransactionWithoutBackups)
{
    transaction.backup = false;
    writeFile(dir / "file", "old and longer");

    EXPECT_EQ(0, extract(storedItem("a", "new"), dir / "file", 0644));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
    EXPECT_EQ("2 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(ExtractFileTest, AnArchiveThatAnEntryReplacesIsReadAgain)
{
    const std::string path = dir / "package.spb";
    writeFile(path, zipBytes({{storedItem("a", "first"), storedItem("b", "replacing"),
                               storedItem("c", "third")}}));
    writeFile(dir / "a", "old");
    const ZipFile archive(path.c_str());
    OpenPackage package(archive);
    const auto extract = [&](std::size_t index, const std::string& destination) {
        return extractOpenFile(transaction, package, &archive.entries().at(index), destination,
                               0644);
    };

    EXPECT_EQ(0, extract(0, dir / "a"));
    EXPECT_EQ(0, extract(1, path));
    EXPECT_EQ(0, extract(2, dir / "c"));

    EXPECT_EQ("first", readFile(dir / "a"));
    EXPECT_EQ("", readFile(dir / "c")) << "what replaced the archive is too short for it";
}

TEST_F(ExtractFileTest, AnArchiveWhosePathAnEntryReplacesIsGone)
{
    makeDirectories(dir / "media");
    ASSERT_EQ(0, symlink("media", (dir / "link").c_str()));
    writeFile(dir / "media/package.spb",
              zipBytes({{storedItem("a", "replacing"), storedItem("b", "second")}}));
    const ZipFile archive((dir / "link/package.spb").c_str());
    OpenPackage package(archive);
    const auto extract = [&](std::size_t index, const std::string& destination) {
        return extractOpenFile(transaction, package, &archive.entries().at(index), destination,
                               0644);
    };

    EXPECT_EQ(0, extract(0, dir / "link"));
    EXPECT_EQ(1, extract(1, dir / "b"));

    EXPECT_EQ("replacing", readFile(dir / "link"));
}

TEST_F(ExtractFileTest, AnArchiveThatAnEntryOverwritesInPlaceIsReadAgain)
{
    transaction.backup = false;
    const std::string path = dir / "package.spb";
    writeFile(path, zipBytes({{deflatedItem("a", textBytes(500, 1)), storedItem("b", "new"),
                               deflatedItem("c", textBytes(500, 2))}}));
    const ZipFile archive(path.c_str());
    OpenPackage package(archive);

    EXPECT_EQ(0, extractOpenFile(transaction, package, &archive.entries().at(0), dir / "a", 0644));
    EXPECT_EQ(0, extractOpenFile(transaction, package, &archive.entries().at(1), path, 0644));
    EXPECT_EQ(0, extractOpenFile(transaction, package, &archive.entries().at(2), dir / "c", 0644));

    EXPECT_EQ(textBytes(500, 1), readFile(dir / "a"));
    EXPECT_EQ("", readFile(dir / "c")) << "what overwrote the archive is too short for it";
}

TEST_F(ExtractFileTest, AnArchiveThatIsGoneWhenAFileIsOverwrittenIsCode1)
{
    transaction.backup = false;
    const std::string path = dir / "package.spb";
    writeFile(path, zipBytes({{storedItem("a", "first"), storedItem("b", "second")}}));
    writeFile(dir / "a", "old");
    const ZipFile archive(path.c_str());
    OpenPackage package(archive);
    ASSERT_NE(nullptr, package.open(&archive.entries().at(0)));
    ASSERT_EQ(0, unlink(path.c_str()));

    EXPECT_EQ(0, extractOpenFile(transaction, package, &archive.entries().at(0), dir / "a", 0644));
    EXPECT_EQ(1, extractOpenFile(transaction, package, &archive.entries().at(1), dir / "b", 0644));

    EXPECT_EQ("first", readFile(dir / "a"));
}

TEST_F(ExtractFileTest, ADamagedEntryWithoutADescriptorForItsStreamIsCode1)
{
    expectOfDamaged(1, FcntlCall, EMFILE);
}

TEST_F(ExtractFileTest, ADamagedEntryWhoseFileCannotBeRewoundIsCode5)
{
    expectOfDamaged(5, SeekCall, EIO);
}

TEST_F(ExtractFileTest, SetsExactlyTheModeWhateverTheUmask)
{
    (void)umask(077);

    EXPECT_EQ(0, extract(storedItem("a", "x"), dir / "open", 0777));
    EXPECT_EQ(0, extract(storedItem("a", "x"), dir / "closed", 0400));

    EXPECT_EQ(0777U, modeOf(dir / "open"));
    EXPECT_EQ(0400U, modeOf(dir / "closed"));
}

TEST_F(ExtractFileTest, Mode0LeavesThePermissionsOfTheCreation)
{
    (void)umask(027);

    EXPECT_EQ(0, extract(storedItem("a", "x"), dir / "file", 0));

    EXPECT_EQ(0640U, modeOf(dir / "file"));
}

TEST_F(ExtractFileTest, AModeThatCannotBeSetIsNotAFailure)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fchmod, EPERM);
        failSystemCall(SYS_chmod, EPERM);
        EXPECT_EQ(0, extract(storedItem("a", "x"), dir / "file", 0755));
    }));

    EXPECT_EQ("x", readFile(dir / "file"));
}

TEST_F(ExtractFileTest, AnEntryWithoutAStreamIsCode1AndChangesNothing)
{
    writeFile(dir / "file", "old");
    ZipItem unknownMethod = storedItem("a", "x");
    unknownMethod.local.method = unknownMethod.central.method = 12;

    EXPECT_EQ(1, extract(storedItem("a", ""), dir / "file", 0755));
    EXPECT_EQ(1, extract(unknownMethod, dir / "file", 0755));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_EQ(0644U, modeOf(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(ExtractFileTest, AFileThatCannotBeBackedUpIsCode9AndStays)
{
    writeFile(dir / "file", "old");
    makeDirectories(dir / "file.bak");

    EXPECT_EQ(9, extract(storedItem("a", "new"), dir / "file", 0644));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(ExtractFileTest, ADestinationThatCannotBeOpenedIsCode2AndHasNoEntry)
{
    EXPECT_EQ(2, extract(storedItem("a", "new"), dir / "missing/file", 0644));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(ExtractFileTest, AWriteThatIsDeniedIsCode7AndItsFileIsRecorded)
{
    EXPECT_TRUE(passesInChild([&] {
        const std::string path = dir / "package.spb";
        writeFile(path, zipBytes({{deflatedItem("a", "new")}}));
        const ZipFile archive(path.c_str());
        failSystemCall(SYS_write, EACCES);

        EXPECT_EQ(7, extractFile(transaction, archive, &archive.entries().at(0), dir / "file", 0));

        EXPECT_EQ("2 " + dir / "file" + "\n", journalText(transaction));
    }));
}

TEST_F(ExtractFileTest, AnyOtherFailureToWriteIsCode5)
{
    EXPECT_TRUE(passesInChild([&] {
        const std::string path = dir / "package.spb";
        writeFile(path, zipBytes({{deflatedItem("a", "new")}}));
        const ZipFile archive(path.c_str());
        failSystemCall(SYS_write, EIO);

        EXPECT_EQ(5, extractFile(transaction, archive, &archive.entries().at(0), dir / "file", 0));
    }));
}

TEST_F(ExtractFileTest, ABlockThatFailsOnlyAsTheFileIsClosedIsAFailedWrite)
{
    EXPECT_TRUE(passesInChild([&] {
        const std::string path = dir / "package.spb";
        writeFile(path, zipBytes({{storedItem("a", "new")}}));
        const ZipFile archive(path.c_str());
        failSystemCall(SYS_close, ENOSPC);

        EXPECT_EQ(6, extractFile(transaction, archive, &archive.entries().at(0), dir / "file", 0));
    }));
}

TEST_F(ExtractFileTest, AFileThatFailedIsNotGivenItsMode)
{
    transaction.backup = false;
    const mode_t before = modeOf("/dev/full");

    EXPECT_EQ(6, extract(storedItem("a", "new"), "/dev/full", 0700));

    EXPECT_EQ(before, modeOf("/dev/full"));
}

class FullDiskExtractionTest : public MachineTest {
protected:
    void SetUp() override
    {
        MachineTest::SetUp();
        if (!HasFatalFailure())
            makeDirectories(dir / "disk");
    }
};

TEST_F(FullDiskExtractionTest, AnEntryThatDoesNotFitIsCode6AndIsUndoneByARollback)
{
    writeFile(dir / "package.spb", zipBytes({{deflatedItem("a", noiseBytes(100000, 1))}}));
    const ZipFile archive((dir / "package.spb").c_str());
    const SmallDisk disk(dir / "disk", 64);
    writeFile(dir / "disk/file", "old");

    EXPECT_EQ(6, extractFile(transaction, archive, &archive.entries().at(0), dir / "disk/file", 0));
    EXPECT_EQ("1 " + dir / "disk/file" + "\n2 " + dir / "disk/file" + "\n",
              journalText(transaction));
    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "disk/file"));
    EXPECT_FALSE(pathExists(dir / "disk/file.bak"));
}

TEST_F(FullDiskExtractionTest, ASmallFileOnAFullDiskIsCode6)
{
    writeFile(dir / "package.spb", zipBytes({{storedItem("a", "x")}}));
    const ZipFile archive((dir / "package.spb").c_str());
    const SmallDisk disk(dir / "disk", 64);
    writeFile(dir / "disk/filler", std::string(65536, 'x'));

    EXPECT_EQ(6, extractFile(transaction, archive, &archive.entries().at(0), dir / "disk/file", 0));
}

} // namespace
