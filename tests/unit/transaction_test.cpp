#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "transaction.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include <sys/stat.h>
#include <unistd.h>

namespace {

using TransactionTest = InstallerTest;

TEST_F(TransactionTest, StartsWithBackupsAndWithoutEntries)
{
    EXPECT_TRUE(transaction.backup);
    EXPECT_TRUE(transaction.journalled);
    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_TRUE(transaction.variables.empty());
}

TEST_F(TransactionTest, RecordAppendsAtTheEnd)
{
    record(transaction, DirectoryCreated, "/a");
    record(transaction, BackedUp, "/a/b");
    record(transaction, Created, "/a/b");

    EXPECT_EQ("4 /a\n1 /a/b\n2 /a/b\n", journalText(transaction));
}

TEST_F(TransactionTest, ChangesAreCounted)
{
    EXPECT_EQ(0U, changeCount(transaction));

    record(transaction, BackedUp, "/a/b");
    record(transaction, Created, "/a/b");

    EXPECT_EQ(2U, changeCount(transaction));
}

TEST_F(TransactionTest, AFileThatFollowsItsBackupReplacedAnother)
{
    EXPECT_FALSE(lastFileReplacedAnother(transaction));
    record(transaction, Created, "/a");
    EXPECT_FALSE(lastFileReplacedAnother(transaction));
    record(transaction, BackedUp, "/b");
    record(transaction, Created, "/b");
    EXPECT_TRUE(lastFileReplacedAnother(transaction));
    record(transaction, Created, "/c");
    EXPECT_FALSE(lastFileReplacedAnother(transaction));
}

TEST_F(TransactionTest, TheFirstFileCanReplaceAnother)
{
    record(transaction, BackedUp, "/a");
    EXPECT_FALSE(lastFileReplacedAnother(transaction));

    record(transaction, Created, "/a");
    EXPECT_TRUE(lastFileReplacedAnother(transaction));
}

TEST_F(TransactionTest, ChangedDirectoriesComeInTheOrderOfTheChanges)
{
    record(transaction, DirectoryCreated, "/a/b");
    record(transaction, Created, "/a/b/x");
    record(transaction, Created, "/a/b/y");
    record(transaction, Created, "/a/z");
    record(transaction, Created, "relative");

    EXPECT_EQ((std::vector<std::string>{"/a", "/a/b", "/a", "."}), changedDirectories(transaction));
}

TEST_F(TransactionTest, ATransactionThatIsDroppedLeavesTheDiskAsItIs)
{
    writeFile(dir / "file", "new");
    writeFile(dir / "file.bak", "old");
    {
        FileTransaction dropped;
        record(dropped, BackedUp, dir / "file");
        record(dropped, Created, dir / "file");
    }

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ("old", readFile(dir / "file.bak"));
}

TEST_F(TransactionTest, RollbackPutsBackTheFileThatTheRunReplaced)
{
    writeFile(dir / "zor.ini.bak", "old");
    writeFile(dir / "zor.ini", "new");
    record(transaction, BackedUp, dir / "zor.ini");
    record(transaction, Created, dir / "zor.ini");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "zor.ini"));
    EXPECT_FALSE(pathExists(dir / "zor.ini.bak"));
}

TEST_F(TransactionTest, RollbackMovesABackupOverWhatReplacedTheFile)
{
    writeFile(dir / "file.bak", "old");
    writeFile(dir / "file", "of somebody else");
    record(transaction, BackedUp, dir / "file");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "file.bak"));
}

TEST_F(TransactionTest, RollbackDeletesFilesBeforeTheirDirectories)
{
    makeDirectories(dir / "a/b");
    writeFile(dir / "a/b/file", "new");
    record(transaction, DirectoryCreated, dir / "a");
    record(transaction, DirectoryCreated, dir / "a/b");
    record(transaction, Created, dir / "a/b/file");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(treeOf(dir.path()).empty());
}

TEST_F(TransactionTest, RollbackLeavesADirectoryThatHoldsWhatNoEntryRecorded)
{
    makeDirectories(dir / "a");
    writeFile(dir / "a/other", "");
    record(transaction, DirectoryCreated, dir / "a");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(pathExists(dir / "a/other"));
}

TEST_F(TransactionTest, RollbackNeverRemovesADirectoryInPlaceOfAFile)
{
    makeDirectories(dir / "a");
    record(transaction, Created, dir / "a");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(pathExists(dir / "a"));
}

