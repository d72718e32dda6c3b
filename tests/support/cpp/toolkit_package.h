// A small toolkit for tests: its files, the SPB that contains them, and scanner programs that log
// their calls.
#pragma once

#include <string>
#include <utility>
#include <vector>

/// Names below the image root with their contents, in the order of the package. A name that ends
/// with "/" is a directory.
using PackageFiles = std::vector<std::pair<std::string, std::string>>;

/// Writes an executable shell script with `commands` to `path`.
void plantScript(const std::string& path, const std::string& commands);

/// A scanner program (a shell script) that appends a line to the file `log` for each call: its
/// name and, in brackets, each of its arguments, "trawlcfg [-disable] [all]".
///
/// It exits with 3 when its arguments, joined by blanks, contain `failing` (empty: never).
std::string scannerProgram(const std::string& log, const std::string& failing = "");

/// Puts that scanner program as "bin/trawlcfg" and "bin/trawlfs" into the directory `home`.
void plantScanners(const std::string& home, const std::string& log,
                   const std::string& failing = "");

/// The files of a complete toolkit, its scanner programs as above.
PackageFiles toolkitFiles(const std::string& log, const std::string& failing = "");

/// The content of the file `name` in `files`, to be changed; the test fails when there is none.
std::string& contentOf(PackageFiles& files, const std::string& name);

/// `files` without the file `name`.
PackageFiles without(const PackageFiles& files, const std::string& name);

/// Writes the SPB with `files` to `path` and makes it the package of this run: the settings are as
/// after the start of the program.
void usePackage(const std::string& path, const PackageFiles& files);

/// Sets the layout names that the start of the program completes.
void useCompleteLayoutNames();
