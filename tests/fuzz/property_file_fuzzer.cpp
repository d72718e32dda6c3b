// The input's first four lines are operands: a key, a value, a text to replace and its replacement.
// The rest is a property file, which is loaded, changed by every operation and saved.
#include "fuzz_support.h"
#include "property_file.h"
#include "text.h"

#include <string_view>

namespace {

std::string takeLine(std::string_view& input)
{
    const std::size_t end = std::min(input.find('\n'), input.size());
    std::string line(input.substr(0, end));
    input.remove_prefix(std::min(end + 1, input.size()));
    return line;
}

/// Replacing is asked for only what must come to an end: each replacement makes the line shorter,
/// or nothing of it can be part of the text to replace. The installer's own are of this kind, a
/// placeholder and a path.
bool isReplaceable(const std::string& old, const std::string& replacement)
{
    if (old.empty())
        return false;
    return replacement.size() < old.size() || replacement.find_first_of(old) == std::string::npos;
}

void checkLoadAndSave(const MemoryFile& file, PropertyFile& properties)
{
    std::string content = file.content();
    require(properties.load(file.path()) == 0, "a file is loaded");
    if (!content.empty() && content.back() != '\n')
        content += '\n';
    require(properties.save(file.path()) == 0, "a file is saved");
    require(file.content() == content, "a file is saved as it was loaded");
}

void checkSet(PropertyFile& properties, const std::string& key, const std::string& value)
{
    const bool known = properties.findLine(key) != nullptr;
    const int count = properties.setValue(key, value);
    require((count != 0) == known, "a known key is set");
    if (!known)
        return;
    require(*properties.findLine(key) == key + "=" + value, "a line is set to key and value");
    std::string trimmed = value;
    trim(trimmed);
    require(properties.getValue(key) == trimmed, "a value that was set is found");
}

void checkReplace(PropertyFile& properties, const std::string& old, const std::string& replacement)
{
    if (!isReplaceable(old, replacement))
        return;
    (void)properties.replaceText(old, replacement);
    for (const std::string& line : properties.lines)
        require(line.find(old) == std::string::npos, "nothing is left to replace");
}

void checkClear(PropertyFile& properties, const std::string& fragment)
{
    (void)properties.setValueWhereKeyContains(fragment, "1");
    (void)properties.clearWhereKeyContains(fragment);
    for (const std::string& line : properties.lines) {
        require(line.empty() || keyOfLine(line).find(fragment) == std::string::npos,
                "a line whose key contains the fragment is emptied");
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    silenceLog();
    std::string_view input(reinterpret_cast<const char*>(data), size);
    const std::string key = takeLine(input);
    const std::string value = takeLine(input);
    const std::string old = takeLine(input);
    const std::string replacement = takeLine(input);
    file.write(input.data(), input.size());

    // An empty line of one byte is a text of 32, held twice and a half while the list grows. Every
    // line can be set to the value and every byte be replaced, and a line is held in several texts
    // while it changes.
    const std::size_t operands = key.size() + value.size() + replacement.size();
    const ResourceBound bound(64 * KiB + 256 * size + 8 * input.size() * operands, 200);
    PropertyFile properties;
    checkLoadAndSave(file, properties);
    const std::size_t count = properties.lines.size();
    checkSet(properties, key, value);
    checkReplace(properties, old, replacement);
    checkClear(properties, key);
    require(properties.lines.size() == count, "no operation adds or takes lines");
    require(properties.save(file.path()) == 0, "a changed file is saved");
    return 0;
}
