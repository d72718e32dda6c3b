#include "build_stamp.h"

#include <gtest/gtest.h>

namespace {

std::string versionOf(const std::string& stamp)
{
    const ZorVersion version = stampVersion(stamp);
    return formatVersion(version) + "/" + std::to_string(version.fifth);
}

TEST(BuildStampTest, TheStampOfThisInstaller)
{
    EXPECT_EQ("22/12/02zor_9.2.30.0000", zorBuildStamp);
    EXPECT_EQ("9.2.30.0000/0", versionOf(zorBuildStamp));
    EXPECT_EQ("22/12/02", stampBuildDate(zorBuildStamp));
}

TEST(BuildStampTest, TheVersionIsUpToFourNumbersAfterTheUnderscore)
{
    EXPECT_EQ("1.2.3.0004/0", versionOf("22/12/02zor_1.2.3.4"));
    EXPECT_EQ("1.2.3.0000/0", versionOf("zor_1.2.3"));
    EXPECT_EQ("1.2.0.0000/0", versionOf("_1.2"));
    EXPECT_EQ("1.0.0.0000/0", versionOf("_1.0"));
}

TEST(BuildStampTest, AFifthNumberIsNotTaken)
{
    EXPECT_EQ("1.2.3.0004/0", versionOf("_1.2.3.4.5"));
}

TEST(BuildStampTest, TheVersionEndsWhereNoDotFollows)
{
    EXPECT_EQ("1.2.0.0000/0", versionOf("_1.2-3.4"));
    EXPECT_EQ("1.2.0.0000/0", versionOf("_1.2 beta"));
    EXPECT_EQ("1.2.0.0000/0", versionOf("_1.2."));
}

TEST(BuildStampTest, WithoutAUsableVersionItIs2100)
{
    for (const char* const stamp :
         {"", "22/12/02zor9.2.30", "9.2.30.0000", "_", "_x.1", "_9", "_9.", "_9.x", "_0.5.1.1",
          "_-1.5", "_9.-1", "_9.2.-1", "_9.2.3.-4"})
        EXPECT_EQ("2.1.0.0000/0", versionOf(stamp)) << stamp;
}

TEST(BuildStampTest, TheDateIsTheFirstEightCharacters)
{
    EXPECT_EQ("05/23/07", stampBuildDate("05/23/07zor"));
    EXPECT_EQ("ab/cd/ef", stampBuildDate("ab/cd/ef__"));
}

TEST(BuildStampTest, WithoutADateInItsPlaceThereIsNone)
{
    for (const char* const stamp : {"", "22/12/02", "22/12/02z", "22-12-02zor_9", "22/12-02zor_9",
                                    "2/12/02zor_9", "zor_9.2.30.0000"})
        EXPECT_EQ("", stampBuildDate(stamp)) << stamp;
}

} // namespace
