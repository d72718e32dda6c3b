#include "safe_path.h"

#include "process_limits.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

TEST(PathExistsTest, FilesAndDirectoriesExist)
{
    const TempDir dir;
    writeFile(dir / "file", "");

    EXPECT_TRUE(pathExists(dir.path()));
    EXPECT_TRUE(pathExists(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "missing"));
    EXPECT_FALSE(pathExists(dir / "file/below"));
    EXPECT_FALSE(pathExists(""));
}

TEST(PathExistsTest, ALinkExistsWhenItLeadsSomewhere)
{
    const TempDir dir;
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("file", (dir / "link").c_str()));
    ASSERT_EQ(0, symlink("missing", (dir / "dangling").c_str()));

    EXPECT_TRUE(pathExists(dir / "link"));
    EXPECT_FALSE(pathExists(dir / "dangling"));
}

class PathIsMissingTest : public testing::Test {
protected:
    TempDir dir;
};

TEST_F(PathIsMissingTest, WhatExistsIsNotMissing)
{
    writeFile(dir / "file", "");

    EXPECT_FALSE(pathIsMissing(dir / "file"));
    EXPECT_FALSE(pathIsMissing(dir.path()));
}

TEST_F(PathIsMissingTest, ANameThatIsNotThereIsMissing)
{
    EXPECT_TRUE(pathIsMissing(dir / "file"));
}

TEST_F(PathIsMissingTest, ALinkThatLeadsNowhereIsMissing)
{
    ASSERT_EQ(0, symlink("nowhere", (dir / "link").c_str()));

    EXPECT_TRUE(pathIsMissing(dir / "link"));
}

TEST_F(PathIsMissingTest, ALinkToItselfIsMissing)
{
    ASSERT_EQ(0, symlink("link", (dir / "link").c_str()));

    EXPECT_TRUE(pathIsMissing(dir / "link"));
}

TEST_F(PathIsMissingTest, ANameLongerThanTheFileSystemTakesIsMissing)
{
    EXPECT_TRUE(pathIsMissing(dir / std::string(300, 'n')));
}

TEST_F(PathIsMissingTest, AnythingBelowAFileIsMissing)
{
    writeFile(dir / "file", "");

    EXPECT_TRUE(pathIsMissing(dir / "file/below"));
}

TEST_F(PathIsMissingTest, AnythingInADirectoryThatMayNotBeSearchedIsMissing)
{
    makeDirectories(dir / "closed");
    writeFile(dir / "closed/file", "");
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0600));
    const OrdinaryRights rights;

    EXPECT_TRUE(pathIsMissing(dir / "closed/file"));
}

TEST_F(PathIsMissingTest, WhatAFailingDiskDoesNotShowIsNotMissing)
{
    EXPECT_TRUE(passesInChild([this] {
        failSystemCall(SYS_openat2, EIO);

        EXPECT_FALSE(pathIsMissing(dir / "file"));
    }));
}

} // namespace
