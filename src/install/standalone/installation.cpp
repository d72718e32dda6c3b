#include "installation.h"

#include "file_operations.h"
#include "fresh_install.h"
#include "settings.h"
#include "upgrade.h"

#include <ostream>

namespace {

constexpr mode_t IndexMode = 0644;

} // namespace

int installWithTransaction(bool upgrade, FileTransaction& transaction, InstallRegistry& registry,
                           InstallRegistry& request, const std::string& indexPath, bool flag,
                           bool useCustomPath, const std::string& customPath)
{
    const int code =
        upgrade ? upgradeInstall(transaction, registry, request, &indexPath, flag, useCustomPath,
                                 customPath)
                : freshInstall(transaction, request, &indexPath, flag, useCustomPath, customPath);
    (void)setFileMode(transaction, indexPath, IndexMode); // also of a failed run; may be absent

    if (code == 0) {
        *logstream << "Installation successful, committing changes\n";
        (void)commit(transaction); // always 0
    } else if (!norollback) {
        *logstream << "Installation failed, rolling back\n";
        (void)rollback(transaction); // always 0
    } else {
        *logstream << "Installation failed\n";
    }
    return code;
}
