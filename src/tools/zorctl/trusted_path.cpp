#include "trusted_path.h"

#include <cstdlib>
#include <memory>

#include <sys/stat.h>
#include <unistd.h>

namespace {

bool isOurs(const struct stat& status)
{
    return status.st_uid == 0 || status.st_uid == geteuid();
}

bool isClosedToOthers(const std::string& directory)
{
    struct stat status = {};
    return lstat(directory.c_str(), &status) == 0 && S_ISDIR(status.st_mode) && isOurs(status) &&
           (status.st_mode & 022) == 0;
}

struct Free {
    void operator()(char* text) const { std::free(text); } // NOLINT: of realpath()
};

} // namespace

bool isTrustedFile(const std::string& path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode) || !isOurs(status) ||
        status.st_nlink != 1)
        return false;
    const std::string parent = path.substr(0, path.rfind('/'));
    const std::unique_ptr<char, Free> real(realpath(parent.c_str(), nullptr));
    if (!real || !isClosedToOthers("/"))
        return false;
    const std::string directory = real.get();
    for (std::size_t slash = directory.find('/', 1); slash != std::string::npos;
         slash = directory.find('/', slash + 1)) {
        if (!isClosedToOthers(directory.substr(0, slash)))
            return false;
    }
    return isClosedToOthers(directory);
}
