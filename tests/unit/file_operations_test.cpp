#include "file_operations.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "sample_bytes.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

using CopyFileTest = InstallerTest;

TEST_F(CopyFileTest, CopiesEveryByteOfFilesOfAnySize)
{
    for (const std::size_t size : {0U, 1U, 4095U, 4096U, 4097U, 100000U}) {
        writeFile(dir / "source", noiseBytes(size, 1));

        EXPECT_EQ(0, copyFile(dir / "source", dir / "copy")) << size;

        EXPECT_EQ(noiseBytes(size, 1), readFile(dir / "copy")) << size;
        EXPECT_EQ(noiseBytes(size, 1), readFile(dir / "source")) << size;
    }
}

TEST_F(CopyFileTest, NothingOfALongerDestinationStays)
{
    writeFile(dir / "source", "new");
    writeFile(dir / "copy", "old and longer");

    EXPECT_EQ(0, copyFile(dir / "source", dir / "copy"));

    EXPECT_EQ("new", readFile(dir / "copy"));
}

TEST_F(CopyFileTest, AnExistingDestinationKeepsItsMode)
{
    writeFile(dir / "source", "new");
    writeFile(dir / "copy", "old");
    ASSERT_EQ(0, chmod((dir / "copy").c_str(), 0751));

    EXPECT_EQ(0, copyFile(dir / "source", dir / "copy"));

    EXPECT_EQ(0751U, modeOf(dir / "copy"));
}

TEST_F(CopyFileTest, AMissingSourceIsCode1AndCreatesNoDestination)
{
    EXPECT_EQ(1, copyFile(dir / "missing", dir / "copy"));

    EXPECT_FALSE(pathExists(dir / "copy"));
}

TEST_F(CopyFileTest, AMissingSourceLeavesTheDestinationAsItWas)
{
    writeFile(dir / "copy", "old");

    EXPECT_EQ(1, copyFile(dir / "missing", dir / "copy"));

    EXPECT_EQ("old", readFile(dir / "copy"));
}

TEST_F(CopyFileTest, ADestinationThatCannotBeOpenedIsCode2)
{
    writeFile(dir / "source", "content");

    EXPECT_EQ(2, copyFile(dir / "source", dir / "missing/copy"));
}

TEST_F(CopyFileTest, ASourceThatCannotBeReadIsCode4)
{
    makeDirectories(dir / "source");

    EXPECT_EQ(4, copyFile(dir / "source", dir / "copy"));
}

TEST_F(CopyFileTest, AFullDiskIsCode6)
{
    writeFile(dir / "source", "content");

    EXPECT_EQ(6, copyFile(dir / "source", "/dev/full"));
}

TEST_F(CopyFileTest, AWriteThatIsDeniedIsCode7)
{
    writeFile(dir / "source", "content");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_write, EACCES);
        EXPECT_EQ(7, copyFile(dir / "source", dir / "copy"));
    }));
}

TEST_F(CopyFileTest, AnyOtherFailureToWriteIsCode5)
{
    writeFile(dir / "source", "content");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_write, EIO);
        EXPECT_EQ(5, copyFile(dir / "source", dir / "copy"));
    }));
}

TEST_F(CopyFileTest, ABlockThatFailsOnlyAsTheFileIsClosedIsAFailedWrite)
{
    writeFile(dir / "source", "content");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_close, ENOSPC);
        EXPECT_EQ(6, copyFile(dir / "source", dir / "copy"));
    }));
}

TEST_F(CopyFileTest, ANewDestinationGetsTheModeThatTheUmaskLeaves)
{
    writeFile(dir / "source", "content");
    (void)umask(027);

    EXPECT_EQ(0, copyFile(dir / "source", dir / "copy"));

    EXPECT_EQ(0640U, modeOf(dir / "copy"));
}

using BackupCopyTest = InstallerTest;

