// Unpacks a package into a directory, and writes nothing outside of it: a name that leads out is
// refused, and every directory on the way is opened in the one before, without following links. So
// it does not matter what somebody else puts into the directory meanwhile. No file is replaced.
#include "exit_status.h"
#include "file_codes.h"
#include "file_writing.h"
#include "landed_files.h"
#include "package_layout.h"
#include "progress.h"
#include "safe_path.h"
#include "shown_text.h"
#include "subcommands.h"
#include "tool_output.h"

#include <cerrno>
#include <cstring>
#include <set>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr int OpenDirectory = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

/// Opens the directory `components`, without the last of them, below `root`, and makes what is
/// missing. Not open, with `errno`, when something else is in the way.
ScopedFd openParent(int root, const std::vector<std::string_view>& components)
{
    ScopedFd directory(openat(root, ".", OpenDirectory));
    std::string path;
    for (std::size_t i = 0; i + 1 < components.size() && directory.isOpen(); ++i) {
        const std::string name(components[i]);
        path.append(name).append("/");
        if (name.empty() || name == ".")
            continue;
        (void)mkdirat(directory.get(), name.c_str(), installedMode(path)); // or it is there already
        directory = ScopedFd(openat(directory.get(), name.c_str(), OpenDirectory));
    }
    return directory;
}

/// Unpacks the entries of one package.
class Extractor {
public:
    Extractor(const PackageFile& package, int root, const std::string& directory)
        : package_(package), root_(root), directory_(directory)
    {
    }

    /// Returns 0, or ToolDiffers (1) when something could not be unpacked as it was packed.
    int run()
    {
        std::uint64_t total = 0;
        for (const ZipEntry& entry : package_.entries())
            total += entry.uncompressedSize;
        Progress progress("extracting", package_.entries().size(), total);
        for (std::size_t i = 0; i < package_.entries().size(); ++i) {
            if (const auto place = landingOf(package_.entries()[i].name))
                extract(i, *place);
            progress.advance(package_.entries()[i].uncompressedSize);
        }
        return status_;
    }

private:
    void refuse(const std::string& place, const std::string& reason)
    {
        complain(shown(directory_ + "/" + place) + ": " + reason);
        status_ = ToolDiffers;
    }

    void extract(std::size_t number, const std::string& place)
    {
        const auto components = componentsOf(place);
        for (const std::string_view component : components) {
            if (component == "..")
                return refuse(place, "leads out of its directory");
        }
        const ScopedFd parent = openParent(root_, components);
        if (!parent.isOpen())
            return refuse(place, std::strerror(errno));
        if (!components.back().empty())
            writeFile(number, place, parent.get(), std::string(components.back()));
    }

    void writeFile(std::size_t number, const std::string& place, int parent,
                   const std::string& name)
    {
        const ZipEntry& entry = package_.entries()[number];
        if ((package_.details(number).flags & EncryptedFlag) != 0)
            return refuse(place, "is encrypted");
        if (!written_.insert(place).second) // a later entry replaces an earlier one
            (void)unlinkat(parent, name.c_str(), 0);

        ScopedFd file(openat(parent, name.c_str(),
                             O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                             installedMode(place)));
        if (!file.isOpen())
            return refuse(place, std::strerror(errno));
        int error = 0;
        const EntryContent content =
            package_.readEntry(entry, [&](const char* data, std::size_t size) {
                errno = 0;
                if (writeAll(file.get(), data, size) != FileOk)
                    error = errno == 0 ? EIO : errno;
                return error == 0;
            });
        if (error == 0 && close(file.release()) != 0)
            error = errno;
        const bool isEmpty = entry.uncompressedSize == 0;
        if (error == 0 && (isEmpty || (content.opened && content.isSound(entry))))
            return;
        (void)unlinkat(parent, name.c_str(), 0);
        if (error != 0)
            refuse(place, std::strerror(error));
        else
            refuse(place, content.opened ? "is damaged" : "cannot be opened");
    }

    const PackageFile& package_;
    int root_;
    const std::string& directory_;
    std::set<std::string> written_;
    int status_ = ToolOk;
};

} // namespace

int extractCommand(const ExtractOptions& options)
{
    const auto package = openPackage(options.file);
    if (!package)
        return ToolTrouble;
    if (createDirectoryPath(options.directory, 0777) != 0 && errno != EEXIST) {
        complainOf(options.directory, errno);
        return ToolTrouble;
    }
    const ScopedFd root = openPath(options.directory, O_RDONLY | O_DIRECTORY);
    if (!root.isOpen()) {
        complainOf(options.directory, errno);
        return ToolTrouble;
    }
    return Extractor(*package, root.get(), options.directory).run();
}
