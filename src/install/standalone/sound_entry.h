// Fast path for an archive entry that matches its headers.
//
// A stream (zip_file.h) delivers an entry in the blocks that its reader asks for, and of a damaged
// entry the block size decides how much is delivered. A sound entry arrives whole whatever the
// block size, so it is copied here in the steps that suit the inflater and the system. At the first
// sign of damage this gives up, and the caller starts again with the stream.
#pragma once

class PackageWindow;
struct ZipEntry;

/// What copySoundEntry() returns besides the codes of file_codes.h.
inline constexpr int EntryNotSound = -1;

/// Writes the content of `entry` of `package` to the empty file `destination`.
///
/// Returns 0; the code of a failed write (5, 6, 7); or EntryNotSound (-1): `destination` may then
/// hold anything, and the entry's stream decides what belongs there.
///
/// Keeps its buffer for the next entry: at most 16 MiB, and no more than the largest entry so far
/// needed. The window of `package` holds the data of an entry, which is smaller.
[[nodiscard]] int copySoundEntry(PackageWindow& package, const ZipEntry& entry, int destination);

/// The content of `entry`, inflated in one call and confirmed by its size and its CRC-32; valid
/// until the next call. Null if the entry is stored, too large or not worth it, or if anything
/// about it is unexpected: its stream decides then. The memory is that of copySoundEntry().
[[nodiscard]] const unsigned char* wholeContent(PackageWindow& package, const ZipEntry& entry);
