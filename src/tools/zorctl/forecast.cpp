#include "forecast.h"

#include "safe_path.h"

#include <sys/statvfs.h>

void Forecast::fail(const std::string& reason)
{
    if (failure.empty())
        failure = reason;
}

void Forecast::noteLoss(const std::string& path)
{
    if (tree.kindOfEntry(path) == SimulatedTree::Kind::Directory) {
        for (const std::string& child : tree.list(path))
            noteLoss(child);
    } else if (tree.kindOfEntry(path) != SimulatedTree::Kind::Missing) {
        notRestored.push_back(path);
    }
}

void Forecast::measureSpace()
{
    if (blockSize != 0)
        return;
    std::string place = privateHome.empty() ? home : privateHome;
    while (!place.empty() && !pathExists(place))
        place.erase(place.rfind('/') == std::string::npos ? 0 : place.rfind('/'));
    struct statvfs status = {};
    blockSize = 4096;
    if (statvfs(place.empty() ? "/" : place.c_str(), &status) != 0)
        return;
    blockSize = status.f_frsize != 0 ? status.f_frsize : 4096;
    spaceAvailable = static_cast<unsigned long long>(status.f_bavail) * blockSize;
}
