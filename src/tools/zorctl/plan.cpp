#include "plan.h"

#include "exit_status.h"
#include "installation_lock.h"
#include "json_report.h"
#include "settings.h"
#include "shown_text.h"
#include "simulation.h"
#include "text_output.h"
#include "tool_output.h"

#include <iostream>
#include <set>

namespace {

constexpr int PlanSchema = 1;

Json textOrNull(const std::string& text)
{
    return text.empty() ? Json(nullptr) : Json(jsonText(text));
}

/// The files that are written over others, without those that are only edited.
std::set<std::string> replaced(const Forecast& forecast)
{
    std::set<std::string> paths = forecast.tree.written();
    for (const std::string& path : forecast.edited)
        paths.erase(path);
    return paths;
}

/// The files that are edited and were there before.
std::set<std::string> edited(const Forecast& forecast)
{
    const std::set<std::string> written = forecast.tree.written();
    std::set<std::string> paths;
    for (const std::string& path : forecast.edited) {
        if (written.contains(path))
            paths.insert(path);
    }
    return paths;
}

Json toJson(const Forecast& forecast, bool locked)
{
    Json report = reportHead("plan", PlanSchema);
    report["locked"] = locked;
    report["type"] = forecast.type;
    report["action"] = forecast.action;
    report["exploiter"] = jsonText(forecast.exploiter);
    report["home"] = jsonText(forecast.home);
    report["operation"] = forecast.operation;
    report["private"] = nullptr;
    if (!forecast.privateOperation.empty())
        report["private"] = {{"operation", forecast.privateOperation},
                             {"home", jsonText(forecast.privateHome)}};
    report["succeeds"] = forecast.failure.empty();
    report["failure"] = textOrNull(forecast.failure);
    report["unchanged"] = forecast.unchanged;
    report["package"] = textOrNull(forecast.package);
    report["stops_scanners"] = forecast.stopsScanners;
    report["commands"] = textList(forecast.commands);
    report["space"] = {{"needed", forecast.spaceNeeded}, {"available", forecast.spaceAvailable}};
    report["created"] = textList(forecast.tree.created());
    report["replaced"] = textList(replaced(forecast));
    report["edited"] = textList(edited(forecast));
    report["deleted"] = textList(forecast.tree.deleted());
    report["deleted_of_owner"] = textList(forecast.ownerFiles);
    report["created_directories"] = textList(forecast.tree.createdDirectories());
    report["deleted_directories"] = textList(forecast.tree.deletedDirectories());
    report["not_restored"] = textList(forecast.notRestored);
    return report;
}

template <typename Names>
void printNames(const char* what, const Names& names, bool all)
{
    if (names.empty())
        return;
    std::cout << what << ": " << names.size() << '\n';
    if (!all)
        return;
    for (const std::string& name : names)
        std::cout << "    " << shown(name) << '\n';
}

int statusOf(const Forecast& forecast, const PlanOptions& options)
{
    if (!forecast.failure.empty())
        return forecast.operation == "refused" && forecast.action == "r" ? ToolNotInstalled
                                                                         : ToolDiffers;
    return forecast.unchanged ? options.unchangedExit : ToolOk;
}

} // namespace

void printForecast(const Forecast& forecast, bool files)
{
    std::cout << "Operation: " << forecast.operation << " (" << forecast.type << ") in "
              << shown(forecast.home) << '\n';
    if (!forecast.privateOperation.empty())
        std::cout << "Private operation: " << forecast.privateOperation << " in "
                  << shown(forecast.privateHome) << '\n';
    if (forecast.failure.empty())
        std::cout << (forecast.unchanged ? "Result: nothing changes\n" : "Result: success\n");
    else
        std::cout << "Result: " << coloured("failure", 31) << ": " << shown(forecast.failure)
                  << '\n';
    std::cout << "Scanners stopped: " << (forecast.stopsScanners ? "yes" : "no") << '\n';
    if (forecast.spaceNeeded != 0)
        std::cout << "Space needed: " << forecast.spaceNeeded << " of " << forecast.spaceAvailable
                  << " bytes\n";
    printNames("Files created", forecast.tree.created(), files);
    printNames("Files replaced", replaced(forecast), files);
    printNames("Files edited", edited(forecast), files);
    printNames("Files deleted", forecast.tree.deleted(), files);
    printNames("Files deleted that no installation brought", forecast.ownerFiles, true);
    printNames("Not brought back if it fails", forecast.notRestored, files);
}

int planRun(const PlanOptions& options)
{
    const PlannedRun run = parseRun(options.arguments);
    if (!run.error.empty()) {
        complain("wzorinst would not accept this command line: " + shown(run.error));
        return ToolTrouble;
    }
    const ScopedFd lock = lockForReading(localInstall);
    const Forecast forecast = forecastRun(run);
    if (options.json)
        printJson(toJson(forecast, lock.isOpen()));
    else
        printForecast(forecast, options.files);
    return statusOf(forecast, options);
}
