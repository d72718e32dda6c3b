#include "checker.h"
#include "exit_status.h"
#include "shown_text.h"
#include "subcommands.h"
#include "tool_output.h"

#include <algorithm>
#include <iostream>

namespace {

Json reportOf(const std::string& file, const Findings& findings)
{
    Json list = Json::array();
    for (const Finding& finding : findings.kept())
        list.push_back({{"kind", kindName(finding.kind())},
                        {"code", finding.code},
                        {"entry", finding.entry ? Json(shown(*finding.entry)) : Json()},
                        {"text", finding.text}});
    Json report = {{"file", shown(file)},
                   {"installs", findings.worst().value_or(Kind::Surprises) == Kind::Surprises},
                   {"findings", std::move(list)}};
    if (findings.omitted() != 0)
        report["omitted"] = findings.omitted();
    return report;
}

void printText(const std::string& prefix, const Findings& findings)
{
    for (const Finding& finding : findings.kept())
        std::cout << prefix << finding.line() << '\n';
    if (findings.omitted() != 0)
        std::cout << prefix << findings.omitted() << " more findings are not shown\n";
}

int statusOf(const Findings& findings)
{
    if (!findings.worst())
        return ToolOk;
    return *findings.worst() == Kind::Surprises ? ToolDiffers : ToolTrouble;
}

} // namespace

int checkCommand(const CheckOptions& options)
{
    int status = ToolOk;
    const bool several = options.files.size() > 1;
    Json reports = Json::array();
    for (const std::string& file : options.files) {
        Findings findings({options.accepted.begin(), options.accepted.end()});
        int error = 0;
        const auto package = PackageFile::open(file, findings, error);
        if (package)
            error = checkPackage(*package, findings);
        if (error != 0) {
            complainOf(file, error);
            status = ToolTrouble;
            continue;
        }
        status = std::max(status, statusOf(findings));
        if (options.json)
            reports.push_back(reportOf(file, findings));
        else
            printText(several ? shown(file) + ": " : "", findings);
    }
    if (options.json && several)
        printJson(reports);
    else if (options.json && !reports.list()->empty())
        printJson(reports.list()->front());
    return status;
}
