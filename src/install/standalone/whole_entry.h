// The content of a deflated entry in one piece: several times as fast as its stream.
#pragma once

class PackageWindow;
struct ZipEntry;

/// The content of `entry`, inflated in one call and confirmed by its size and its CRC-32; valid
/// until the next call. Null if the entry is stored, too large or not worth it, or if anything
/// about it is unexpected: its stream decides then.
///
/// Keeps its buffer for the next entry: at most 16 MiB, and no more than the largest entry so far
/// needed. The window of `package` holds the data of an entry, which is smaller.
[[nodiscard]] const unsigned char* wholeContent(PackageWindow& package, const ZipEntry& entry);
