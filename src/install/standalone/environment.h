// The machine around an installation: external commands, SELinux labels, the library path, and the
// directories for logs and traces.
#pragma once

#include <string>

#include <sys/types.h>

struct FileTransaction;

/// Runs `program` with `arguments` (passed as they stand, quoting included) through the shell, its
/// output suppressed unless in debug mode, and logs the command and its status.
///
/// `directory` is where the program lies: part of the interface, not used. Returns the raw status
/// of system(): 0 is success.
int runCommand(const std::string& program, const std::string& directory,
               const std::string& arguments);

/// Creates and journals the directory `name` in `parent`, and what is missing above it. Returns 0
/// or the code of createPath(), which is logged.
[[nodiscard]] int makeSubdir(FileTransaction& transaction, const std::string& parent,
                             const std::string& name, mode_t mode);

/// Creates the directory "install" in `home` with mode 0750 under `globalFilesUmask`. Returns 0 or
/// -1.
[[nodiscard]] int createInstallDir(FileTransaction& transaction, const std::string& home);

/// Labels the toolkit's binaries for text relocations where SELinux is enabled. Returns the status
/// of the last command; no installation fails on it.
int setSelinuxContext(const std::string& home);

/// Puts the toolkit's libraries in front of the library path of the commands that are run. Each
/// call does so again. A failure is logged and ignored.
void setLibraryPath(const std::string& home);

/// Makes sure that the toolkit's log directory exists: `customPath`, or the one in the common
/// directory, which is created too. `home` is part of the interface, not used. Returns 0 whatever
/// happened.
int setupCommonLogDir(FileTransaction& transaction, const std::string& home, bool useCustomPath,
                      const std::string& customPath);

/// The toolkit's log directory below the common directory `common`.
[[nodiscard]] std::string commonLogDir(const std::string& common);

/// setupCommonLogDir(), then tells the toolkit where its trace files go. Returns the status of the
/// scanner control program, or RunInterrupted (14).
[[nodiscard]] int updateCommonTracePath(FileTransaction& transaction, const std::string& home,
                                        bool useCustomPath, const std::string& customPath);
