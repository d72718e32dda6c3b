#include "planned_run.h"

#include "locations.h"
#include "settings.h"

#include <cstring>
#include <iostream>
#include <sstream>

namespace {

/// Collects what the library prints while this exists.
class CapturedOutput {
public:
    CapturedOutput()
        : log_(logstream), out_(std::cout.rdbuf(text_.rdbuf())),
          err_(std::cerr.rdbuf(errors_.rdbuf()))
    {
        logstream = &text_;
    }
    CapturedOutput(const CapturedOutput&) = delete;
    CapturedOutput& operator=(const CapturedOutput&) = delete;
    ~CapturedOutput()
    {
        logstream = log_;
        std::cout.rdbuf(out_);
        std::cerr.rdbuf(err_);
    }

    /// The first line of standard error, or of everything else.
    [[nodiscard]] std::string firstLine() const
    {
        std::string text = errors_.str().empty() ? text_.str() : errors_.str();
        return text.substr(0, text.find('\n'));
    }

private:
    std::ostringstream text_;
    std::ostringstream errors_;
    std::ostream* log_;
    std::streambuf* out_;
    std::streambuf* err_;
};

/// `arguments` without "-o" and its file, as the installer's own parser would find them.
std::vector<std::string> withoutLogFile(const std::vector<std::string>& arguments)
{
    std::vector<std::string> kept;
    for (std::size_t at = 0; at < arguments.size(); ++at) {
        const std::string& option = arguments[at];
        const bool isOption = at >= 2 && option.size() == 2 && option[0] == '-';
        const bool takesArgument =
            isOption && std::strchr("dfsoc", option[1]) != nullptr && at + 1 < arguments.size();
        if (takesArgument && option[1] == 'o') {
            ++at;
            continue;
        }
        kept.push_back(option);
        if (takesArgument)
            kept.push_back(arguments[++at]);
    }
    return kept;
}

} // namespace

PlannedRun parseRun(const std::vector<std::string>& arguments)
{
    std::vector<std::string> texts = withoutLogFile(arguments);
    texts.insert(texts.begin(), "wzorinst");
    std::vector<char*> pointers;
    pointers.reserve(texts.size() + 1);
    for (std::string& text : texts)
        pointers.push_back(text.data());
    pointers.push_back(nullptr);

    PlannedRun run;
    const CapturedOutput output;
    if (!isRoot())
        localInstall = true;
    if (parseCommandLine(static_cast<int>(texts.size()), pointers.data(), run.commandLine) != 0)
        run.error = output.firstLine();
    else if (fixDestination(run.commandLine, defaultInstallDir(localInstall)) != 0)
        run.error = "no destination directory";
    return run;
}
