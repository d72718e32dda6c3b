#include "text.h"

namespace {

std::string framed(std::string_view name)
{
    return ListSeparator + std::string(name) + ListSeparator;
}

} // namespace

void trim(std::string& text)
{
    const std::size_t last = text.find_last_not_of(Blanks);
    if (last == std::string::npos)
        return;
    text.erase(last + 1);
    text.erase(0, text.find_first_not_of(Blanks));
}

void trimRight(std::string& text)
{
    text.erase(text.find_last_not_of(Blanks) + 1); // npos + 1 is 0: nothing but blanks
}

void appendToNameList(std::string& list, std::string_view name)
{
    list += framed(name);
}

bool nameListContains(std::string_view list, std::string_view name)
{
    return list.find(framed(name)) != std::string_view::npos;
}

std::string keyOfLine(const std::string& line)
{
    std::string key = line.substr(0, line.find('='));
    trim(key);
    return key;
}

std::string textAfterEquals(const std::string& line)
{
    const std::size_t equals = line.find('=');
    return equals == std::string::npos ? std::string() : line.substr(equals + 1);
}

int replaceEach(std::string& text, const std::string& old, const std::string& replacement)
{
    int count = 0;
    // Deliberate: searches from the beginning again, so that what a replacement forms with its
    // neighbours is replaced, too.
    for (std::size_t at = text.find(old); at != std::string::npos; at = text.find(old)) {
        text.replace(at, old.size(), replacement);
        ++count;
    }
    return count;
}
