#include "test_files.h"

#include "settings.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>

#include <sys/stat.h>

namespace fs = std::filesystem;

namespace {

std::string lineFor(const fs::path& path, const std::string& name)
{
    struct stat status = {};
    EXPECT_EQ(0, lstat(path.c_str(), &status)) << path;
    if (S_ISLNK(status.st_mode))
        return "l " + name;
    char mode[8];
    (void)std::snprintf(mode, sizeof mode, "%04o", static_cast<unsigned>(status.st_mode & 07777U));
    return std::string(S_ISDIR(status.st_mode) ? "d " : "f ") + mode + " " + name;
}

} // namespace

TempDir::TempDir()
{
    std::string name = (fs::temp_directory_path() / "wzorinst-test-XXXXXX").string();
    EXPECT_NE(nullptr, mkdtemp(name.data()));
    path_ = name;
}

TempDir::~TempDir()
{
    std::error_code ignored;
    fs::remove_all(path_, ignored);
}

void writeFile(const std::string& path, const std::string& content)
{
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << content;
    file.close();
    ASSERT_TRUE(file) << "cannot write " << path;
}

std::string readFile(const std::string& path)
{
    std::ifstream file(path, std::ios::binary);
    EXPECT_TRUE(file) << "cannot read " << path;
    return {std::istreambuf_iterator<char>(file), {}};
}

void makeDirectories(const std::string& path)
{
    fs::create_directories(path);
}

mode_t modeOf(const std::string& path)
{
    struct stat status = {};
    EXPECT_EQ(0, stat(path.c_str(), &status)) << path;
    return status.st_mode & 07777U;
}

std::vector<std::string> treeOf(const std::string& path)
{
    std::vector<std::string> lines;
    for (const auto& entry : fs::recursive_directory_iterator(path))
        lines.push_back(lineFor(entry.path(), fs::relative(entry.path(), path).string()));
    std::sort(lines.begin(), lines.end(), [](const std::string& a, const std::string& b) {
        return a.substr(a.rfind(' ')) < b.substr(b.rfind(' '));
    });
    return lines;
}

LogCapture::LogCapture() : previous_(logstream)
{
    logstream = &stream_;
}

LogCapture::~LogCapture()
{
    logstream = previous_;
}
