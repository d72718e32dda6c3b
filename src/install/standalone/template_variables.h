// The placeholders "$(name)" of the toolkit's scripts and property files, and filling them in.
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

/// The scripts in "install" that contain placeholders.
inline constexpr const char* ScriptNames[] = {"trawlcfg.sh", "rmdirs.sh"};

/// Fills in the placeholders of a script.
void fillScript(PropertyFile& script, const std::string& home, const std::string& common);

/// Fills in the placeholders of the script "install/"`fileName` in `home`, and logs its steps.
///
/// Returns 0, also if there is no such script, or the `errno` of a failed load or save.
int updateScript(const std::string& fileName, const std::string& home, const std::string& common);

/// Calls updateScript() for every script that contains placeholders. Failures are ignored: they do
/// not fail an installation.
void updateScripts(const std::string& home, const std::string& common);
