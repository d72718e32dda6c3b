#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "safe_path.h"
#include "settings.h"
#include "tree_removal.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <iterator>
#include <ostream>
#include <streambuf>

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>

namespace {

namespace fs = std::filesystem;

using Lines = std::vector<std::string>;

/// The lines of `text`, sorted: the order in which a directory lists its files is the system's.
Lines sortedLines(const std::string& text)
{
    std::istringstream stream(text);
    Lines lines;
    for (std::string line; std::getline(stream, line);)
        lines.push_back(line);
    std::sort(lines.begin(), lines.end());
    return lines;
}

/// A log that calls a function for every line, as soon as it is printed.
class WatchedLog : public std::streambuf {
public:
    explicit WatchedLog(std::function<void(const std::string&)> act) : act_(std::move(act)) {}

protected:
    int_type overflow(int_type character) override
    {
        if (character != '\n') {
            line_ += static_cast<char>(character);
            return character;
        }
        act_(line_);
        line_.clear();
        return character;
    }

private:
    std::function<void(const std::string&)> act_;
    std::string line_;
};

using DeleteFileTest = InstallerTest;

TEST_F(DeleteFileTest, LogsAndDeletesAFile)
{
    writeFile(dir / "file", "content");

    EXPECT_EQ(0, deleteFile(dir / "file"));

    EXPECT_FALSE(pathExists(dir / "file"));
    EXPECT_EQ("DEL: " + dir / "file" + "\n", log.text());
}

TEST_F(DeleteFileTest, DeletesAnEmptyDirectory)
{
    makeDirectories(dir / "empty");

    EXPECT_EQ(0, deleteFile(dir / "empty"));

    EXPECT_FALSE(pathExists(dir / "empty"));
}

TEST_F(DeleteFileTest, DeletesALinkAndNotWhatItNames)
{
    writeFile(dir / "file", "content");
    fs::create_symlink("file", dir / "link");

    EXPECT_EQ(0, deleteFile(dir / "link"));

    EXPECT_EQ(Lines{"f 0644 file"}, treeOf(dir.path()));
}

TEST_F(DeleteFileTest, LogsEvenWhatItCannotDelete)
{
    EXPECT_EQ(-1, deleteFile(dir / "missing"));

    EXPECT_EQ("DEL: " + dir / "missing" + "\n", log.text());
}

class RemoveTreeTest : public InstallerTest {
protected:
    RemoveTreeTest()
    {
        makeDirectories(dir / "tree/sub/deep");
        writeFile(dir / "tree/file", "");
        writeFile(dir / "tree/sub/file", "");
        writeFile(dir / "tree/sub/deep/file", "");
    }

    /// Makes a directory read-only for the test itself, even if root runs it.
    void protect(const std::string& name)
    {
        EXPECT_EQ(0, chmod((dir / name).c_str(), 0555));
        rights_.emplace();
    }

