#include "time_stamps.h"

#include <bit>
#include <cstdint>
#include <cstdio>
#include <cstring>

namespace {

constexpr const char* IsoFormat = "%Y-%m-%dT%H:%M:%S";

/// The seconds from 1 January 1970, 00:00:00 local time, to `t`.
double secondsSinceLocalEpoch(std::time_t t)
{
    std::tm epoch = {};
    epoch.tm_year = 70;
    epoch.tm_mday = 1;
    return std::difftime(t, std::mktime(&epoch));
}

} // namespace

int formatUtcTime(std::time_t t, char* buffer, std::size_t size, const char* format)
{
    if (buffer == nullptr || size == 0)
        return -1;
    std::memset(buffer, 0, size);

    const std::tm* utc = std::gmtime(&t);
    if (utc == nullptr)
        return -1;
    (void)std::strftime(buffer, size, format, utc); // the caller provides enough space
    return 0;
}

int formatUtcTimeComma(std::time_t t, char* buffer, std::size_t size)
{
    return formatUtcTime(t, buffer, size, "%Y-%m-%d,%H:%M:%S");
}

int formatUtcTimeIso(std::time_t t, char* buffer, std::size_t size)
{
    return formatUtcTime(t, buffer, size, IsoFormat);
}

int formatUtcTimeMicro(std::time_t t, char* buffer, std::size_t size)
{
    return formatUtcTime(t, buffer, size, "%Y-%m-%d-%H:%M:%S.000000");
}

int formatUniqueStamp(std::time_t t, char* buffer, std::size_t size)
{
    if (buffer == nullptr || size == 0)
        return -1;
    std::memset(buffer, 0, size);

    char date[32];
    if (formatUtcTime(t, date, sizeof date, "%Y%m%d%H%M%S") != 0)
        return -1;

    // Deliberate: the number is not the seconds but the low half of the bits of their double. The
    // stamps have always contained that.
    const auto bits = std::bit_cast<std::uint64_t>(secondsSinceLocalEpoch(t));
    (void)std::sprintf(buffer, "%s_%u", date, static_cast<std::uint32_t>(bits));
    return 0;
}

std::time_t currentTime()
{
    return std::time(nullptr);
}

std::string localTimeStamp()
{
    const std::time_t now = currentTime();
    std::tm local = {};
    char text[80];
    if (localtime_r(&now, &local) == nullptr ||
        std::strftime(text, sizeof text, IsoFormat, &local) == 0)
        return {};
    return text;
}
