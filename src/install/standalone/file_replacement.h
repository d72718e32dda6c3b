// Atomic replacement of a small file: even if the run is killed or the disk fills up, its path has
// either the complete old or the complete new content.
//
// The new content is written to a temporary file in the same directory and synced. The file gets
// the owner, group, mode and extended attributes of the old one and is renamed to its path. A link
// of root or of the running user stays a link: its target is replaced. Three kinds of files cannot
// be replaced and are overwritten in place: one that is not a regular file, one that is a mount
// point, and one whose owner or attributes the running user cannot copy, or in whose directory it
// cannot create files.
#pragma once

#include "safe_path.h"

#include <cstdio>
#include <functional>
#include <string>

#include <sys/types.h>

/// The suffix of a temporary file. A killed run leaves at most one; the next run that replaces the
/// same file deletes it, and so does the last removal.
extern const std::string TemporarySuffix;

/// Writes the new content to the stream. Failed writes need not be reported: the stream keeps its
/// error flag.
using ContentWriter = std::function<void(std::FILE*)>;

/// Replaces the content of `path` by what `write` writes. A new file gets `mode` under the umask.
/// `written` (null: not wanted) becomes the identity of the file that holds the new content.
///
/// Returns 0; CannotOpenForWriting (2), with the `errno` of the failed open, if the path cannot be
/// opened for writing: nothing was changed and `write` was not called; or the code of a failed
/// write (5, 6, 7): the old content is still there, unless the file had to be written in place.
[[nodiscard]] int replaceFile(const std::string& path, mode_t mode, const ContentWriter& write,
                              FileIdentity* written = nullptr);

/// Deletes the temporary file that a killed run may have left for `path`.
void deleteTemporaryFile(const std::string& path);

/// Gives the file `to` owner, group, mode and extended attributes of the file `from`, both open.
/// Returns false if something could not be passed on.
[[nodiscard]] bool copyAttributes(int from, int to);