TEST_F(TransactionTest, RollbackGoesOnAfterAFailure)
{
    writeFile(dir / "first", "new");
    record(transaction, Created, dir / "first");
    record(transaction, Created, dir / "missing");
    record(transaction, BackedUp, dir / "without backup");
    record(transaction, DirectoryCreated, dir / "no directory");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(treeOf(dir.path()).empty());
}

TEST_F(TransactionTest, RollbackLeavesABackupThatCannotBeMovedBack)
{
    writeFile(dir / "file.bak", "old");
    makeDirectories(dir / "file/in the way");
    record(transaction, BackedUp, dir / "file");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "file.bak"));
}

TEST_F(TransactionTest, RollbackEmptiesTheJournal)
{
    record(transaction, Created, dir / "file");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(TransactionTest, CommitDeletesTheBackupsAndNothingElse)
{
    makeDirectories(dir / "made");
    writeFile(dir / "first", "1");
    writeFile(dir / "first.bak", "old");
    writeFile(dir / "second", "2");
    writeFile(dir / "second.bak", "old");
    writeFile(dir / "new", "3");
    writeFile(dir / "new.bak", "nobody recorded this one");
    record(transaction, DirectoryCreated, dir / "made");
    record(transaction, BackedUp, dir / "first");
    record(transaction, Created, dir / "first");
    record(transaction, BackedUp, dir / "second");
    record(transaction, Created, dir / "second");
    record(transaction, Created, dir / "new");

    EXPECT_EQ(0, commit(transaction));

    const std::vector<std::string> left = {"f 0644 first", "d 0755 made", "f 0644 new",
                                           "f 0644 new.bak", "f 0644 second"};
    EXPECT_EQ(left, treeOf(dir.path()));
}

TEST_F(TransactionTest, CommitGoesOnWhereABackupIsMissing)
{
    writeFile(dir / "first.bak", "old");
    record(transaction, BackedUp, dir / "first");
    record(transaction, BackedUp, dir / "missing");

    EXPECT_EQ(0, commit(transaction));

    EXPECT_FALSE(pathExists(dir / "first.bak"));
}

TEST_F(TransactionTest, CommitLeavesADirectoryAtTheNameOfABackup)
{
    makeDirectories(dir / "file.bak");
    record(transaction, BackedUp, dir / "file");

    EXPECT_EQ(0, commit(transaction));

    EXPECT_TRUE(pathExists(dir / "file.bak"));
}

TEST_F(TransactionTest, CommitEmptiesTheJournal)
{
    record(transaction, BackedUp, dir / "file");

    EXPECT_EQ(0, commit(transaction));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(TransactionTest, AnEmptyJournalCommitsAndRollsBackToNothing)
{
    writeFile(dir / "file.bak", "");

    EXPECT_EQ(0, commit(transaction));
    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(pathExists(dir / "file.bak"));
}

TEST_F(TransactionTest, CommitAndRollbackSkipKindsThatTheyDoNotKnow)
{
    for (const int kind : {0, 3, 5, -1}) {
        writeFile(dir / "file", "content");
        writeFile(dir / "file.bak", "backup");
        makeDirectories(dir / "empty");
        record(transaction, kind, dir / "file");
        record(transaction, kind, dir / "empty");
        FileTransaction second = transaction;

        EXPECT_EQ(0, commit(transaction));
        EXPECT_EQ(0, rollback(second));

        EXPECT_EQ("content", readFile(dir / "file")) << kind;
        EXPECT_EQ("backup", readFile(dir / "file.bak")) << kind;
        EXPECT_TRUE(pathExists(dir / "empty")) << kind;
    }
}

TEST_F(TransactionTest, ATransactionCanBeReusedAfterItsEnd)
{
    record(transaction, BackedUp, dir / "earlier");
    EXPECT_EQ(0, commit(transaction));
    writeFile(dir / "later", "new");
    record(transaction, Created, dir / "later");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_FALSE(pathExists(dir / "later"));
}

using JournalFileTest = InstallerTest;

TEST_F(JournalFileTest, HoldsALetterABlankAndThePathOfEachEntryInOrder)
{
    record(transaction, DirectoryCreated, "/opt/corvan/zor");
    record(transaction, BackedUp, "/opt/corvan/zor/bin/trawlhw");
    record(transaction, Created, "/opt/corvan/zor/bin/trawlhw");

    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));

    EXPECT_EQ("D /opt/corvan/zor\n"
              "B /opt/corvan/zor/bin/trawlhw\n"
              "C /opt/corvan/zor/bin/trawlhw\n",
              readFile(dir / "journal"));
    EXPECT_EQ(3U, transaction.journal.size());
}

