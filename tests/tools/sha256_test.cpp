#include "sha256.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr const char* OfNothing =
    "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855";
constexpr const char* OfAbc = "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad";
constexpr const char* OfAMillionLetters =
    "cdc76e5c9914fb9281a1c7e284d73e67f1809a48a497200e046d39ccc7112cd0";

TEST(Sha256, GivesThePublishedDigests)
{
    Sha256 hash;
    EXPECT_EQ(hash.finish(), OfNothing);
    hash.add("abc", 3);
    EXPECT_EQ(hash.finish(), OfAbc);
}

TEST(Sha256, DoesNotDependOnThePieces)
{
    Sha256 hash;
    for (int i = 0; i < 1000; ++i)
        hash.add(std::string(1000, 'a').data(), 1000);
    EXPECT_EQ(hash.finish(), OfAMillionLetters);
}

TEST(Sha256, OfAFileIsThatOfItsContentWhereverTheDescriptorIs)
{
    const TempDir dir;
    const std::string path = dir / "million";
    writeFile(path, std::string(1000000, 'a'));
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(lseek(fd, 77, SEEK_SET), 77);

    std::string digest;
    EXPECT_EQ(sha256OfFile(fd, digest), 0);

    EXPECT_EQ(digest, OfAMillionLetters);
    EXPECT_EQ(lseek(fd, 0, SEEK_CUR), 77);
    (void)close(fd);
}

TEST(Sha256, OfADirectoryFailsWithTheSystemsError)
{
    const int fd = open("/", O_RDONLY | O_CLOEXEC);

    std::string digest = "as it was";
    EXPECT_EQ(sha256OfFile(fd, digest), EISDIR);

    EXPECT_EQ(digest, "as it was");
    (void)close(fd);
}

} // namespace
