#include "status.h"

#include "build_stamp.h"
#include "common_directory.h"
#include "exit_status.h"
#include "json_report.h"
#include "locations.h"
#include "other_users.h"
#include "shown_text.h"
#include "survey.h"
#include "text_output.h"
#include "tool_output.h"

#include <algorithm>
#include <cctype>
#include <iostream>
#include <string>
#include <vector>

namespace {

constexpr int StatusSchema = 1;
constexpr int Red = 31;
constexpr int Green = 32;
constexpr int Yellow = 33;

/// The text of a member: a list is joined by blanks, null is `-`.
std::string textOf(const Json& value)
{
    if (value.text() != nullptr)
        return shown(*value.text());
    if (value.isNull())
        return "-";
    if (value.boolean() != nullptr)
        return *value.boolean() ? "yes" : "no";
    return value.dump();
}

bool isUsedBy(const Json& installation, const std::string& exploiter)
{
    const auto* const list = installation["exploiters"].list();
    return list != nullptr &&
           std::find(list->begin(), list->end(), jsonText(exploiter)) != list->end();
}

/// The installations that `options` ask for.
std::vector<Json> collect(const StatusOptions& options)
{
    std::vector<Json> found;
    if (options.type != valueInstallLocal)
        found.push_back(toJson(surveyShared()));
    if (options.type != valueInstallGlobal)
        found.push_back(toJson(surveyOwn()));
    if (options.type != valueInstallGlobal && options.allUsers) {
        const std::string own = homeDirectory();
        for (const Account& account : allAccounts()) {
            if (account.home == own)
                continue;
            Json other = surveyOther(account);
            if (!(other["health"] == "absent"))
                found.push_back(std::move(other));
        }
    }
    if (!options.exploiter.empty())
        std::erase_if(found, [&](const Json& one) { return !isUsedBy(one, options.exploiter); });
    return found;
}

int exitStatusOf(const std::vector<Json>& installations)
{
    const auto any = [&](const char* health) {
        return std::any_of(installations.begin(), installations.end(),
                           [&](const Json& one) { return one["health"] == health; });
    };
    if (any("damaged"))
        return ToolDiffers;
    if (any("intact"))
        return ToolOk;
    return any("unknown") ? ToolTrouble : ToolNotInstalled;
}

std::string titleOf(const Json& one)
{
    if (one["type"] == "global")
        return "shared (global) installation";
    return "installation of user " + textOf(one["user"]);
}

std::string colouredHealth(const std::string& health)
{
    if (health == "intact")
        return coloured(health, Green);
    return coloured(health, health == "damaged" ? Red : Yellow);
}

/// The texts of a list, of problems their codes, with `separator` between them.
std::string joined(const std::vector<Json>& list, char separator)
{
    std::string text;
    for (const Json& one : list) {
        if (!text.empty())
            text += separator;
        text += textOf(one.members() != nullptr ? one["code"] : one);
    }
    return text;
}

std::string listText(const Json& value)
{
    if (value.list() == nullptr)
        return textOf(value);
    return value.list()->empty() ? "none" : joined(*value.list(), ' ');
}

void printInstallation(const Json& one)
{
    std::cout << "\nStatus of " << titleOf(one) << ": " << colouredHealth(textOf(one["health"]))
              << '\n'
              << "INI file = " << textOf(one["registry"]["path"]) << '\n';
    const auto* const problems = one["problems"].list();
    for (const Json& problem : problems != nullptr ? *problems : std::vector<Json>())
        std::cout << coloured("Problem", Red) << " = " << textOf(problem["code"]) << ": "
                  << textOf(problem["text"]) << '\n';
    if (one["home"].isNull() || one["health"] == "unknown") {
        std::cout << (one["health"] == "unknown" ? "Cannot be read\n" : "Not installed\n");
        return;
    }
    std::cout << "Install dir = " << textOf(one["home"]) << '\n'
              << "Install version = " << textOf(one["version"]) << '\n'
              << "Build date = " << textOf(one["build_date"]) << '\n'
              << "Exploiter list = " << listText(one["exploiters"]) << '\n'
              << "Home = " << textOf(one["home_state"]) << '\n'
              << "Index = " << textOf(one["index"]["state"]) << ", "
              << textOf(one["index"]["files"]) << " files\n"
              << "Recorded type = " << textOf(one["recorded_type"]) << '\n'
              << "Single-user mode = " << textOf(one["single_user_mode"]) << '\n';
    const auto* const backups = one["backups"].list();
    if (backups == nullptr || backups->empty())
        std::cout << "Leftover backups = " << listText(one["backups"]) << '\n';
    else
        for (const Json& backup : *backups)
            std::cout << "Leftover backup = " << textOf(backup) << '\n';
}

void printText(const Json& report, const std::vector<Json>& installations)
{
    std::cout << "ZOR installer version: " << zorBuildStamp << '\n'
              << "Default install type: " << textOf(report["default_install_type"]) << '\n'
              << "Corvan common dir = " << textOf(report["common_directory"]) << '\n';
    for (const Json& one : installations)
        printInstallation(one);
}

/// Prints `value` as assignments to the variable `name`, and to longer names if it is an object.
/// A list becomes one line per value, in which a newline is escaped.
void printAssignments(const std::string& name, const Json& value)
{
    if (value.members() != nullptr) {
        for (const auto& [key, member] : *value.members())
            printAssignments(name + "_" + key, member);
        return;
    }
    std::string variable = name;
    std::transform(variable.begin(), variable.end(), variable.begin(), [](unsigned char c) {
        return static_cast<char>(std::toupper(c)); // in the "C" locale
    });
    std::string text;
    if (value.list() != nullptr)
        text = joined(*value.list(), '\n');
    else if (!value.isNull())
        text = textOf(value);
    std::cout << variable << "=" << shellQuoted(text) << '\n';
}

void printShell(const Json& report, const std::vector<Json>& installations)
{
    printAssignments("zorctl_schema", report["schema"]);
    printAssignments("zorctl_common_directory", report["common_directory"]);
    printAssignments("zorctl_count", installations.size());
    std::size_t number = 0;
    for (const Json& one : installations)
        printAssignments("zorctl_" + std::to_string(number++), one);
}

} // namespace

int showStatusReport(const StatusOptions& options)
{
    Json report = reportHead("status", StatusSchema);
    report["default_install_type"] = installTypeName(!isRoot());
    report["common_directory"] = jsonText(readCommonDirectory(true));
    const std::vector<Json> installations = collect(options);

    if (options.format == "json") {
        report["installations"] = Json::array();
        for (const Json& one : installations)
            report["installations"].push_back(one);
        printJson(report);
    } else if (options.format == "shell") {
        printShell(report, installations);
    } else {
        printText(report, installations);
    }
    return exitStatusOf(installations);
}
