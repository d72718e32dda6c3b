// A file that takes its name only when it is whole.
//
//     TemporaryFile file;
//     int error = file.create(path);     // ".spb-XXXXXX" in the directory of `path`
//     ... write to file.fd() ...
//     if (error == 0) error = file.commit();
//
// Until commit() the old file at `path` stays. Otherwise the destructor deletes the new one; a
// signal that ends the program (SIGINT, SIGTERM, SIGHUP) does so as well. One at a time.
#pragma once

#include "scoped.h"

#include <string>

class TemporaryFile {
public:
    TemporaryFile();
    TemporaryFile(const TemporaryFile&) = delete;
    TemporaryFile& operator=(const TemporaryFile&) = delete;
    ~TemporaryFile();

    /// Returns 0 or the `errno`. "-" is standard output: what is written goes there in commit(),
    /// from a file without a name.
    [[nodiscard]] int create(const std::string& path);

    [[nodiscard]] int fd() const { return file_.get(); }

    /// Gives the file its name and the mode 0666 under the umask. Returns 0 or the `errno`.
    [[nodiscard]] int commit();

private:
    std::string path_;
    std::string partial_;
    ScopedFd file_;
};
