#include "installer_fixtures.h"
#include "time_stamps.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <string>
#include <utility>

namespace {

/// Sets the time zone of the process while it lives.
class TimeZone {
public:
    explicit TimeZone(const char* zone)
    {
        (void)setenv("TZ", zone, 1);
        tzset();
    }
    TimeZone(const TimeZone&) = delete;
    TimeZone& operator=(const TimeZone&) = delete;
    ~TimeZone() { (void)unsetenv("TZ"); }

private:
    VariableGuard variable_{"TZ"};
};

/// A buffer of 32 bytes that are not 0 at first.
struct Buffer {
    char bytes[32];

    Buffer() { std::fill(bytes, bytes + 32, 'x'); }
    [[nodiscard]] std::string all() const { return {bytes, bytes + 32}; }
};

constexpr std::time_t Never = std::numeric_limits<std::time_t>::max();

TEST(TimeStampsTest, FormatsAnyFormatAsUtc)
{
    const TimeZone zone("XXX-5:30");
    Buffer buffer;

    EXPECT_EQ(0, formatUtcTime(1669975872, buffer.bytes, 32, "%d.%m.%y %H h"));

    EXPECT_STREQ("02.12.22 10 h", buffer.bytes);
}

TEST(TimeStampsTest, TheFixedFormatsAreUtc)
{
    const TimeZone zone("XXX-5:30");
    Buffer comma;
    Buffer iso;
    Buffer micro;

    EXPECT_EQ(0, formatUtcTimeComma(1669975872, comma.bytes, 32));
    EXPECT_EQ(0, formatUtcTimeIso(1669975872, iso.bytes, 32));
    EXPECT_EQ(0, formatUtcTimeMicro(1669975872, micro.bytes, 32));

    EXPECT_STREQ("2022-12-02,10:11:12", comma.bytes);
    EXPECT_STREQ("2022-12-02T10:11:12", iso.bytes);
    EXPECT_STREQ("2022-12-02-10:11:12.000000", micro.bytes);
}

TEST(TimeStampsTest, TimeZeroIsTheStartOf1970)
{
    Buffer buffer;

    EXPECT_EQ(0, formatUtcTimeIso(0, buffer.bytes, 32));

    EXPECT_STREQ("1970-01-01T00:00:00", buffer.bytes);
}

TEST(TimeStampsTest, TimesBefore1970AndBeyond2038AreFormatted)
{
    Buffer buffer;

    EXPECT_EQ(0, formatUtcTimeIso(-1, buffer.bytes, 32));
    EXPECT_STREQ("1969-12-31T23:59:59", buffer.bytes);

    EXPECT_EQ(0, formatUtcTimeIso(4102444800, buffer.bytes, 32));
    EXPECT_STREQ("2100-01-01T00:00:00", buffer.bytes);
}

TEST(TimeStampsTest, TheRestOfTheBufferIsZero)
{
    Buffer buffer;

    EXPECT_EQ(0, formatUtcTimeIso(0, buffer.bytes, 31));

    EXPECT_EQ("1970-01-01T00:00:00" + std::string(12, '\0') + "x", buffer.all());
}

TEST(TimeStampsTest, ATextThatDoesNotFitIsNoError)
{
    Buffer buffer;

    EXPECT_EQ(0, formatUtcTimeIso(0, buffer.bytes, 19)); // no room for the final NUL

    EXPECT_EQ(std::string(13, 'x'), buffer.all().substr(19));
}

TEST(TimeStampsTest, WithoutABufferTheCodeIsMinus1)
{
    EXPECT_EQ(-1, formatUtcTime(0, nullptr, 32, "%Y"));
    EXPECT_EQ(-1, formatUtcTimeComma(0, nullptr, 32));
    EXPECT_EQ(-1, formatUtcTimeIso(0, nullptr, 32));
    EXPECT_EQ(-1, formatUtcTimeMicro(0, nullptr, 32));
    EXPECT_EQ(-1, formatUniqueStamp(0, nullptr, 32));
}

TEST(TimeStampsTest, WithABufferOfNoBytesTheCodeIsMinus1AndNothingIsWritten)
{
    Buffer buffer;

    EXPECT_EQ(-1, formatUtcTime(0, buffer.bytes, 0, "%Y"));
    EXPECT_EQ(-1, formatUtcTimeComma(0, buffer.bytes, 0));
    EXPECT_EQ(-1, formatUtcTimeIso(0, buffer.bytes, 0));
    EXPECT_EQ(-1, formatUtcTimeMicro(0, buffer.bytes, 0));
    EXPECT_EQ(-1, formatUniqueStamp(0, buffer.bytes, 0));

    EXPECT_EQ(std::string(32, 'x'), buffer.all());
}

TEST(TimeStampsTest, ATimeThatHasNoDateGivesMinus1AndAnEmptyBuffer)
{
    Buffer plain;
    Buffer unique;

    EXPECT_EQ(-1, formatUtcTimeIso(Never, plain.bytes, 32));
    EXPECT_EQ(-1, formatUniqueStamp(Never, unique.bytes, 32));

    EXPECT_EQ(std::string(32, '\0'), plain.all());
    EXPECT_EQ(std::string(32, '\0'), unique.all());
}

/// The unique stamp of `t`.
std::string uniqueStamp(std::time_t t)
{
    Buffer buffer;
    EXPECT_EQ(0, formatUniqueStamp(t, buffer.bytes, 32));
    return buffer.bytes;
}

TEST(UniqueStampTest, TheNumberIsTheLowHalfOfTheSecondsAsADouble)
{
    const TimeZone zone("UTC0");

    EXPECT_EQ("20231114221320_1073741824", uniqueStamp(1700000000)); // 256 * 2^22
    EXPECT_EQ("20040110133704_0", uniqueStamp(1073741824));          // 2^30
    EXPECT_EQ("20040110133705_4194304", uniqueStamp(1073741825));    // 2^30 + 1
    EXPECT_EQ("20380119031407_4290772992", uniqueStamp(2147483647)); // 1023 * 2^22
}

TEST(UniqueStampTest, TheNumberOfSmallTimesIsZero)
{
    const TimeZone zone("UTC0");

    EXPECT_EQ("19700101001704_0", uniqueStamp(1024));
    EXPECT_EQ("19700125063231_0", uniqueStamp(2097151)); // 2^21 - 1
    EXPECT_EQ("19700101000000_0", uniqueStamp(0));
}

TEST(UniqueStampTest, TheDateIsUtcAndTheNumberCountsFromTheLocalStartOf1970)
{
    const TimeZone zone("XXX-1"); // one hour east: its 1970 began 3600 seconds earlier

    EXPECT_EQ("20231114221320_3288334336", uniqueStamp(1700000000)); // 784 * 2^22
}

TEST(UniqueStampTest, SummerTimeDoesNotMoveTheStartOf1970)
{
    const TimeZone zone("XXX0YYY,J1/0,J365/23"); // summer time all year

    EXPECT_EQ("20231114221320_1073741824", uniqueStamp(1700000000));
}

TEST(UniqueStampTest, TheWholeTextIsWrittenWhateverTheSizeOfTheBuffer)
{
    const TimeZone zone("UTC0");
    Buffer buffer;

    EXPECT_EQ(0, formatUniqueStamp(1700000000, buffer.bytes, 4));

    EXPECT_STREQ("20231114221320_1073741824", buffer.bytes);
}

TEST(UniqueStampTest, TheBufferIsZeroAfterTheText)
{
    const TimeZone zone("UTC0");
    Buffer buffer;

    EXPECT_EQ(0, formatUniqueStamp(1024, buffer.bytes, 20));

    EXPECT_EQ("19700101001704_0" + std::string(4, '\0') + std::string(12, 'x'), buffer.all());
}

TEST(TimeStampsTest, TheCurrentTimeIsThatOfTheCLibrary)
{
    const std::time_t before = std::time(nullptr);
    const std::time_t now = currentTime();
    const std::time_t after = std::time(nullptr);

    EXPECT_LE(before, now);
    EXPECT_LE(now, after);
}

/// The local time stamp as seconds, read as if it were UTC.
std::time_t secondsOf(const std::string& stamp)
{
    std::tm time = {};
    EXPECT_NE(nullptr, strptime(stamp.c_str(), "%Y-%m-%dT%H:%M:%S", &time)) << stamp;
    EXPECT_EQ(19U, stamp.size()) << stamp;
    return timegm(&time);
}

TEST(TimeStampsTest, TheLocalTimeStampFollowsTheTimeZone)
{
    for (const auto& [zone, offset] :
         {std::pair("UTC0", 0), std::pair("XXX-5:30", 19800), std::pair("YYY+11", -39600)}) {
        const TimeZone here(zone);

        const std::time_t before = std::time(nullptr);
        const std::time_t stamp = secondsOf(localTimeStamp());
        const std::time_t after = std::time(nullptr);

        EXPECT_LE(before + offset, stamp) << zone;
        EXPECT_LE(stamp, after + offset) << zone;
    }
}

} // namespace
