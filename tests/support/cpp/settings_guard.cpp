#include "settings_guard.h"

#include "settings.h"

#include <tuple>

namespace {

auto allSettings()
{
    return std::tie(localInstall, skipExploiterRegistration, privateMode, debugMode, norollback,
                    ignoreNonFatalErrors, ignoreUpdateErrors, createSingleUserModeFile,
                    applySingleUserMode, custom_log_path_available, spbPackage, fileScannerMode,
                    new_log_path, logstream, globalFilesUmask, LogDirMode, CommonLogDirMode,
                    CacheDirRootMode, EtcDirMode, interp, spbFileRoot, trawlcfgExe, trawlfsExe,
                    zor_file_handle);
}

template <typename... Types>
std::tuple<Types...> valuesOf(const std::tuple<Types&...>& references)
{
    return references;
}

} // namespace

SettingsGuard::SettingsGuard()
    : restore_([values = valuesOf(allSettings())] { allSettings() = values; })
{
}

SettingsGuard::~SettingsGuard()
{
    restore_();
}