TEST_F(JournalFileTest, ShowsAnUnknownKindAsABlank)
{
    record(transaction, 3, "/a");
    record(transaction, 0, "/b");

    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));

    EXPECT_EQ("  /a\n  /b\n", readFile(dir / "journal"));
}

TEST_F(JournalFileTest, IsOverwritten)
{
    writeFile(dir / "journal", "C /of/an/older/and/longer/journal\n");
    record(transaction, Created, "/a");

    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));

    EXPECT_EQ("C /a\n", readFile(dir / "journal"));
}

TEST_F(JournalFileTest, IsEmptyForAnEmptyJournal)
{
    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));

    EXPECT_EQ("", readFile(dir / "journal"));
}

TEST_F(JournalFileTest, SavingWhereNoFileCanBeOpenedIsCode2)
{
    EXPECT_EQ(2, saveJournal(transaction, dir / "missing/journal"));
}

TEST_F(JournalFileTest, ComesBackAsItWasSaved)
{
    record(transaction, DirectoryCreated, "/opt/with a blank ");
    record(transaction, BackedUp, "/opt/b");
    record(transaction, Created, "/opt/b");
    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));
    FileTransaction loaded;

    EXPECT_EQ(0, loadJournal(loaded, dir / "journal"));

    EXPECT_EQ("4 /opt/with a blank \n1 /opt/b\n2 /opt/b\n", journalText(loaded));
}

TEST_F(JournalFileTest, LoadingReplacesTheJournal)
{
    record(transaction, Created, "/older");
    writeFile(dir / "journal", "B /loaded\n");

    EXPECT_EQ(0, loadJournal(transaction, dir / "journal"));

    EXPECT_EQ("1 /loaded\n", journalText(transaction));
}

