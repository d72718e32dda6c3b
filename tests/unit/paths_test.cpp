#include "paths.h"

#include <gtest/gtest.h>

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

TEST(PathsTest, TheParentIsTheDirectoryThatHoldsThePath)
{
    EXPECT_EQ("/a", parentOf("/a/b"));
    EXPECT_EQ("/a", parentOf("/a/b/"));
    EXPECT_EQ("/", parentOf("/a"));
    EXPECT_EQ("/", parentOf("/"));
    EXPECT_EQ(".", parentOf("a"));
}

TEST(PathsTest, ABackupIsNextToItsFile)
{
    EXPECT_EQ("/opt/corvan/zor/bin/trawlhw.bak", backupName("/opt/corvan/zor/bin/trawlhw"));
    EXPECT_EQ("zor.log.bak", backupName("zor.log"));
}

} // namespace
