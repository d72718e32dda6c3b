#include "build_stamp.h"

#include <cstdlib>

const std::string zorBuildStamp = "22/12/02zor_9.2.30.0000";

ZorVersion stampVersion(const std::string& stamp)
{
    constexpr ZorVersion fallback = {2, 1, 0, 0, 0};
    const std::size_t underscore = stamp.find('_');
    if (underscore == std::string::npos)
        return fallback;

    long numbers[4] = {};
    int count = 0;
    const char* at = stamp.c_str() + underscore;
    do {
        char* end = nullptr;
        const long number = std::strtol(at + 1, &end, 10);
        if (end == at + 1)
            break;
        numbers[count++] = number;
        at = end;
    } while (count < 4 && *at == '.');

    if (count < 2 || numbers[0] <= 0 || numbers[1] < 0 || numbers[2] < 0 || numbers[3] < 0)
        return fallback;
    return {static_cast<std::uint32_t>(numbers[0]), static_cast<std::uint32_t>(numbers[1]),
            static_cast<std::uint32_t>(numbers[2]), static_cast<std::uint32_t>(numbers[3]), 0};
}

std::string stampBuildDate(const std::string& stamp)
{
    if (stamp.size() <= 9 || stamp[2] != '/' || stamp[5] != '/')
        return {};
    return stamp.substr(0, 8);
}
