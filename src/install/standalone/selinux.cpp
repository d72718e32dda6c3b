#include "selinux.h"

#include "commands.h"
#include "paths.h"
#include "settings.h"

#include <ostream>

namespace {

constexpr const char* SelinuxProbe = "/usr/sbin/selinuxenabled";
constexpr const char* LabellingTool = "/usr/bin/chcon";
constexpr const char* SystemToolDir = "/usr/bin";

} // namespace

int setSelinuxContext(const std::string& home)
{
    const int enabled = runCommand(SelinuxProbe, SystemToolDir, "");
    if (enabled != 0) {
        *logstream << "SELinux not enabled or not supported\n";
        return enabled;
    }
    return runCommand(LabellingTool, SystemToolDir,
                      "-R -t texrel_shlib_t " + joinPath(home, spbBinDir));
}
