#include "file_codes.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace {

TEST(FileCodesTest, EveryCodeHasItsText)
{
    EXPECT_EQ("Ok", fileErrorText(0));
    EXPECT_EQ("Cannot open file for reading", fileErrorText(1));
    EXPECT_EQ("Cannot open file for writing", fileErrorText(2));
    EXPECT_EQ("Cannot create file", fileErrorText(3));
    EXPECT_EQ("Cannot read file", fileErrorText(4));
    EXPECT_EQ("Cannot write file", fileErrorText(5));
    EXPECT_EQ("Cannot write file (out of space)", fileErrorText(6));
    EXPECT_EQ("Access denied", fileErrorText(7));
    EXPECT_EQ("Cannot close file", fileErrorText(8));
    EXPECT_EQ("Cannot rename file", fileErrorText(9));
    EXPECT_EQ("Cannot delete file", fileErrorText(10));
    EXPECT_EQ("Cannot create directory", fileErrorText(11));
    EXPECT_EQ("Cannot remove directory", fileErrorText(12));
    EXPECT_EQ("Cannot change file permissions", fileErrorText(13));
}

TEST(FileCodesTest, LargerCodesAreUnknown)
{
    EXPECT_EQ("Unknown error", fileErrorText(14));
    EXPECT_EQ("Unknown error", fileErrorText(255));
    EXPECT_EQ("Unknown error", fileErrorText(static_cast<unsigned>(-1)));
}

TEST(FileCodesTest, TheCodesHaveTheirNumbers)
{
    EXPECT_EQ(0, FileOk);
    EXPECT_EQ(1, CannotOpenForReading);
    EXPECT_EQ(2, CannotOpenForWriting);
    EXPECT_EQ(3, CannotCreateFile);
    EXPECT_EQ(4, CannotRead);
    EXPECT_EQ(5, CannotWrite);
    EXPECT_EQ(6, OutOfSpace);
    EXPECT_EQ(7, AccessDenied);
    EXPECT_EQ(8, CannotClose);
    EXPECT_EQ(9, CannotRename);
    EXPECT_EQ(10, CannotDelete);
    EXPECT_EQ(11, CannotCreateDirectory);
    EXPECT_EQ(12, CannotRemoveDirectory);
    EXPECT_EQ(13, CannotChangeMode);
}

TEST(FileCodesTest, AFailedWriteIsDeniedOutOfSpaceOrJustFailed)
{
    EXPECT_EQ(7, writeErrorCode(EACCES));
    EXPECT_EQ(6, writeErrorCode(ENOSPC));
    for (const int error : {0, EPERM, EIO, EDQUOT, EFBIG, EROFS, EPIPE})
        EXPECT_EQ(5, writeErrorCode(error)) << error;
}

} // namespace
