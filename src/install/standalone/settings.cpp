#include "settings.h"

#include <iostream>

bool localInstall = false;
bool skipExploiterRegistration = false;
bool privateMode = false;
bool debugMode = false;
bool norollback = false;
bool ignoreNonFatalErrors = false;
bool ignoreUpdateErrors = true;
bool createSingleUserModeFile = false;
bool applySingleUserMode = false;
bool custom_log_path_available = false;

std::string spbPackage;
std::string fileScannerMode = "provider_cache";
std::string new_log_path;

std::ostream* logstream = &std::cout;

mode_t globalFilesUmask = 0;
mode_t LogDirMode = 0777;
mode_t CommonLogDirMode = 0777;
mode_t CacheDirRootMode = 0777;
mode_t EtcDirMode = 0777;

std::string interp = "linux-ix86";
std::string spbFileRoot = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/";
std::string trawlcfgExe = "trawlcfg";
std::string trawlfsExe = "trawlfs";

std::FILE* zor_file_handle = nullptr;

void enterSingleUserMode()
{
    globalFilesUmask = 022;
    LogDirMode = 0755;
    CommonLogDirMode = 0755;
    CacheDirRootMode = 0755;
    EtcDirMode = 0755;
    applySingleUserMode = true;
}

void completeLayoutNames()
{
    trawlcfgExe = spbBinDir + "/" + trawlcfgExe;
    trawlfsExe = spbBinDir + "/" + trawlfsExe;
    spbFileRoot += interp + "/";
}