TEST_F(BackupCopyTest, CopiesTheFileAndRecordsItAsBackedUpAndThenAsCreated)
{
    writeFile(dir / "zor.ini", "old");

    EXPECT_EQ(0, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_EQ("old", readFile(dir / "zor.ini"));
    EXPECT_EQ("old", readFile(dir / "zor.ini.bak"));
    EXPECT_EQ("1 " + dir / "zor.ini" + "\n2 " + dir / "zor.ini" + "\n", journalText(transaction));
}

TEST_F(BackupCopyTest, DoesNotAskWhetherTheTransactionKeepsBackups)
{
    transaction.backup = false;
    writeFile(dir / "zor.ini", "old");

    EXPECT_EQ(0, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_EQ("old", readFile(dir / "zor.ini.bak"));
    EXPECT_EQ(2U, transaction.journal.size());
}

TEST_F(BackupCopyTest, ReplacesAnOlderBackup)
{
    writeFile(dir / "zor.ini", "old");
    writeFile(dir / "zor.ini.bak", "older and longer");

    EXPECT_EQ(0, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_EQ("old", readFile(dir / "zor.ini.bak"));
}

TEST_F(BackupCopyTest, TheBackupHasTheModeOfTheFile)
{
    writeFile(dir / "zor.ini", "old");
    ASSERT_EQ(0, chmod((dir / "zor.ini").c_str(), 02751));

    EXPECT_EQ(0, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_EQ(02751U, modeOf(dir / "zor.ini.bak"));
}

TEST_F(BackupCopyTest, AFailedCopyReturnsItsCodeAndLeavesNoBackupAndNoEntry)
{
    makeDirectories(dir / "zor.ini");

    EXPECT_EQ(4, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_FALSE(pathExists(dir / "zor.ini.bak"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(BackupCopyTest, AMissingFileIsCode1AndDeletesTheOlderBackup)
{
    writeFile(dir / "zor.ini.bak", "older");

    EXPECT_EQ(1, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_FALSE(pathExists(dir / "zor.ini.bak"));
}

TEST_F(BackupCopyTest, ABackupThatCannotBeOpenedIsCode2)
{
    writeFile(dir / "zor.ini", "old");
    makeDirectories(dir / "zor.ini.bak");

    EXPECT_EQ(2, backupCopy(transaction, dir / "zor.ini"));

    EXPECT_TRUE(transaction.journal.empty());
}

class FullDiskTest : public MachineTest {
protected:
    void SetUp() override
    {
        MachineTest::SetUp();
        if (!HasFatalFailure())
            makeDirectories(dir / "disk");
    }
};

TEST_F(FullDiskTest, ACopyThatDoesNotFitIsCode6AndLeavesWhatFits)
{
    writeFile(dir / "source", noiseBytes(100000, 1));
    const SmallDisk disk(dir / "disk", 64);

    EXPECT_EQ(6, copyFile(dir / "source", dir / "disk/copy"));

    EXPECT_EQ(noiseBytes(65536, 1), readFile(dir / "disk/copy"));
}

using CopyFileWithBackupTest = InstallerTest;

TEST_F(CopyFileWithBackupTest, RecordsANewFileAsCreated)
{
    writeFile(dir / "source", "new");

    EXPECT_EQ(0, copyFileWithBackup(transaction, dir / "source", dir / "file"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ("2 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(CopyFileWithBackupTest, BacksUpTheFileThatItReplaces)
{
    writeFile(dir / "source", "new");
    writeFile(dir / "file", "old");

    EXPECT_EQ(0, copyFileWithBackup(transaction, dir / "source", dir / "file"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ("old", readFile(dir / "file.bak"));
    EXPECT_EQ("1 " + dir / "file" + "\n2 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(CopyFileWithBackupTest, OverwritesInPlaceInATransactionWithoutBackups)
{
    transaction.backup = false;
    writeFile(dir / "source", "new");
    writeFile(dir / "file", "old");

    EXPECT_EQ(0, copyFileWithBackup(transaction, dir / "source", dir / "file"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
    EXPECT_EQ("2 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(CopyFileWithBackupTest, AFileThatCannotBeBackedUpIsCode9AndStays)
{
    writeFile(dir / "source", "new");
    writeFile(dir / "file", "old");
    makeDirectories(dir / "file.bak");

    EXPECT_EQ(9, copyFileWithBackup(transaction, dir / "source", dir / "file"));

    EXPECT_EQ("old", readFile(dir / "file"));
}

TEST_F(CopyFileWithBackupTest, AFailedCopyReturnsItsCodeAndOnlyTheBackupIsRecorded)
{
    makeDirectories(dir / "unreadable");
    writeFile(dir / "file", "old");

    EXPECT_EQ(4, copyFileWithBackup(transaction, dir / "unreadable", dir / "file"));

    EXPECT_EQ("", readFile(dir / "file"));
    EXPECT_EQ("1 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(CopyFileWithBackupTest, ARollbackRestoresTheBackupOverAPartlyWrittenFile)
{
    makeDirectories(dir / "unreadable");
    writeFile(dir / "file", "old");
    ASSERT_EQ(4, copyFileWithBackup(transaction, dir / "unreadable", dir / "file"));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
}

TEST_F(CopyFileWithBackupTest, APartlyWrittenNewFileOutlivesARollback)
{
    makeDirectories(dir / "unreadable");
    ASSERT_EQ(4, copyFileWithBackup(transaction, dir / "unreadable", dir / "file"));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(pathExists(dir / "file"));
}

using SetFileModeTest = InstallerTest;

TEST_F(SetFileModeTest, SetsExactlyTheModeWhateverTheUmask)
{
    writeFile(dir / "file", "");
    (void)umask(077);

    EXPECT_EQ(0, setFileMode(transaction, dir / "file", 0777));

    EXPECT_EQ(0777U, modeOf(dir / "file"));
}

TEST_F(SetFileModeTest, AModeThatCannotBeSetIsCode13)
{
    EXPECT_EQ(13, setFileMode(transaction, dir / "missing", 0644));
}

TEST_F(SetFileModeTest, IsNotJournalled)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(0, setFileMode(transaction, dir / "file", 0600));

    EXPECT_TRUE(transaction.journal.empty());
}

using DirectoryTest = InstallerTest;

TEST_F(DirectoryTest, IsMadeWithItsModeUnderTheUmask)
{
    EXPECT_EQ(0, makeDirectory(dir / "a", 0770));

    EXPECT_EQ(0750U, modeOf(dir / "a"));
}

TEST_F(DirectoryTest, IsMadeWith0777ForMode0)
{
    (void)umask(002);

    EXPECT_EQ(0, makeDirectory(dir / "a", 0));

    EXPECT_EQ(0775U, modeOf(dir / "a"));
}

TEST_F(DirectoryTest, ThatCannotBeMadeIsMinus1WithTheReason)
{
    makeDirectories(dir / "a");

    EXPECT_EQ(-1, makeDirectory(dir / "a", 0755));
    EXPECT_EQ(EEXIST, errno);
    EXPECT_EQ(-1, makeDirectory(dir / "missing/b", 0755));
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(DirectoryTest, IsRemovedWhenItIsEmpty)
{
    makeDirectories(dir / "a");

    EXPECT_EQ(0, removeDirectory(dir / "a"));

    EXPECT_FALSE(pathExists(dir / "a"));
}

TEST_F(DirectoryTest, ThatIsNotEmptyStays)
{
    makeDirectories(dir / "a/b");

    EXPECT_EQ(-1, removeDirectory(dir / "a"));
    EXPECT_EQ(ENOTEMPTY, errno);

    EXPECT_TRUE(pathExists(dir / "a/b"));
}

TEST_F(DirectoryTest, RemovingAFileAsADirectoryIsMinus1)
{
    writeFile(dir / "a", "");

    EXPECT_EQ(-1, removeDirectory(dir / "a"));

    EXPECT_TRUE(pathExists(dir / "a"));
}

/// Its paths are relative to the test's directory.
class CreatePathTest : public InstallerTest {
protected:
    void SetUp() override { ASSERT_EQ(0, chdir(dir.path().c_str())); }
    void TearDown() override { ASSERT_EQ(0, chdir("/")); }

    [[nodiscard]] std::vector<std::string> tree() const { return treeOf(dir.path()); }
};

using Lines = std::vector<std::string>;

TEST_F(CreatePathTest, CreatesEveryDirectoryBeforeTheLastSlash)
{
    EXPECT_EQ(0, createPath(transaction, "a/b/c", 0755));

    EXPECT_EQ(Lines({"d 0755 a", "d 0755 a/b"}), tree());
    EXPECT_EQ("4 a\n4 a/b\n", journalText(transaction));
}

TEST_F(CreatePathTest, CreatesAllOfAPathThatEndsInASlash)
{
    EXPECT_EQ(0, createPath(transaction, "a/b/", 0755));

    EXPECT_EQ(Lines({"d 0755 a", "d 0755 a/b"}), tree());
    EXPECT_EQ("4 a\n4 a/b\n", journalText(transaction));
}

TEST_F(CreatePathTest, CreatesNothingForABareName)
{
    EXPECT_EQ(0, createPath(transaction, "file", 0755));
    EXPECT_EQ(0, createPath(transaction, "", 0755));
    EXPECT_EQ(0, createPath(transaction, "/", 0755));

    EXPECT_TRUE(tree().empty());
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(CreatePathTest, SkipsWhatExists)
{
    makeDirectories(dir / "opt");
    ASSERT_EQ(0, chmod("opt", 0700));

    EXPECT_EQ(0, createPath(transaction, dir / "opt/corvan/zor/file", 0755));

    EXPECT_EQ("4 " + dir / "opt/corvan" + "\n4 " + dir / "opt/corvan/zor" + "\n",
              journalText(transaction));
    EXPECT_EQ(0700U, modeOf("opt"));
}

TEST_F(CreatePathTest, SkipsAFileOfThatName)
{
    writeFile("a", "");

    EXPECT_EQ(0, createPath(transaction, "a/b", 0755));

    EXPECT_EQ(Lines({"f 0644 a"}), tree());
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(CreatePathTest, ADirectoryThatCannotBeMadeIsCode11AndThoseAboveItStayRecorded)
{
    makeDirectories("closed/below");
    ASSERT_EQ(0, chmod("closed/below", 0555));
    const OrdinaryRights rights;

    EXPECT_EQ(11, createPath(transaction, "a/b/../../closed/below/c/d", 0755));

    EXPECT_EQ("4 a\n4 a/b\n", journalText(transaction));
}

TEST_F(CreatePathTest, ADirectoryBelowAFileIsCode11)
{
    writeFile("a", "");

    EXPECT_EQ(11, createPath(transaction, "a/b/c", 0755));
}

TEST_F(CreatePathTest, SlashesInARowMakeNoDirectoryOfTheirOwn)
{
    EXPECT_EQ(0, createPath(transaction, "a//b//", 0755));

    EXPECT_EQ(Lines({"d 0755 a", "d 0755 a/b"}), tree());
    EXPECT_EQ("4 a\n4 a//b\n", journalText(transaction));
}

TEST_F(CreatePathTest, CreatesWithTheModeUnderTheUmaskAndWith0777ForMode0)
{
    (void)umask(007);

    EXPECT_EQ(0, createPath(transaction, "a/", 0755));
    EXPECT_EQ(0, createPath(transaction, "b/", 0));

    EXPECT_EQ(Lines({"d 0750 a", "d 0770 b"}), tree());
}

TEST_F(CreatePathTest, IsUndoneByARollback)
{
    makeDirectories(dir / "here");
    ASSERT_EQ(0, createPath(transaction, "here/a/b/c/", 0755));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ(Lines({"d 0755 here"}), tree());
}

using CreateFullPathTest = CreatePathTest;

TEST_F(CreateFullPathTest, CreatesTheLastComponentToo)
{
    EXPECT_EQ(0, createFullPath(transaction, "a/b/c", 0755, nullptr));

    EXPECT_EQ(Lines({"d 0755 a", "d 0755 a/b", "d 0755 a/b/c"}), tree());
    EXPECT_EQ("4 a\n4 a/b\n4 a/b/c\n", journalText(transaction));
}

TEST_F(CreateFullPathTest, CreatesABareName)
{
    EXPECT_EQ(0, createFullPath(transaction, "a", 0755, nullptr));

    EXPECT_EQ(Lines({"d 0755 a"}), tree());
    EXPECT_EQ("4 a\n", journalText(transaction));
}

TEST_F(CreateFullPathTest, AFinalSlashMakesNoDifference)
{
    EXPECT_EQ(0, createFullPath(transaction, "a/b/", 0755, nullptr));

    EXPECT_EQ("4 a\n4 a/b\n", journalText(transaction));
}

TEST_F(CreateFullPathTest, AFileInFrontOfAFinalSlashIsSkippedToo)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(0, createFullPath(transaction, "file/", 0755, nullptr));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(CreateFullPathTest, CreatesNothingForAnEmptyPath)
{
    EXPECT_EQ(0, createFullPath(transaction, "", 0755, nullptr));

    EXPECT_TRUE(tree().empty());
}

TEST_F(CreateFullPathTest, SkipsWhatExists)
{
    makeDirectories(dir / "a");
    writeFile(dir / "a/file", "");

    EXPECT_EQ(0, createFullPath(transaction, "a", 0755, nullptr));
    EXPECT_EQ(0, createFullPath(transaction, "a/file", 0755, nullptr));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(CreateFullPathTest, TheCounterIsAlways0WhateverWasCreated)
{
    int counter = 99;

    EXPECT_EQ(0, createFullPath(transaction, "a/b/c", 0755, &counter));

    EXPECT_EQ(0, counter);
    EXPECT_EQ(3U, transaction.journal.size());
}

TEST_F(CreateFullPathTest, ADirectoryThatCannotBeMadeIsCode11)
{
    writeFile(dir / "file", "");
    int counter = 99;

    EXPECT_EQ(11, createFullPath(transaction, "file/a", 0755, &counter));
    EXPECT_EQ(11, createFullPath(transaction, "file/a/b", 0755, &counter));

    EXPECT_EQ(0, counter);
    EXPECT_TRUE(transaction.journal.empty());
}

} // namespace
