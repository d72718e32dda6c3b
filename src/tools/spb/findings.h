// What would make an installation of a package fail, or surprise somebody.
//
// Kinds and codes are an interface: scripts compare them. Each code is explained in spb(1).
#pragma once

#include <cstddef>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

/// How bad a finding is; later ones are worse.
enum class Kind {
    Surprises, ///< the package installs, but not as its maker may think
    Damaged,   ///< it installs, but not what was packed
    Fails,     ///< an installation fails
};

[[nodiscard]] std::string_view kindName(Kind kind);

struct CodeKind {
    std::string_view code;
    Kind kind;
};

/// Every code and its kind.
[[nodiscard]] const std::vector<CodeKind>& allCodes();

/// The kind of `code`, which must be one of allCodes(); nothing otherwise.
[[nodiscard]] std::optional<Kind> kindOf(std::string_view code);

struct Finding {
    std::string_view code;
    std::optional<std::string> entry; ///< raw bytes; none when it is about the archive as a whole
    std::string text;

    [[nodiscard]] Kind kind() const { return *kindOf(code); }

    /// "kind: code: entry: text", safe to print.
    [[nodiscard]] std::string line() const;
};

/// The findings of one package. Of a package made to have millions, only the first are kept.
class Findings {
public:
    static constexpr std::size_t MostKept = 10000;

    /// Findings of the codes `accepted` are not taken in.
    explicit Findings(std::set<std::string, std::less<>> accepted = {})
        : accepted_(std::move(accepted))
    {
    }

    /// `code` must be one of allCodes().
    void add(std::string_view code, std::optional<std::string> entry, std::string text);

    [[nodiscard]] const std::vector<Finding>& kept() const { return kept_; }
    [[nodiscard]] std::size_t omitted() const { return omitted_; }

    /// The worst kind of all findings, kept or not; nothing when there are none.
    [[nodiscard]] std::optional<Kind> worst() const { return worst_; }

private:
    std::set<std::string, std::less<>> accepted_;
    std::vector<Finding> kept_;
    std::size_t omitted_ = 0;
    std::optional<Kind> worst_;
};
