#include "property_file.h"

#include "file_codes.h"
#include "file_reading.h"
#include "file_replacement.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <utility>

namespace {

void logFailure(const char* doing, const std::string& path, int error)
{
    *logstream << doing << path << " error: " << error << " (" << std::strerror(error) << ")\n";
}

bool contains(const std::string& text, const std::string& fragment)
{
    return text.find(fragment) != std::string::npos;
}

int readLines(const std::string& path, std::vector<std::string>& lines)
{
    const ScopedFile file = openForReading(path);
    if (!file)
        return errno;
    std::string line;
    while (readLine(file.get(), line))
        lines.push_back(line);
    const int error = std::ferror(file.get()) != 0 ? errno : 0;
    // A file that was read only in part would later overwrite the complete one. A directory can be
    // opened and has no lines: saving is what fails.
    return error == EISDIR ? 0 : error;
}

} // namespace

int PropertyFile::load(const std::string& path)
{
    lines.clear();
    std::vector<std::string> loaded;
    const int error = readLines(path, loaded);
    if (error == 0)
        lines = std::move(loaded);
    else
        logFailure("Loading file ", path, error);
    return error;
}

int PropertyFile::save(const std::string& path) const
{
    const int code = replaceFile(path, NewFileMode, [this](std::FILE* file) {
        for (const std::string& line : lines) {
            (void)std::fwrite(line.data(), 1, line.size(), file);
            (void)std::fputc('\n', file);
        }
    });
    if (code != CannotOpenForWriting)
        return 0;
    const int error = errno;
    logFailure("Saving file ", path, error);
    return error;
}

std::string PropertyFile::getValue(const std::string& key) const
{
    for (const std::string& line : lines) {
        if (!contains(line, "=") || keyOfLine(line) != key)
            continue;
        std::string value = textAfterEquals(line);
        trim(value);
        return value;
    }
    return {};
}

const std::string* PropertyFile::findLine(const std::string& key) const
{
    for (auto line = lines.rbegin(); line != lines.rend(); ++line) {
        if (keyOfLine(*line) == key)
            return &*line;
    }
    return nullptr;
}

std::string* PropertyFile::findLine(const std::string& key)
{
    return const_cast<std::string*>(std::as_const(*this).findLine(key)); // a line of this file
}

int PropertyFile::setValue(const std::string& key, const std::string& value)
{
    int count = 0;
    for (std::string& line : lines) {
        if (keyOfLine(line) != key)
            continue;
        line = key + "=" + value;
        ++count;
    }
    return count;
}

int PropertyFile::setValueWhereKeyContains(const std::string& fragment, const std::string& value)
{
    int count = 0;
    for (std::string& line : lines) {
        const std::string key = keyOfLine(line);
        if (!contains(key, fragment))
            continue;
        line = key + "=" + value;
        ++count;
    }
    return count;
}

int PropertyFile::clearWhereKeyContains(const std::string& fragment)
{
    int count = 0;
    for (std::string& line : lines) {
        if (!contains(keyOfLine(line), fragment))
            continue;
        line.clear();
        ++count;
    }
    return count;
}

int PropertyFile::replaceText(const std::string& old, const std::string& replacement)
{
    int count = 0;
    for (std::string& line : lines)
        count += replaceEach(line, old, replacement);
    return count;
}

void PropertyFile::dump() const
{
    for (const std::string& line : lines)
        std::cout << line << '\n';
}

int editPropertyFile(const std::string& path, const PropertyEdit& edit)
{
    PropertyFile file;
    const int loaded = file.load(path);
    if (loaded != 0) {
        *logstream << "Could not load property file\n";
        return loaded;
    }
    edit(file);
    const int saved = file.save(path);
    if (saved != 0)
        *logstream << "Could not save property file\n";
    return saved;
}

int customizePropertyFile(const std::string& path, const PropertyEdit& edit)
{
    *logstream << "Customizing property file: " << path << '\n';
    return editPropertyFile(path, edit);
}
