#include "findings.h"

#include "shown_text.h"

#include <algorithm>

std::string_view kindName(Kind kind)
{
    switch (kind) {
    case Kind::Fails:
        return "fails";
    case Kind::Damaged:
        return "damaged";
    case Kind::Surprises:
        break;
    }
    return "surprises";
}

const std::vector<CodeKind>& allCodes()
{
    static const std::vector<CodeKind> codes = {
        {"backup-blocked", Kind::Fails},
        {"dot-name", Kind::Fails},
        {"empty-file", Kind::Fails},
        {"inflates-beyond-size", Kind::Fails},
        {"missing-directory", Kind::Fails},
        {"missing-property-file", Kind::Fails},
        {"missing-scanner-control", Kind::Fails},
        {"name-too-long", Kind::Fails},
        {"no-leading-slash", Kind::Fails},
        {"not-a-directory", Kind::Fails},
        {"unknown-size", Kind::Fails},
        {"unreadable", Kind::Fails},
        {"unsupported-method", Kind::Fails},
        {"crc-mismatch", Kind::Damaged},
        {"encrypted", Kind::Damaged},
        {"size-2-gib", Kind::Damaged},
        {"size-mismatch", Kind::Damaged},
        {"archive-comment", Kind::Surprises},
        {"backup-name", Kind::Surprises},
        {"central-directory", Kind::Surprises},
        {"directory-stays", Kind::Surprises},
        {"dot-dot-in-name", Kind::Surprises},
        {"duplicate", Kind::Surprises},
        {"entries-not-counted", Kind::Surprises},
        {"file-comment", Kind::Surprises},
        {"installer-file", Kind::Surprises},
        {"long-path", Kind::Surprises},
        {"method-differs", Kind::Surprises},
        {"missing-file-scanner", Kind::Surprises},
        {"missing-placeholder", Kind::Surprises},
        {"missing-script", Kind::Surprises},
        {"name-differs", Kind::Surprises},
        {"newline-in-name", Kind::Surprises},
        {"no-room-for-backup", Kind::Surprises},
        {"nul-in-name", Kind::Surprises},
        {"outside-image-root", Kind::Surprises},
        {"outside-package-directories", Kind::Surprises},
        {"replaces-directory", Kind::Surprises},
        {"symbolic-link", Kind::Surprises},
        {"unknown-placeholder", Kind::Surprises},
        {"zip64", Kind::Surprises},
    };
    return codes;
}

std::optional<Kind> kindOf(std::string_view code)
{
    const auto& codes = allCodes();
    const auto found = std::find_if(codes.begin(), codes.end(),
                                    [&](const CodeKind& known) { return known.code == code; });
    return found == codes.end() ? std::nullopt : std::optional(found->kind);
}

std::string Finding::line() const
{
    std::string line(kindName(kind()));
    line.append(": ").append(code).append(": ");
    if (entry)
        line.append(shown(*entry)).append(": ");
    return line + text;
}

void Findings::add(std::string_view code, std::optional<std::string> entry, std::string text)
{
    if (accepted_.contains(code))
        return;
    worst_ = worst_ ? std::max(*worst_, *kindOf(code)) : *kindOf(code);
    if (kept_.size() == MostKept) {
        ++omitted_;
        return;
    }
    kept_.push_back({code, std::move(entry), std::move(text)});
}
