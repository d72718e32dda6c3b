#include "package_layout.h"

#include "discovery.h"
#include "paths.h"
#include "permissions.h"
#include "settings.h"

#include <algorithm>
#include <map>

namespace {

constexpr mode_t PublicMode = 0755;

/// Stands for the installation in the installer's table of permissions.
constexpr const char* Home = "/home of the installation";

std::map<std::string, mode_t, std::less<>> finalModes()
{
    Discovery found;
    found.currentZorHome = found.currentCfgHome = Home;
    found.homeExists = true;
    const std::string prefix = joinPath(Home, "");
    std::map<std::string, mode_t, std::less<>> modes;
    for (const Permission& permission : permissionTable(found)) {
        if (permission.path.starts_with(prefix))
            modes[permission.path.substr(prefix.size())] = permission.mode;
    }
    return modes;
}

} // namespace

const std::string& imageRoot()
{
    static const std::string root = [] {
        completeLayoutNames();
        return spbFileRoot;
    }();
    return root;
}

const std::vector<std::string>& packageDirs()
{
    static const std::vector<std::string> dirs = {spbBinDir + "/", spbPropertiesDir + "/",
                                                  spbCfgDir + "/", auxDirInstall + "/"};
    return dirs;
}

std::optional<std::string> landingOf(std::string_view name)
{
    if (!name.starts_with(imageRoot()))
        return std::nullopt;
    const std::string_view relative = name.substr(imageRoot().size());
    const auto& dirs = packageDirs();
    if (std::none_of(dirs.begin(), dirs.end(),
                     [&](const std::string& dir) { return relative.starts_with(dir); }))
        return std::nullopt;

    std::string place;
    for (const char c : relative) {
        if (c != '/' || !endsWithSlash(place)) // slashes in a row become one
            place += c;
    }
    return place;
}

mode_t extractionMode(std::string_view place)
{
    return place.starts_with(packageDirs().back()) ? InstallDirMode : PublicMode;
}

mode_t installedMode(std::string_view place)
{
    static const auto modes = finalModes();
    const auto found = modes.find(place.ends_with('/') ? place.substr(0, place.size() - 1) : place);
    return found == modes.end() ? extractionMode(place) : found->second;
}

std::string octal(mode_t mode)
{
    std::string text;
    for (int shift = 9; shift >= 0; shift -= 3)
        text += static_cast<char>('0' + (mode >> shift & 7));
    return text;
}

bool removalDeletes(std::string_view place)
{
    const std::string client = "install/QMX_CLI/";
    const std::string platform = client + interp + "/";
    const std::string deleted[] = {"bin/",
                                   "bin/plugins/",
                                   "bin/customscanners/",
                                   "bin/etc/",
                                   "bin/etc/trawlhw/",
                                   "bin/etc/trawluse/",
                                   "bin/etc/trawlnet/",
                                   "bin/etc/trawlfs/",
                                   "bin/etc/trawlsw/",
                                   "bin/etc/trawlvpd/",
                                   "install/",
                                   client,
                                   platform,
                                   platform + "bin/",
                                   platform + "lib/",
                                   platform + "msg_cat/",
                                   platform + "msg_cat/C/"};
    return place.starts_with("properties/") || place.starts_with("config/") ||
           std::find(std::begin(deleted), std::end(deleted), place) != std::end(deleted);
}

std::vector<std::string_view> componentsOf(std::string_view path)
{
    std::vector<std::string_view> components;
    for (;;) {
        const std::size_t slash = path.find('/');
        components.push_back(path.substr(0, slash));
        if (slash == std::string_view::npos)
            return components;
        path.remove_prefix(slash + 1);
    }
}
