#include "json_report.h"

#include "build_stamp.h"
#include "file_index.h"
#include "locations.h"
#include "survey.h"
#include "version.h"

namespace {

constexpr const char* Unknown = "unknown";

Json problemsOf(const Installation& found)
{
    Json list = Json::array();
    for (const Problem& problem : found.problems)
        list.push_back({{"code", problem.code}, {"text", jsonText(problem.text)}});
    return list;
}

/// Fills in what the registry says, or `none` for each member.
void addRegistered(Json& object, const Installation& found, const Json& none)
{
    const bool complete = found.registryState == "complete";
    const InstallRegistry& registry = found.registry;
    object["version"] = complete ? Json(formatVersion(registry.version)) : none;
    object["build_date"] = complete ? Json(jsonText(registry.buildDate)) : none;
    object["home"] = complete ? Json(jsonText(registry.homeDirectory)) : none;
    object["configuration_root"] = complete ? Json(jsonText(registry.configRootDirectory)) : none;
    object["exploiters"] = complete ? textList(exploiterList(registry.exploiters)) : none;
}

/// Fills in what was found in the home directory, or `none` for each member.
void addHome(Json& object, const Installation& found, const Json& none)
{
    if (found.registryState != "complete") {
        for (const char* const name :
             {"home_state", "index", "recorded_type", "single_user_mode", "backups"})
            object[name] = none;
        return;
    }
    object["home_state"] = found.homeState;
    object["index"] = {{"path", jsonText(fileIndexPath(found.registry.homeDirectory))},
                       {"state", found.indexState},
                       {"files", found.indexedFiles ? Json(*found.indexedFiles) : Json(Unknown)}};
    object["recorded_type"] = found.recordedType;
    object["single_user_mode"] = found.singleUserMode ? Json(*found.singleUserMode) : Json(Unknown);
    object["backups"] = found.backupsKnown ? textList(found.backups) : Json(Unknown);
}

} // namespace

Json reportHead(const char* command, int schema)
{
    return {{"schema", schema},
            {"command", command},
            {"tool",
             {{"version", formatVersion(stampVersion(zorBuildStamp))},
              {"build_date", stampBuildDate(zorBuildStamp)}}}};
}

Json toJson(const Installation& found)
{
    const Json none = found.health == Health::Unknown ? Json(Unknown) : Json(nullptr);
    Json object;
    object["type"] = installTypeName(found.local);
    object["user"] = !found.local         ? Json(nullptr)
                     : found.user.empty() ? Json(Unknown)
                                          : Json(jsonText(found.user));
    object["uid"] = found.local ? Json(found.uid) : Json(nullptr);
    object["health"] = healthName(found.health);
    object["problems"] = problemsOf(found);
    object["registry"] = {{"path", jsonText(found.registryPath)},
                          {"state", found.registryState},
                          {"backup_state", found.registryBackupState}};
    addRegistered(object, found, none);
    addHome(object, found, none);
    return object;
}
