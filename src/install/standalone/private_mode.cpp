#include "private_mode.h"

#include "file_index.h"
#include "fresh_install.h"
#include "registry.h"
#include "scanner_control.h"
#include "settings.h"
#include "transaction.h"
#include "tree_removal.h"

#include <ostream>

namespace {

int removePrivately(const std::string& privatePath)
{
    FileTransaction transaction;
    (void)stopScanners(privatePath, true, true); // the directory is removed in any case
    (void)removeDir(transaction, privatePath, "", true);
    *logstream << "Performing private remove\n";
    return 0;
}

int installPrivately(const std::string& privatePath)
{
    *logstream << "Performing private installation\n";
    FileTransaction transaction;
    transaction.backup = false;
    InstallRegistry registry;
    registry.homeDirectory = privatePath;
    registry.configRootDirectory = privatePath;
    const std::string indexPath = fileIndexPath(privatePath);

    *logstream << "Performing private installation to " << privatePath << '\n';
    const int status = freshInstall(transaction, registry, &indexPath, false,
                                    custom_log_path_available, new_log_path);
    *logstream << "PrivMode Action finished with RC: " << status << '\n';
    return status;
}

} // namespace

int performPrivateAction(const CommandLine& commandLine, int status)
{
    *logstream << "Now perform privateMode\n";
    switch (commandLine.privateAction) {
    case 'r':
        return removePrivately(commandLine.privatePath);
    case 'i':
        return installPrivately(commandLine.privatePath);
    default:
        *logstream << "Unsupported action for private mode\n";
        return status;
    }
}