    /// Makes a directory with "file" and a subdirectory, listed in this order. Returns its name.
    ///
    /// File systems list what was created first, or last, first, or go by a hash of the name: one
    /// of a few attempts succeeds on each.
    std::string makeDirectoryThatListsItsFileFirst()
    {
        for (int i = 0; i < 64; ++i) {
            std::string name = "mixed" + std::to_string(i);
            makeDirectories(dir / name);
            const std::string sub = dir / name + "/sub" + std::to_string(i);
            if (i % 2 == 0)
                makeDirectories(sub);
            writeFile(dir / name + "/file", "");
            makeDirectories(sub);
            if (fs::directory_iterator(dir / name)->path().filename() == "file")
                return name;
        }
        ADD_FAILURE() << "no directory lists its file first";
        return "";
    }

private:
    std::optional<OrdinaryRights> rights_;
};

TEST_F(RemoveTreeTest, RemovesEverythingAndLogsIt)
{
    EXPECT_TRUE(removeTree(dir / "tree", true, false));

    EXPECT_TRUE(treeOf(dir.path()).empty());
    EXPECT_EQ(Lines({"DEL: " + dir / "tree/file", "DEL: " + dir / "tree/sub/deep/file",
                     "DEL: " + dir / "tree/sub/file", "RMDIR: " + dir / "tree",
                     "RMDIR: " + dir / "tree/sub", "RMDIR: " + dir / "tree/sub/deep"}),
              sortedLines(log.text()));
}

TEST_F(RemoveTreeTest, AFinalSlashIsNotRepeatedInTheLog)
{
    EXPECT_TRUE(removeTree(dir / "tree/sub/deep/", false, true));

    EXPECT_EQ("DEL: " + dir / "tree/sub/deep/file" + "\n", log.text());
}

TEST_F(RemoveTreeTest, ADirectoryIsRemovedAfterWhatItHolds)
{
    EXPECT_TRUE(removeTree(dir / "tree/sub/deep", true, false));

    EXPECT_EQ("DEL: " + dir / "tree/sub/deep/file" + "\nRMDIR: " + dir / "tree/sub/deep" + "\n",
              log.text());
}

TEST_F(RemoveTreeTest, WithoutRecursionSubdirectoriesStayAndKeepTheDirectory)
{
    EXPECT_FALSE(removeTree(dir / "tree", false, false));

    EXPECT_EQ(Lines({"d 0755 tree", "d 0755 tree/sub", "d 0755 tree/sub/deep",
                     "f 0644 tree/sub/deep/file", "f 0644 tree/sub/file"}),
              treeOf(dir.path()));
    EXPECT_EQ("DEL: " + dir / "tree/file" + "\n", log.text());
}

TEST_F(RemoveTreeTest, WithoutRecursionADirectoryOfFilesGoes)
{
    EXPECT_TRUE(removeTree(dir / "tree/sub/deep", false, false));

    EXPECT_FALSE(pathExists(dir / "tree/sub/deep"));
}

TEST_F(RemoveTreeTest, DirectoriesCanBeKept)
{
    EXPECT_TRUE(removeTree(dir / "tree", true, true));

    EXPECT_EQ(Lines({"d 0755 tree", "d 0755 tree/sub", "d 0755 tree/sub/deep"}),
              treeOf(dir.path()));
    EXPECT_EQ(Lines({"DEL: " + dir / "tree/file", "DEL: " + dir / "tree/sub/deep/file",
                     "DEL: " + dir / "tree/sub/file"}),
              sortedLines(log.text()));
}

TEST_F(RemoveTreeTest, KeepingDirectoriesWithoutRecursionDeletesTheFilesOnTop)
{
    EXPECT_TRUE(removeTree(dir / "tree", false, true));

    EXPECT_EQ(Lines({"d 0755 tree", "d 0755 tree/sub", "d 0755 tree/sub/deep",
                     "f 0644 tree/sub/deep/file", "f 0644 tree/sub/file"}),
              treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, AMissingDirectoryIsFalseAndPrintsNothing)
{
    EXPECT_FALSE(removeTree(dir / "missing", true, false));

    EXPECT_EQ("", log.text());
}

TEST_F(RemoveTreeTest, ADirectoryBelowAMissingOneIsFalse)
{
    EXPECT_FALSE(removeTree(dir / "missing/below", true, false));
}

TEST_F(RemoveTreeTest, SubdirectoriesThatCannotBeOpenedStayEvenIfTheyAreEmpty)
{
    Lines deleted;
    for (int i = 0; i < 20; ++i) { // one after the other, in whatever order they are listed
        const std::string name = dir / "mixed/" + std::to_string(10 + i);
        makeDirectories(name + "closed");
        ASSERT_EQ(0, chmod((name + "closed").c_str(), 0));
        writeFile(name + "file", "");
        deleted.push_back("DEL: " + name + "file");
    }
    protect("tree");

    EXPECT_FALSE(removeTree(dir / "mixed", true, false));

    EXPECT_EQ(deleted, sortedLines(log.text()));
    EXPECT_EQ(20, std::distance(fs::directory_iterator(dir / "mixed"), {}));
}

TEST_F(RemoveTreeTest, AFileIsNotATree)
{
    EXPECT_FALSE(removeTree(dir / "tree/file", true, false));
    EXPECT_FALSE(removeTree(dir / "tree/file", true, true));

    EXPECT_TRUE(pathExists(dir / "tree/file"));
}

TEST_F(RemoveTreeTest, LinksAreDeletedAndNotFollowed)
{
    makeDirectories(dir / "links");
    fs::create_directory_symlink(dir / "tree", dir / "links/to directory");
    fs::create_symlink("nowhere", dir / "links/to nowhere");

    EXPECT_TRUE(removeTree(dir / "links", true, false));

    EXPECT_FALSE(pathExists(dir / "links"));
    EXPECT_TRUE(pathExists(dir / "tree/sub/deep/file"));
}

TEST_F(RemoveTreeTest, AFileThatCannotBeDeletedIsFalse)
{
    protect("tree/sub/deep");

    EXPECT_FALSE(removeTree(dir / "tree/sub/deep", true, true));

    EXPECT_TRUE(pathExists(dir / "tree/sub/deep/file"));
}

TEST_F(RemoveTreeTest, ADirectoryThatIsNotEmptyStaysWithoutAMessage)
{
    protect("tree/sub/deep");

    EXPECT_FALSE(removeTree(dir / "tree/sub/deep", true, false));

    EXPECT_EQ("DEL: " + dir / "tree/sub/deep/file" + "\n", log.text());
}

TEST_F(RemoveTreeTest, ASubdirectoryThatIsNotEmptyStaysWithoutAMessage)
{
    protect("tree/sub/deep");

    EXPECT_FALSE(removeTree(dir / "tree", true, false));

    EXPECT_EQ(Lines({"DEL: " + dir / "tree/file", "DEL: " + dir / "tree/sub/deep/file",
                     "DEL: " + dir / "tree/sub/file"}),
              sortedLines(log.text()));
}

TEST_F(RemoveTreeTest, ADirectoryThatIsMovedAwayMeanwhileStays)
{
    makeDirectories(dir / "away");
    makeDirectories(dir / "moving/one");
    makeDirectories(dir / "moving/two");
    writeFile(dir / "moving/one/file", "");
    writeFile(dir / "moving/two/file", "");
    WatchedLog watched([&](const std::string& line) { // the first of the two, whichever it is
        const bool isFirst = fs::is_empty(dir / "away");
        if (isFirst && line == "DEL: " + dir / "moving/one/file")
            fs::rename(dir / "moving/one", dir / "away/directory");
        if (isFirst && line == "DEL: " + dir / "moving/two/file")
            fs::rename(dir / "moving/two", dir / "away/directory");
    });
    std::ostream stream(&watched);
    logstream = &stream;

    EXPECT_TRUE(removeTree(dir / "moving", true, false));

    EXPECT_FALSE(pathExists(dir / "moving"));
    EXPECT_TRUE(pathExists(dir / "away/directory"));
}

TEST_F(RemoveTreeTest, NothingIsRemovedInADirectoryThatIsMovedAwayMeanwhile)
{
    makeDirectories(dir / "moving/one");
    writeFile(dir / "moving/one/file", "");
    WatchedLog watched([&](const std::string& line) {
        if (line != "DEL: " + dir / "moving/one/file")
            return;
        fs::rename(dir / "moving/one", dir / "away");
        fs::create_directory(dir / "away/one"); // the name of the directory itself
    });
    std::ostream stream(&watched);
    logstream = &stream;

    EXPECT_TRUE(removeTree(dir / "moving", true, false));

    EXPECT_TRUE(pathExists(dir / "away/one"));
}

TEST_F(RemoveTreeTest, WhatTakesThePlaceOfADirectoryMeanwhileIsRemovedIfItIsEmpty)
{
    WatchedLog watched([&](const std::string& line) {
        if (line != "DEL: " + dir / "tree/sub/deep/file")
            return;
        fs::rename(dir / "tree/sub/deep", dir / "away");
        fs::create_directory(dir / "tree/sub/deep");
    });
    std::ostream stream(&watched);
    logstream = &stream;

    EXPECT_TRUE(removeTree(dir / "tree", true, false));

    EXPECT_EQ(Lines{"d 0755 away"}, treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, NothingIsDeletedThereInsteadOfInAParentThatIsMovedToo)
{
    Lines names;
    for (int i = 0; i < 20; ++i) { // before and after "deep", in whatever order they are listed
        names.push_back(std::to_string(10 + i));
        if (i == 10)
            makeDirectories(dir / "moving/sub/deep");
        makeDirectories(dir / "moving/sub");
        writeFile(dir / "moving/sub/" + names.back(), "");
    }
    writeFile(dir / "moving/sub/deep/file", "");
    WatchedLog watched([&](const std::string& line) {
        if (line != "DEL: " + dir / "moving/sub/deep/file")
            return;
        fs::rename(dir / "moving/sub/deep", dir / "away");
        fs::rename(dir / "moving/sub", dir / "away too");
        for (const std::string& name : names)
            writeFile(dir / "away/" + name, "");
        fs::create_directory(dir / "away/deep"); // the name of the directory itself
    });
    std::ostream stream(&watched);
    logstream = &stream;

    (void)removeTree(dir / "moving", true, false);

    EXPECT_EQ(21, std::distance(fs::directory_iterator(dir / "away"), {}));
}

TEST_F(RemoveTreeTest, ADirectoryWhoseParentIsMovedElsewhereTooStays)
{
    makeDirectories(dir / "away");
    ASSERT_TRUE(fs::remove(dir / "tree/sub/file"));
    WatchedLog watched([&](const std::string& line) {
        if (line != "DEL: " + dir / "tree/sub/deep/file")
            return;
        fs::rename(dir / "tree/sub/deep", dir / "away/deep");
        fs::rename(dir / "tree/sub", dir / "away/sub");
    });
    std::ostream stream(&watched);
    logstream = &stream;

    EXPECT_TRUE(removeTree(dir / "tree", true, false));

    EXPECT_EQ(Lines({"d 0755 away", "d 0755 away/deep", "d 0755 away/sub"}), treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, AFailureInASubdirectoryAloneIsHidden)
{
    protect("tree/sub/deep");

    EXPECT_TRUE(removeTree(dir / "tree", true, true));

    EXPECT_TRUE(pathExists(dir / "tree/sub/deep/file"));
}

TEST_F(RemoveTreeTest, ALaterSuccessHidesAnEarlierFailure)
{
    const std::string mixed = makeDirectoryThatListsItsFileFirst();
    protect(mixed);

    EXPECT_TRUE(removeTree(dir / mixed, true, true));

    EXPECT_TRUE(pathExists(dir / mixed + "/file"));
}

TEST_F(RemoveTreeTest, AnEntryWhoseStatusCannotBeReadIsFalse)
{
    ASSERT_EQ(0, chmod((dir / "tree/sub/deep").c_str(), 0444));
    const OrdinaryRights rights;

    EXPECT_FALSE(removeTree(dir / "tree/sub/deep", true, true));

    EXPECT_EQ("", log.text());
}

TEST_F(RemoveTreeTest, TheDirectorysOwnStatusCountsAsWell)
{
    makeDirectories(dir / "empty");
    ASSERT_EQ(0, chmod((dir / "empty").c_str(), 0444));
    const OrdinaryRights rights;

    EXPECT_FALSE(removeTree(dir / "empty", true, false));

    EXPECT_FALSE(pathExists(dir / "empty"));
    EXPECT_EQ("RMDIR: " + dir / "empty" + "\n", log.text());
}

TEST_F(RemoveTreeTest, RemovesADirectoryOfADirectory)
{
    EXPECT_EQ(0, removeDir(transaction, dir / "tree", "sub", true));

    EXPECT_EQ(Lines({"d 0755 tree", "f 0644 tree/file"}), treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, RemovesTheBaseItselfForAnEmptyName)
{
    EXPECT_EQ(0, removeDir(transaction, dir / "tree/sub/deep", "", false));

    EXPECT_EQ("DEL: " + dir / "tree/sub/deep/file" + "\nRMDIR: " + dir / "tree/sub/deep" + "\n",
              log.text());
}

TEST_F(RemoveTreeTest, RemovingADirectoryNeverFails)
{
    EXPECT_EQ(0, removeDir(transaction, dir / "tree", "sub", false));
    EXPECT_EQ(0, removeDir(transaction, dir / "tree", "missing", true));

    EXPECT_TRUE(pathExists(dir / "tree/sub/deep/file"));
    EXPECT_FALSE(pathExists(dir / "tree/sub/file"));
}

TEST_F(RemoveTreeTest, NothingIsJournalled)
{
    EXPECT_EQ(0, removeDir(transaction, dir / "tree", "", true));

    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(RemoveTreeTest, FilesCanBeRemovedFromTheirDirectories)
{
    EXPECT_EQ(0, removeFiles(dir / "tree", "sub", true));

    EXPECT_EQ(Lines({"d 0755 tree", "f 0644 tree/file", "d 0755 tree/sub", "d 0755 tree/sub/deep"}),
              treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, FilesOfTheTopDirectoryAloneCanBeRemoved)
{
    EXPECT_EQ(0, removeFiles(dir / "tree", "", false));

    EXPECT_EQ(Lines({"d 0755 tree", "d 0755 tree/sub", "d 0755 tree/sub/deep",
                     "f 0644 tree/sub/deep/file", "f 0644 tree/sub/file"}),
              treeOf(dir.path()));
}

TEST_F(RemoveTreeTest, RemovingFilesNeverFails)
{
    EXPECT_EQ(0, removeFiles(dir / "missing", "", true));
}

TEST_F(RemoveTreeTest, ADeepTreeTakesFewDescriptorsAndLittleStack)
{
    constexpr int levels = 500; // about 260 bytes of stack each
    const int top = open(dir.path().c_str(), O_RDONLY | O_DIRECTORY);
    int level = top;
    for (int depth = 0; depth < levels; ++depth) {
        ASSERT_EQ(0, mkdirat(level, "d", 0755));
        const int below = openat(level, "d", O_RDONLY | O_DIRECTORY);
        ASSERT_GE(below, 0);
        (void)close(level);
        level = below;
    }
    (void)close(level);

    EXPECT_TRUE(passesInChild([&] {
        const rlimit descriptors = {64, 64};
        ASSERT_EQ(0, setrlimit(RLIMIT_NOFILE, &descriptors));
        constexpr rlim_t size = rlim_t{128} * 1024;
        const rlimit stack = {size, size};
        ASSERT_EQ(0, setrlimit(RLIMIT_STACK, &stack));
        ASSERT_TRUE(removeTree(dir / "d", true, false));
    }));

    EXPECT_FALSE(pathExists(dir / "d"));
}

TEST_F(RemoveTreeTest, AFileWithAPathOf4096BytesStaysAndTheOthersGo)
{
    const std::string name(200, 'd');
    std::string path = dir.path();
    ScopedFd level(open(dir.path().c_str(), O_RDONLY | O_DIRECTORY));
    for (; path.size() + 1 + name.size() < 4070; path += "/" + name) {
        ASSERT_EQ(0, mkdirat(level.get(), name.c_str(), 0755));
        level = ScopedFd(openat(level.get(), name.c_str(), O_RDONLY | O_DIRECTORY));
    }
    Lines deleted;
    for (int i = 0; i < 40; ++i) { // the longest paths of 4095 and 4096 bytes, one after the other
        std::string file = std::to_string(10 + i);
        file.resize(4094 - path.size() + static_cast<std::size_t>(i % 2), 'f');
        ScopedFd(openat(level.get(), file.c_str(), O_WRONLY | O_CREAT, 0644));
        if (i % 2 == 0)
            deleted.push_back("DEL: " + path + "/" + file);
    }

    EXPECT_FALSE(removeTree(dir / name, true, false));

    EXPECT_EQ(deleted, sortedLines(log.text()));
}

} // namespace
