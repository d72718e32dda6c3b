// The installer of the ZOR toolkit: the sequence of one run.

#include "build_stamp.h"
#include "command_line.h"
#include "descriptors.h"
#include "discovery.h"
#include "durability.h"
#include "installation.h"
#include "interruption.h"
#include "locations.h"
#include "permissions.h"
#include "private_mode.h"
#include "removal.h"
#include "settings.h"
#include "status_report.h"
#include "transaction.h"
#include "tree_removal.h"

#include <clocale>
#include <csignal>
#include <ostream>
#include <string>
#include <string_view>

namespace {

/// Makes two kinds of writes fail that would otherwise kill the process: to a pipe that nobody
/// reads, and beyond the file size limit. The run then continues or is undone.
void letWritesFail()
{
    for (const int number : {SIGPIPE, SIGXFSZ}) {
        // A handler, since commands would inherit an ignored signal. What the caller ignores stays
        // ignored.
        if (std::signal(number, [](int) {}) == SIG_IGN)
            (void)std::signal(number, SIG_IGN); // worked a moment ago
    }
}

/// Prints the settings of this run; returns the default destination, one of them.
std::string printSettings()
{
    *logstream << "ZOR version: " << zorBuildStamp << '\n'
               << "Install type: " << installTypeName(localInstall) << '\n'
               << "Register exploiter: " << (skipExploiterRegistration ? "no" : "yes") << '\n';
    // Called only once: without a home directory it prints an error.
    std::string defaultDir = defaultInstallDir(localInstall);
    *logstream << "Default dest: " << defaultDir << '\n'
               << "INI location: " << registryPath(localInstall) << '\n';
    return defaultDir;
}

int removeRegistered(Discovery& found, const InstallRegistry& request)
{
    if (!found.registryFound) {
        *logstream << "*** Error: INI file not found: nothing to remove.\n";
        return found.status;
    }
    FileTransaction transaction;
    const int status = removeInstallation(transaction, found.registry, request, &found.indexPath);
    if (status == 0) {
        // At most a registry was saved; if this fails, the old one may come back.
        (void)syncDirectories(changedDirectories(transaction));
        *logstream << "Uninstallation successful, removing temporary files\n";
        (void)commit(transaction); // always 0
    }
    return status;
}

Procedure procedureFor(const Discovery& found)
{
    if (!found.registryFound)
        return Procedure::FreshInstall;
    return found.upgradeNeeded ? Procedure::Upgrade : Procedure::Registration;
}

/// What follows a successful installation: the modes, and an upgrade's empty scanner cache.
void finishInstallation(FileTransaction& transaction, const Discovery& found)
{
    applyPermissions(found);
    if (found.upgradeNeeded)
        (void)removeDir(transaction, found.currentZorHome, cacheDir, true); // always 0
}

int installOrUpgrade(Discovery& found, InstallRegistry& request)
{
    if (!checkInstallTypeCompatibility(localInstall, request.homeDirectory))
        return -1;
    FileTransaction transaction;
    const int status =
        installWithTransaction(procedureFor(found), transaction, found.registry, request,
                               found.indexPath, true, custom_log_path_available, new_log_path);
    if (status == 0)
        finishInstallation(transaction, found);
    return status;
}

} // namespace

int main(int argc, char** argv)
{
    secureDescriptors();
    (void)std::setlocale(LC_ALL, "C"); // the start-up locale; cannot fail
    letWritesFail();
    if (!isRoot())
        localInstall = true;
    if (argc == 2 && std::string_view(argv[1]) == "t")
        return showStatus();

    completeLayoutNames();
    CommandLine commandLine;
    if (parseCommandLine(argc, argv, commandLine) != 0)
        return 1;
    if (fixDestination(commandLine, printSettings()) != 0)
        return 1;

    watchForSignals();
    Discovery found = discoverInstallation(commandLine);
    int status = found.installAction ? installOrUpgrade(found, commandLine.request)
                                     : removeRegistered(found, commandLine.request);
    if (privateMode)
        status = performPrivateAction(commandLine, status);

    *logstream << "Done.\n";
    endBySignal();
    return status == 0 ? 0 : 1;
}
