// The quick road of an archive entry that is as its headers say.
//
// A stream (zip_file.h) delivers an entry in the blocks that its reader asks for. Of a damaged
// entry the blocks decide how much is left; a sound one arrives whole whatever the steps. So it is
// copied here in steps that suit zlib, which copies its window at every call, and the system. At
// the first sign of anything else this gives up, and the caller starts again with the stream.
#pragma once

struct ZipEntry;

/// What copySoundEntry() returns beside the codes of file_codes.h.
inline constexpr int EntryNotSound = -1;

/// Writes the content of `entry` of `archive` to the empty file `destination`. The place where
/// `archive` stands is neither used nor changed.
///
/// Returns 0; the code of a failed write (5, 6, 7); or EntryNotSound (-1): `destination` may then
/// hold anything, and only the entry's stream tells what belongs there.
[[nodiscard]] int copySoundEntry(int archive, const ZipEntry& entry, int destination);
