#include "doctor.h"

#include "diagnosis.h"
#include "exit_status.h"
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

constexpr int DoctorSchema = 1;
Installation surveyAsked()
{
    return localInstall ? surveyOwn() : surveyShared();
}

void printText(const Diagnosis& diagnosis, const Installation& after, const DoctorOptions& options)
{
    std::cout << "Interrupted: "
              << (diagnosis.interrupted().empty() ? "nothing" : diagnosis.interrupted()) << '\n';
    for (const Action& action : diagnosis.actions())
        std::cout << (options.apply ? action.outcome : "to do") << ": " << action.code << " "
                  << shown(action.path) << '\n';
    for (const Problem& problem : diagnosis.advice())
        std::cout << "advice: " << problem.code << ": " << shown(problem.text) << '\n';
    std::cout << "State: " << healthName(after.health) << '\n';
    if (!options.apply && !diagnosis.actions().empty())
        std::cout << "Nothing was changed: --apply does what is listed\n";
}

Json toJson(const Diagnosis& diagnosis, const Installation& after, const DoctorOptions& options)
{
    Json report = reportHead("doctor", DoctorSchema);
    report["applied"] = options.apply;
    report["type"] = installTypeName(localInstall);
    report["home"] = jsonText(diagnosis.home());
    report["interrupted"] =
        diagnosis.interrupted().empty() ? Json(nullptr) : Json(diagnosis.interrupted());
    report["actions"] = Json::array();
    for (const Action& action : diagnosis.actions())
        report["actions"].push_back({{"action", action.code},
                                     {"path", jsonText(action.path)},
                                     {"outcome", action.outcome}});
    report["advice"] = Json::array();
    for (const Problem& problem : diagnosis.advice())
        report["advice"].push_back({{"code", problem.code}, {"text", jsonText(problem.text)}});
    report["installation"] = toJson(after);
    return report;
}

int exitStatusOf(const Diagnosis& diagnosis, const Installation& after,
                 const DoctorOptions& options, bool good)
{
    if (after.health == Health::Unknown)
        return ToolTrouble;
    if (!good || (!options.apply && !diagnosis.actions().empty()) ||
        after.health == Health::Damaged)
        return ToolDiffers;
    if (after.health == Health::Absent)
        return ToolNotInstalled;
    return diagnosis.advice().empty() ? ToolOk : ToolDiffers;
}

} // namespace

int examine(const DoctorOptions& options)
{
    localInstall = options.type.empty() ? !isRoot() : options.type == valueInstallLocal;
    ScopedFd lock(-1);
    if (!options.apply) {
        lock = lockForReading(localInstall);
    } else if (takeLock(lockPath(localInstall), true, 0, lock) != LockState::Held) {
        complain("cannot take the lock " + shown(lockPath(localInstall)));
        return ToolLocked;
    }

    Installation found = surveyAsked();
    if (found.singleUserMode.value_or(false))
        enterSingleUserMode();
    Diagnosis diagnosis(found, options.home);
    const bool good = !options.apply || diagnosis.carryOut();
    const Installation after = surveyAsked();
    if (options.json)
        printJson(toJson(diagnosis, after, options));
    else
        printText(diagnosis, after, options);
    return exitStatusOf(diagnosis, after, options, good);
}
