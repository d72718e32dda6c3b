#include "version.h"

#include <gtest/gtest.h>

namespace {

ZorVersion parsed(const std::string& text)
{
    ZorVersion version = {99, 99, 99, 99, 99};
    EXPECT_EQ(0, parseVersion(text, &version)) << text;
    return version;
}

std::string shown(const std::string& text)
{
    return formatVersion(parsed(text));
}

TEST(VersionTest, ReadsOneToFiveNumbersAndFillsUpWithZeros)
{
    EXPECT_EQ("9.0.0.0000", shown("9"));
    EXPECT_EQ("9.2.0.0000", shown("9.2"));
    EXPECT_EQ("9.2.30.0004.5", shown("9.2.30.4.5"));
}

TEST(VersionTest, ABlankTextIsVersionZero)
{
    EXPECT_EQ("0.0.0.0000", shown(""));
    EXPECT_EQ("0.0.0.0000", shown(" \t"));
}

TEST(VersionTest, AFinalDotAndWhiteSpaceAroundAreAccepted)
{
    EXPECT_EQ("2.3.0.0000", shown("2.3."));
    EXPECT_EQ("2.3.0.0000", shown(" 2.3 "));
    EXPECT_EQ("2.3.0.0000", shown("2.3. "));
    EXPECT_EQ("1.2.3.0004.5", shown("1.2.3.4.5."));
}

TEST(VersionTest, RejectsInvalidTextsAndLeavesTheRecordAlone)
{
    for (const char* const text : {"2..3", "-1", "+1", "2.x", "x", "1 2", "1.2.3.4.5.6", "2.3.a"}) {
        ZorVersion version = {7, 7, 7, 7, 7};
        EXPECT_EQ(-1, parseVersion(text, &version)) << text;
        EXPECT_EQ("7.7.7.0007.7", formatVersion(version)) << text;
    }
}

TEST(VersionTest, ANullRecordChecksOnly)
{
    EXPECT_EQ(0, parseVersion("1.2", nullptr));
    EXPECT_EQ(-1, parseVersion("1.b", nullptr));
}

TEST(VersionTest, ANumberBeyond32BitsWrapsAround)
{
    EXPECT_EQ(1U, parsed("4294967297").major);
}

TEST(VersionTest, ComparesNumberByNumberFromTheFirst)
{
    EXPECT_LT(compareVersions({2, 3, 0, 12, 0}, {2, 3, 1, 0, 0}), 0);
    EXPECT_GT(compareVersions({3, 0, 0, 0, 0}, {2, 9, 9, 9, 9}), 0);
    EXPECT_LT(compareVersions({1, 1, 1, 1, 1}, {1, 2, 0, 0, 0}), 0);
    EXPECT_EQ(4, compareVersions({1, 1, 1, 5, 0}, {1, 1, 1, 1, 9}));
    EXPECT_EQ(-4, compareVersions({1, 1, 1, 1, 1}, {1, 1, 1, 1, 5}));
    EXPECT_EQ(0, compareVersions({1, 2, 3, 4, 5}, {1, 2, 3, 4, 5}));
}

TEST(VersionTest, TheDifferenceIsASigned32BitNumber)
{
    EXPECT_LT(compareVersions({0x80000001U, 0, 0, 0, 0}, {1, 0, 0, 0, 0}), 0);
}

TEST(VersionTest, ShowsTheFifthNumberOnlyWhenItIsAboveZero)
{
    EXPECT_EQ("2.3.0.0012", formatVersion({2, 3, 0, 12, 0}));
    EXPECT_EQ("2.3.0.0012.1", formatVersion({2, 3, 0, 12, 1}));
    EXPECT_EQ("2.3.0.0012.5", formatVersion({2, 3, 0, 12, 5}));
    EXPECT_EQ("2.3.0.0012", formatVersion({2, 3, 0, 12, 0x80000000U}));
    EXPECT_EQ("2.3.0.12345", formatVersion({2, 3, 0, 12345, 0}));
}

TEST(VersionTest, TheRegistryNeverGetsTheFifthNumber)
{
    EXPECT_EQ("2.3.0.0012", registryVersionText({2, 3, 0, 12, 5}));
}

TEST(VersionTest, TheRegistryTextTakesItsNumbersAsSigned)
{
    EXPECT_EQ("-1.0.0.0000", registryVersionText({0xFFFFFFFFU, 0, 0, 0, 0}));
}

TEST(BuildDateTest, TheDigitsOfADateAreItsNumber)
{
    EXPECT_EQ(221202, buildDateNumber("22/12/02"));
    EXPECT_EQ(52307, buildDateNumber("05/23/07"));
    EXPECT_EQ(1, buildDateNumber("00/00/01"));
}

TEST(BuildDateTest, AnyOtherTextIsZero)
{
    for (const char* const text : {"", "2007-05-23", "22/12/2", "22/12/022", "22-12-02", "22/12-02",
                                   "22-12/02", "ab/cd/ef", "00/00/00", "-1/00/00"})
        EXPECT_EQ(0, buildDateNumber(text)) << text;
}

} // namespace
