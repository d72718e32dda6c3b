#include "version.h"

#include <cctype>
#include <cstdio>
#include <cstdlib>

namespace {

constexpr int MaxComponents = 5;

bool isDigit(char c)
{
    return c >= '0' && c <= '9';
}

std::size_t skipWhiteSpace(const std::string& text, std::size_t at)
{
    while (at < text.size() && std::isspace(static_cast<unsigned char>(text[at])) != 0)
        ++at;
    return at;
}

/// Reads the run of digits at `at`, moves `at` past it. No overflow check: the number wraps.
std::uint32_t readNumber(const std::string& text, std::size_t& at)
{
    std::uint32_t value = 0;
    for (; at < text.size() && isDigit(text[at]); ++at)
        value = value * 10 + static_cast<std::uint32_t>(text[at] - '0');
    return value;
}

int signedDifference(std::uint32_t a, std::uint32_t b)
{
    return static_cast<std::int32_t>(a - b);
}

} // namespace

int parseVersion(const std::string& text, ZorVersion* version)
{
    std::uint32_t numbers[MaxComponents] = {};
    int count = 0;

    std::size_t at = skipWhiteSpace(text, 0);
    while (at < text.size() && isDigit(text[at])) {
        if (count == MaxComponents)
            return -1;
        numbers[count++] = readNumber(text, at);
        if (at == text.size() || text[at] != '.')
            break;
        ++at; // A final "." is accepted; the loop ends when no digit follows it.
    }

    if (skipWhiteSpace(text, at) != text.size())
        return -1;
    if (version != nullptr)
        *version = {numbers[0], numbers[1], numbers[2], numbers[3], numbers[4]};
    return 0;
}

int compareVersions(const ZorVersion& a, const ZorVersion& b)
{
    if (a.major != b.major)
        return signedDifference(a.major, b.major);
    if (a.minor != b.minor)
        return signedDifference(a.minor, b.minor);
    if (a.release != b.release)
        return signedDifference(a.release, b.release);
    if (a.level != b.level)
        return signedDifference(a.level, b.level);
    return signedDifference(a.fifth, b.fifth);
}

std::string formatVersion(const ZorVersion& version)
{
    const auto fifth = static_cast<std::int32_t>(version.fifth);
    if (fifth <= 0)
        return registryVersionText(version);
    return registryVersionText(version) + "." + std::to_string(fifth);
}

std::string registryVersionText(const ZorVersion& version)
{
    // Deliberate: printed as signed numbers, so that 2^31 and above are negative; the registry has
    // always been written like this.
    char text[64];
    (void)std::snprintf(
        text, sizeof text, "%d.%d.%d.%04d", // at most 47 characters
        static_cast<std::int32_t>(version.major), static_cast<std::int32_t>(version.minor),
        static_cast<std::int32_t>(version.release), static_cast<std::int32_t>(version.level));
    return text;
}

int buildDateNumber(const std::string& text)
{
    if (text.size() != 8 || text[2] != '/' || text[5] != '/')
        return 0;
    const std::string digits = text.substr(0, 2) + text.substr(3, 2) + text.substr(6, 2);
    const long number = std::strtol(digits.c_str(), nullptr, 10);
    return number < 1 ? 0 : static_cast<int>(number);
}
