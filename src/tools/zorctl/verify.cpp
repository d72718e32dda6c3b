#include "verify.h"

#include "comparison.h"
#include "exit_status.h"
#include "file_index.h"
#include "installation_lock.h"
#include "json_report.h"
#include "locations.h"
#include "settings.h"
#include "shown_text.h"
#include "single_user_mode.h"
#include "survey.h"
#include "tool_output.h"

#include <iostream>

namespace {

constexpr int VerifySchema = 1;

Json toJson(const Difference& difference)
{
    return {{"path", jsonText(difference.path)},
            {"kind", difference.kind},
            {"columns", difference.columns.empty() ? Json(nullptr) : Json(difference.columns)},
            {"configuration", difference.isConfiguration},
            {"keys", textList(difference.keys)}};
}

/// One line as rpm -V writes it, with two kinds of its own.
void printLine(const Difference& difference)
{
    const char letter = difference.isConfiguration ? 'c' : ' ';
    const std::string path = shown(difference.path);
    if (difference.kind == "missing" || difference.kind == "foreign")
        std::cout << difference.kind << "   " << letter << ' ' << path << '\n';
    else
        std::cout << difference.columns << "  " << letter << ' ' << path << '\n';
    for (const std::string& key : difference.keys)
        std::cout << "             customised: " << shown(key) << '\n';
}

/// True if a line of this kind is a difference that sets the exit status.
bool counts(const Difference& difference, const VerifyOptions& options)
{
    if (difference.kind == "foreign")
        return options.strict;
    if (difference.kind == "customised")
        return options.strict || difference.columns.find_first_of("MUG") != std::string::npos;
    return true;
}

int exitStatusOf(const std::vector<Difference>& differences, const VerifyOptions& options)
{
    int status = ToolOk;
    for (const Difference& difference : differences) {
        if (!counts(difference, options))
            continue;
        if (difference.kind != "unknown")
            return ToolDiffers;
        status = ToolTrouble;
    }
    return status;
}

int refuse(const std::string& what, int status)
{
    complain(shown(what));
    return status;
}

} // namespace

int verifyInstallation(const VerifyOptions& options)
{
    localInstall = options.type.empty() ? !isRoot() : options.type == valueInstallLocal;
    const ScopedFd lock = lockForReading(localInstall);
    const Installation found = surveyRegistry(localInstall);
    if (found.registryState == "missing")
        return refuse(found.registryPath + ": nothing is installed", ToolNotInstalled);
    if (found.registryState != "complete")
        return refuse(found.registryPath + ": " + found.registryState,
                      found.registryState == "unreadable" ? ToolTrouble : ToolDiffers);
    if (found.singleUserMode.value_or(false))
        enterSingleUserMode();

    Comparison comparison(found, options);
    if (!options.spb.empty() && !comparison.withPackage())
        return refuse(options.spb + ": package not found or not valid", ToolTrouble);
    if (std::string state; options.spb.empty() && !comparison.withIndex(state))
        return refuse(fileIndexPath(found.registry.homeDirectory) + ": " + state +
                          "; name the package to compare with it",
                      ToolTrouble);

    const int status = exitStatusOf(comparison.differences(), options);
    if (!options.json) {
        for (const Difference& difference : comparison.differences())
            printLine(difference);
        return status;
    }
    Json report = reportHead("verify", VerifySchema);
    report["locked"] = lock.isOpen();
    report["type"] = installTypeName(localInstall);
    report["home"] = jsonText(found.registry.homeDirectory);
    report["compared_with"] = options.spb.empty() ? "index" : "package";
    report["differences"] = Json::array();
    for (const Difference& difference : comparison.differences())
        report["differences"].push_back(toJson(difference));
    printJson(report);
    return status;
}