TEST_F(JournalFileTest, LoadingAMissingFileIsCode1AndEmptiesTheJournal)
{
    record(transaction, Created, "/older");

    EXPECT_EQ(1, loadJournal(transaction, dir / "missing"));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(JournalFileTest, AFileThatCannotBeReadIsCode4)
{
    EXPECT_EQ(4, loadJournal(transaction, dir.path()));
}

TEST_F(JournalFileTest, AnEmptyFileIsAnEmptyJournal)
{
    record(transaction, Created, "/older");
    writeFile(dir / "journal", "");

    EXPECT_EQ(0, loadJournal(transaction, dir / "journal"));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(JournalFileTest, AnotherFirstLetterIsCode4AndKeepsTheEntriesBefore)
{
    writeFile(dir / "journal", "C /tmp/b\nX /tmp/a\nC /tmp/c\n");

    EXPECT_EQ(4, loadJournal(transaction, dir / "journal"));

    EXPECT_EQ("2 /tmp/b\n", journalText(transaction));
}

TEST_F(JournalFileTest, ALineOfFewerThanThreeCharactersIsCode4)
{
    for (const char* const line : {"C\n", "C \n", "\n", "C", "C "}) {
        writeFile(dir / "journal", line);
        EXPECT_EQ(4, loadJournal(transaction, dir / "journal")) << line;
        EXPECT_TRUE(transaction.journal.empty()) << line;
    }
}

TEST_F(JournalFileTest, AnUnknownKindIsNotLoaded)
{
    record(transaction, 3, "/a");
    EXPECT_EQ(0, saveJournal(transaction, dir / "journal"));

    EXPECT_EQ(4, loadJournal(transaction, dir / "journal"));
}

TEST_F(JournalFileTest, TheSecondCharacterOfALineIsSkippedWhateverItIs)
{
    writeFile(dir / "journal", "Cx/tmp/a\nD=b\n");

    EXPECT_EQ(0, loadJournal(transaction, dir / "journal"));

    EXPECT_EQ("2 /tmp/a\n4 b\n", journalText(transaction));
}

TEST_F(JournalFileTest, ALastLineWithoutNewlineCounts)
{
    writeFile(dir / "journal", "B /tmp/a");

    EXPECT_EQ(0, loadJournal(transaction, dir / "journal"));

    EXPECT_EQ("1 /tmp/a\n", journalText(transaction));
}

class VariablesTest : public ::testing::Test {
protected:
    /// `text` with the variables of the transaction in it, and the number of replacements.
    std::pair<std::string, int> substituted(std::string text) const
    {
        const int count = substituteVariables(transaction, text);
        return {text, count};
    }

    FileTransaction transaction;
};

using Substituted = std::pair<std::string, int>;

TEST_F(VariablesTest, AreKeptInTheOrderInWhichTheyWereSet)
{
    setVariable(transaction, "b", "1");
    setVariable(transaction, "a", "2");

    ASSERT_EQ(2U, transaction.variables.size());
    EXPECT_EQ("b", transaction.variables[0].first);
    EXPECT_EQ("a", transaction.variables[1].first);
    EXPECT_EQ("1", getVariable(transaction, "b"));
    EXPECT_EQ("2", getVariable(transaction, "a"));
}

TEST_F(VariablesTest, SettingAKnownNameReplacesItsValueInPlace)
{
    setVariable(transaction, "a", "1");
    setVariable(transaction, "b", "2");
    setVariable(transaction, "a", "3");

    ASSERT_EQ(2U, transaction.variables.size());
    EXPECT_EQ("a", transaction.variables[0].first);
    EXPECT_EQ("3", getVariable(transaction, "a"));
}

TEST_F(VariablesTest, NamesAreComparedExactly)
{
    setVariable(transaction, "Home", "1");
    setVariable(transaction, "home", "2");

    EXPECT_EQ("1", getVariable(transaction, "Home"));
    EXPECT_EQ("2", getVariable(transaction, "home"));
    EXPECT_EQ("", getVariable(transaction, "HOME"));
    EXPECT_EQ("", getVariable(transaction, "Hom"));
}

TEST_F(VariablesTest, TheFirstOfTwoEqualNamesGivesTheValue)
{
    transaction.variables = {{"a", "1"}, {"a", "2"}};

    EXPECT_EQ("1", getVariable(transaction, "a"));
}

TEST_F(VariablesTest, EveryOccurrenceIsReplacedAndCounted)
{
    setVariable(transaction, "home", "/opt/zor");

    EXPECT_EQ(Substituted("/opt/zor:/opt/zor/bin home", 2), substituted("$home:$home/bin home"));
}

TEST_F(VariablesTest, ATextWithoutVariablesStaysAsItIs)
{
    setVariable(transaction, "home", "/opt/zor");

    EXPECT_EQ(Substituted("$HOME $ (home)", 0), substituted("$HOME $ (home)"));
}

TEST_F(VariablesTest, WithoutAnyVariableNothingIsReplaced)
{
    EXPECT_EQ(Substituted("$home", 0), substituted("$home"));
}

TEST_F(VariablesTest, ANameIsReplacedInsideALongerOneToo)
{
    setVariable(transaction, "a", "1");

    EXPECT_EQ(Substituted("1b", 1), substituted("$ab"));
}

TEST_F(VariablesTest, AValueMayHoldALaterVariableButNotAnEarlierOne)
{
    setVariable(transaction, "first", "<$second>");
    setVariable(transaction, "second", "<$first>");

    EXPECT_EQ(Substituted("<<$first>>", 2), substituted("$first"));
}

TEST_F(VariablesTest, TheSearchStartsAgainFromTheStartOfTheText)
{
    setVariable(transaction, "ab", "");

    EXPECT_EQ(Substituted("", 2), substituted("$a$abb"));
}

class ClaimTest : public InstallerTest {
protected:
    static FileIdentity identityAt(const std::string& path)
    {
        struct stat status = {};
        EXPECT_EQ(0, statPath(path, status)) << path;
        return identityOf(status);
    }
};

TEST_F(ClaimTest, ARollbackDeletesAClaimedFileThatIsStillOurs)
{
    writeFile(dir / "zor.ini", "ours");
    record(transaction, Created, dir / "zor.ini");
    claim(transaction, dir / "zor.ini", identityAt(dir / "zor.ini"));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_FALSE(pathExists(dir / "zor.ini"));
}

TEST_F(ClaimTest, ARollbackLeavesTheFileThatAnotherRunPutThere)
{
    writeFile(dir / "zor.ini", "ours");
    record(transaction, BackedUp, dir / "zor.ini");
    record(transaction, Created, dir / "zor.ini");
    claim(transaction, dir / "zor.ini", identityAt(dir / "zor.ini"));
    writeFile(dir / "other", "theirs");
    ASSERT_EQ(0, rename((dir / "other").c_str(), (dir / "zor.ini").c_str()));
    writeFile(dir / "zor.ini.bak", "old");

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("theirs", readFile(dir / "zor.ini"));
}

TEST_F(ClaimTest, AClaimedFileWhoseBackupIsGoneStays)
{
    writeFile(dir / "zor.ini", "ours");
    record(transaction, BackedUp, dir / "zor.ini");
    record(transaction, Created, dir / "zor.ini");
    claim(transaction, dir / "zor.ini", identityAt(dir / "zor.ini"));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("ours", readFile(dir / "zor.ini")) << "another run has committed and deleted it";
}

TEST_F(ClaimTest, ARollbackReplacesAClaimedFileByItsBackup)
{
    writeFile(dir / "zor.ini", "ours");
    writeFile(dir / "zor.ini.bak", "old");
    record(transaction, BackedUp, dir / "zor.ini");
    record(transaction, Created, dir / "zor.ini");
    claim(transaction, dir / "zor.ini", identityAt(dir / "zor.ini"));

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ("old", readFile(dir / "zor.ini"));
    EXPECT_FALSE(pathExists(dir / "zor.ini.bak"));
}

using BackupFileTest = InstallerTest;

TEST_F(BackupFileTest, MovesTheFileToItsBackupNameAndRecordsThat)
{
    writeFile(dir / "file", "old");

    EXPECT_EQ(0, backupFile(transaction, dir / "file"));

    EXPECT_FALSE(pathExists(dir / "file"));
    EXPECT_EQ("old", readFile(dir / "file.bak"));
    EXPECT_EQ("1 " + dir / "file" + "\n", journalText(transaction));
}

TEST_F(BackupFileTest, AMissingFileNeedsNoBackup)
{
    EXPECT_EQ(0, backupFile(transaction, dir / "missing"));

    EXPECT_TRUE(transaction.journal.empty());
    EXPECT_TRUE(treeOf(dir.path()).empty());
}

TEST_F(BackupFileTest, AnOlderBackupOfAMissingFileStays)
{
    writeFile(dir / "file.bak", "of an older run");

    EXPECT_EQ(0, backupFile(transaction, dir / "file"));

    EXPECT_EQ("of an older run", readFile(dir / "file.bak"));
}

TEST_F(BackupFileTest, DoesNothingInATransactionWithoutBackups)
{
    transaction.backup = false;
    writeFile(dir / "file", "old");
    writeFile(dir / "file.bak", "older");

    EXPECT_EQ(0, backupFile(transaction, dir / "file"));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_EQ("older", readFile(dir / "file.bak"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(BackupFileTest, ReplacesAnOlderBackup)
{
    writeFile(dir / "file", "old");
    writeFile(dir / "file.bak", "older");

    EXPECT_EQ(0, backupFile(transaction, dir / "file"));

    EXPECT_EQ("old", readFile(dir / "file.bak"));
    EXPECT_FALSE(pathExists(dir / "file"));
}

TEST_F(BackupFileTest, AnOlderBackupThatIsTheSameFileDoesNotKeepItInPlace)
{
    const std::string path = dir / "file";
    writeFile(path, "old");
    ASSERT_EQ(0, link(path.c_str(), (path + ".bak").c_str()));

    EXPECT_EQ(0, backupFile(transaction, path));

    EXPECT_FALSE(pathExists(path));
    EXPECT_EQ("old", readFile(path + ".bak"));
}

TEST_F(BackupFileTest, AFileThatCannotBeMovedIsCode9AndHasNoEntry)
{
    writeFile(dir / "file", "old");
    makeDirectories(dir / "file.bak");

    EXPECT_EQ(9, backupFile(transaction, dir / "file"));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(BackupFileTest, ADirectoryThatCannotBeWrittenIsCode9)
{
    makeDirectories(dir / "closed");
    writeFile(dir / "closed/file", "old");
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0555));
    const OrdinaryRights rights;

    EXPECT_EQ(9, backupFile(transaction, dir / "closed/file"));

    EXPECT_EQ("old", readFile(dir / "closed/file"));
}

TEST_F(BackupFileTest, ADanglingLinkCountsAsMissing)
{
    std::filesystem::create_symlink("nowhere", dir / "link");

    EXPECT_EQ(0, backupFile(transaction, dir / "link"));

    EXPECT_TRUE(std::filesystem::is_symlink(dir / "link"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(ClaimTest, AClaimEndsWithTheTransaction)
{
    for (int (*const end)(FileTransaction&) : {commit, rollback}) {
        writeFile(dir / "zor.ini", "ours");
        claim(transaction, dir / "zor.ini", FileIdentity{});
        EXPECT_EQ(0, end(transaction));
        record(transaction, Created, dir / "zor.ini");

        EXPECT_EQ(0, rollback(transaction));

        EXPECT_FALSE(pathExists(dir / "zor.ini"));
    }
}

} // namespace
