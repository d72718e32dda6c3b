// Process-wide settings: what the command line chose, and the names of the package's layout.
//
// They are written while the program starts and reads its command line, by the repair of a broken
// installation (ignoreUpdateErrors) and by the detection of single-user mode; all other code only
// reads them.
#pragma once

#include <cstdio>
#include <iosfwd>
#include <string>

#include <sys/types.h>

// What the command line chose.

extern bool localInstall;              ///< per-user installation instead of the shared one
extern bool skipExploiterRegistration; ///< do not add the exploiter to the registry
extern bool privateMode;               ///< a private installation or removal follows the action
extern bool debugMode;                 ///< trace lines, and the output of external commands
extern bool norollback;                ///< leave everything as it is when an installation fails
extern bool ignoreNonFatalErrors;      ///< a failed scanner command counts as a success
extern bool ignoreUpdateErrors;        ///< the status of scanner commands is ignored
extern bool createSingleUserModeFile;  ///< put the single-user flag into the installation
extern bool applySingleUserMode;       ///< single-user mode: only the owner may write
extern bool custom_log_path_available; ///< a directory for traces was given

extern std::string spbPackage;      ///< path of the SPB
extern std::string fileScannerMode; ///< default provider of the file-system scanner
extern std::string new_log_path;    ///< the directory for traces

/// Every line of progress, warning or error: standard output, or the file of "-o". Never null.
extern std::ostream* logstream;

// Modes of what an installation creates, in single-user mode 0755 and 022.

extern mode_t globalFilesUmask; ///< the process umask while an installation creates
extern mode_t LogDirMode;
extern mode_t CommonLogDirMode;
extern mode_t CacheDirRootMode;
extern mode_t EtcDirMode;
inline constexpr mode_t CorvanCommonDirMode = 0777;
inline constexpr mode_t InstallDirMode = 0750; ///< the one package directory that not all read

/// Turns single-user mode on for the rest of the run: restricts the modes above and sets
/// applySingleUserMode.
void enterSingleUserMode();

// The package's layout: names of directories and files, relative to the installation.

extern std::string interp;      ///< platform directory inside the image root
extern std::string spbFileRoot; ///< image root inside the SPB; with `interp` once completed
extern std::string trawlcfgExe; ///< scanner control; relative to the installation once prefixed
extern std::string trawlfsExe;  ///< file-system scanner; the same

inline const std::string spbBinDir = "bin";
inline const std::string spbPropertiesDir = "properties";
inline const std::string spbCfgDir = "config";
inline const std::string spbCfgXssDir = "xss";
inline const std::string spbBinPluginsDir = "plugins";
inline const std::string spbBinCustomScannersDir = "customscanners";
inline const std::string auxDirInstall = "install";
inline const std::string binDir = "bin"; // part of the interface; spbBinDir is used
inline const std::string binEtcDir = "bin/etc";
inline const std::string etcDir = "etc";
inline const std::string logDir = "logs";
inline const std::string cacheDir = "cache_data";
inline const std::string zorCommonDir = "ZOR";
inline const std::string zorProps = "Zor.properties";
inline const std::string traceProps = "ZorTrace.properties";
inline const std::string installProps = "zor_install.properties";
inline const std::string UninstallFileName = "_uninst";
inline const std::string singleUserFlag = "config/SingleUserMode";
inline const std::string ZOR_FILE_INDEX = "ZOR_files";

/// Completes the layout names that depend on one another. Call it once, before any of them is used.
void completeLayoutNames();

/// The file index while an extraction writes it; null at all other times.
extern std::FILE* zor_file_handle;
