// Extraction of one entry of a package to a file.
//
// A stream (zip_file.h) delivers an entry in the blocks that its reader asks for, and of a damaged
// entry the block size decides how much is delivered. A sound entry arrives whole whatever the
// block size, so a fast path copies it in the steps that suit the inflater and the system. At the
// first sign of damage the fast path gives up, and the entry is read again through its stream.
#pragma once

#include "file_codes.h"
#include "package_window.h"
#include "transaction.h"

#include <memory>
#include <string>

#include <sys/types.h>

class ZipFile;
struct ZipEntry;

/// A package that stays open between entries: opening it for each small entry would cost as much as
/// writing some of them.
class OpenPackage {
public:
    /// `archive` must outlive this object.
    explicit OpenPackage(const ZipFile& archive) : archive_(archive) {}

    [[nodiscard]] const ZipFile& archive() const { return archive_; }

    /// The package, to read `entry` from dataStart() on, without moving the file offset that all
    /// callers share; null where ZipFile::getInputStream() returns null.
    [[nodiscard]] std::shared_ptr<PackageWindow> open(const ZipEntry* entry);

    /// Call this after a file was replaced, with the status of what was `moved` away, all 0 if
    /// nothing was. If that was the package or on its path, the next open() uses what is at the
    /// path then.
    void fileWasReplaced(const struct stat& moved);

    /// Call this after a file was truncated, which may be the package.
    void fileWasTruncated();

private:
    const ZipFile& archive_;
    std::shared_ptr<PackageWindow> file_;
    FileIdentity identity_; ///< of the open file
};

/// Writes `entry` of `package` to `destination`, whose old content is backed up, and gives it
/// exactly `mode` unless that is 0. The directory must exist. Until the file is complete, nobody
/// but its owner can open it for writing.
///
/// Returns 0; CannotOpenForReading (1), with nothing changed, if the entry has no stream; 9 if the
/// old content cannot be moved; 2, also for a name that is planted meanwhile; 4; or the code of a
/// failed write (5, 6, 7).
[[nodiscard]] int extractOpenFile(FileTransaction& transaction, OpenPackage& package,
                                  const ZipEntry* entry, const std::string& destination,
                                  mode_t mode);

/// extractOpenFile() of an entry of `archive`, which is opened for it.
[[nodiscard]] int extractFile(FileTransaction& transaction, const ZipFile& archive,
                              const ZipEntry* entry, const std::string& destination, mode_t mode);

/// What copySoundEntry() returns besides the codes of file_codes.h.
inline constexpr int EntryNotSound = -1;

/// The fast path of extractOpenFile(), declared for its tests: writes the content of `entry` of
/// `package`, if it matches its headers, to the empty file `destination`.
///
/// Returns 0; the code of a failed write (5, 6, 7); or EntryNotSound (-1): `destination` may then
/// hold anything, and the entry's stream decides what belongs there.
[[nodiscard]] int copySoundEntry(PackageWindow& package, const ZipEntry& entry, int destination);
