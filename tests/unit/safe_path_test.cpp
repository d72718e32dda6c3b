#include "safe_path.h"

#include "test_files.h"

#include <gtest/gtest.h>

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

} // namespace
