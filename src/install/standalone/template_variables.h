// The placeholders "$(name)" of the toolkit's scripts and property files, and the update of the
// scripts.
#pragma once

#include <string>

struct PropertyFile;

extern const std::string tokenZorDestDir;      ///< "$(ZOR_DestinationDir)": the home directory
extern const std::string tokenZorCfgRoot;      ///< "$(ZOR_ConfigRootDirectory)": the same directory
extern const std::string tokenCorvanCommonDir; ///< "$(CorvanCommonDir)": the common directory
extern const std::string tokenFileSeparator;   ///< "$(FileSeparator)": "/"; property files only
extern const std::string tokenScannerMode;     ///< "$(fscanner_mode)"; property files only

/// Replaces `placeholder` by `value` in every line of `file`, as PropertyFile::replaceText() does;
/// returns the number of replacements.
int replaceAll(PropertyFile& file, const std::string& placeholder, const std::string& value);

/// The scripts in "install" that carry placeholders.
inline constexpr const char* ScriptNames[] = {"trawlcfg.sh", "rmdirs.sh"};

/// Fills the placeholders of a script in.
void fillScript(PropertyFile& script, const std::string& home, const std::string& common);

/// Fills the placeholders of the script "install/"`fileName` in `home` in, and logs what it does.
///
/// Returns 0, also when there is no such script, or the `errno` with which loading or saving
/// failed.
int updateScript(const std::string& fileName, const std::string& home, const std::string& common);

/// updateScript() for every script that carries placeholders. A script that cannot be updated does
/// not fail an installation.
void updateScripts(const std::string& home, const std::string& common);
