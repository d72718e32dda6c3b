#include "installation.h"

#include "common_directory.h"
#include "durability.h"
#include "file_operations.h"
#include "fresh_install.h"
#include "interruption.h"
#include "locations.h"
#include "registry.h"
#include "settings.h"
#include "upgrade.h"

#include <optional>
#include <ostream>
#include <vector>

namespace {

constexpr mode_t IndexMode = 0644;

/// Syncs what the run wrote: after `deployment`, whole file systems.
int makeDurable(const FileTransaction& transaction, const FileSystemSync* deployment)
{
    const int code = deployment != nullptr ? deployment->sync()
                                           : syncDirectories(changedDirectories(transaction));
    if (code != FileOk)
        *logstream << "*** Error: could not write the installation to disk. Error = " << code
                   << '\n';
    return code;
}

/// The directories that a deployment into `home` writes to.
std::vector<std::string> writtenDirectories(const std::string& home, bool useCustomPath,
                                            const std::string& customPath)
{
    std::vector<std::string> directories = {home, registryDirectory(localInstall)};
    if (useCustomPath)
        directories.push_back(customPath);
    else if (!localInstall)
        directories.insert(directories.end(), {readCommonDirectory(true), commonSettingPath()});
    return directories;
}

/// Runs the fresh installation or the upgrade. A signal can stop it until its last step is done.
int runProcedure(Procedure procedure, FileTransaction& transaction, InstallRegistry& registry,
                 InstallRegistry& request, const std::string& indexPath, bool flag,
                 bool useCustomPath, const std::string& customPath)
{
    const ScopedInterruptible interruptible;
    if (isInterrupted())
        return RunInterrupted;
    const int code =
        procedure == Procedure::FreshInstall
            ? freshInstall(transaction, request, &indexPath, flag, useCustomPath, customPath)
            : upgradeInstall(transaction, registry, request, &indexPath,
                             procedure == Procedure::Upgrade, flag, useCustomPath, customPath);
    (void)setFileMode(indexPath, IndexMode); // also of a failed run; may be absent
    return code == FileOk && isInterrupted() ? RunInterrupted : code;
}

} // namespace

int installWithTransaction(bool upgrade, FileTransaction& transaction, InstallRegistry& registry,
                           InstallRegistry& request, const std::string& indexPath, bool flag,
                           bool useCustomPath, const std::string& customPath)
{
    Procedure procedure = Procedure::FreshInstall;
    if (upgrade)
        procedure =
            isUpgradeNeeded(registry, request) ? Procedure::Upgrade : Procedure::Registration;
    return installWithTransaction(procedure, transaction, registry, request, indexPath, flag,
                                  useCustomPath, customPath);
}

int installWithTransaction(Procedure procedure, FileTransaction& transaction,
                           InstallRegistry& registry, InstallRegistry& request,
                           const std::string& indexPath, bool flag, bool useCustomPath,
                           const std::string& customPath)
{
    const InstallRegistry& target = procedure == Procedure::FreshInstall ? request : registry;
    std::optional<FileSystemSync> deployment;
    if (procedure != Procedure::Registration)
        deployment.emplace(writtenDirectories(target.homeDirectory, useCustomPath, customPath));

    int code = runProcedure(procedure, transaction, registry, request, indexPath, flag,
                            useCustomPath, customPath);
    if (code == FileOk)
        code = makeDurable(transaction, deployment ? &*deployment : nullptr);

    if (code == 0) {
        *logstream << "Installation successful, committing changes\n";
        (void)commit(transaction); // always 0
    } else if (!norollback) {
        *logstream << "Installation failed, rolling back\n";
        (void)rollback(transaction); // always 0
        if (deployment)
            (void)deployment->sync(); // the old state is restored in any case
    } else {
        *logstream << "Installation failed\n";
    }
    return code;
}
