#include "scanner_control.h"

#include "commands.h"
#include "interruption.h"
#include "paths.h"
#include "settings.h"

namespace {

int runControl(const std::string& home, const std::string& program, const char* arguments)
{
    return runCommand(joinPath(home, program), joinPath(home, spbBinDir), arguments);
}

} // namespace

bool isAcceptable(int status)
{
    return status == 0 || ignoreNonFatalErrors;
}

int stopScanners(const std::string& home, bool disable, bool stopFileScanner)
{
    struct Step {
        bool wanted;
        const std::string& program;
        const char* arguments;
    };
    // Deliberate: the forced shutdown with the shorter time-out comes before the unforced one.
    const Step steps[] = {
        {stopFileScanner, trawlfsExe, "-shutdown"},
        {disable, trawlcfgExe, "-disable all"},
        {true, trawlcfgExe, "-shutdown all -timeout 60 -force"},
        {true, trawlcfgExe, "-shutdown all -timeout 120"},
    };

    for (const Step& step : steps) {
        if (!step.wanted)
            continue;
        if (isInterrupted())
            break; // what was stopped is enabled again by the caller
        const int status = runControl(home, step.program, step.arguments);
        if (!ignoreUpdateErrors && !isAcceptable(status))
            return ScannersNotStopped;
    }
    return 0;
}

int restartScanners(const std::string& home)
{
    return runControl(home, trawlcfgExe, "-enable all");
}
