#include "paths.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <unistd.h>

namespace {

TEST(PathsTest, AJoinPutsOneSlashBetween)
{
    EXPECT_EQ("/opt/x", joinPath("/opt", "x"));
    EXPECT_EQ("/opt/x", joinPath("/opt/", "x"));
    EXPECT_EQ("/x", joinPath("/", "x"));
    EXPECT_EQ("a/b/c", joinPath("a/b", "c"));
}

TEST(PathsTest, AJoinLooksAtTheEndOfTheDirectoryOnly)
{
    EXPECT_EQ("/opt//x", joinPath("/opt//", "x"));
    EXPECT_EQ("/opt//x", joinPath("/opt", "/x"));
    EXPECT_EQ("/opt//x", joinPath("/opt/", "/x"));
}

TEST(PathsTest, AJoinOfAnEmptyPartKeepsTheSlash)
{
    EXPECT_EQ("/x", joinPath("", "x"));
    EXPECT_EQ("/opt/", joinPath("/opt", ""));
    EXPECT_EQ("/opt/", joinPath("/opt/", ""));
    EXPECT_EQ("/", joinPath("", ""));
}

TEST(PathsTest, AnOptionalJoinOfAnEmptyNameIsTheDirectory)
{
    EXPECT_EQ("/opt", joinPathOptional("/opt", ""));
    EXPECT_EQ("/opt/", joinPathOptional("/opt/", ""));
    EXPECT_EQ("", joinPathOptional("", ""));
}

TEST(PathsTest, AnOptionalJoinOfANameIsAJoin)
{
    EXPECT_EQ("/opt/x", joinPathOptional("/opt", "x"));
    EXPECT_EQ("/opt/x", joinPathOptional("/opt/", "x"));
}

TEST(PathsTest, APathEndsWithASlashWhenItsLastCharacterIsOne)
{
    EXPECT_TRUE(endsWithSlash("/"));
    EXPECT_TRUE(endsWithSlash("/opt/"));
    EXPECT_FALSE(endsWithSlash("/opt"));
    EXPECT_FALSE(endsWithSlash("opt"));
    EXPECT_FALSE(endsWithSlash(""));
}

TEST(PathsTest, ABackupLiesBesideItsFile)
{
    EXPECT_EQ("/opt/corvan/zor/bin/trawlhw.bak", backupName("/opt/corvan/zor/bin/trawlhw"));
    EXPECT_EQ("zor.log.bak", backupName("zor.log"));
}

TEST(PathsTest, FilesAndDirectoriesExist)
{
    const TempDir dir;
    writeFile(dir / "file", "");

    EXPECT_TRUE(pathExists(dir.path()));
    EXPECT_TRUE(pathExists(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "missing"));
    EXPECT_FALSE(pathExists(dir / "file/below"));
    EXPECT_FALSE(pathExists(""));
}

TEST(PathsTest, ALinkExistsWhenItLeadsSomewhere)
{
    const TempDir dir;
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("file", (dir / "link").c_str()));
    ASSERT_EQ(0, symlink("missing", (dir / "dangling").c_str()));

    EXPECT_TRUE(pathExists(dir / "link"));
    EXPECT_FALSE(pathExists(dir / "dangling"));
}

} // namespace
