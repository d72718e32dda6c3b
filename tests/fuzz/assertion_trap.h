// The one assertion of the installer as an outcome that a fuzz target can go on from.
//
// The deflated stream ends the program when an entry inflates to more than its recorded size. That
// is intended, and a fuzzer reaches it all the time, so here it must not end the process. The
// assertion goes through __assert_fail() of the C library; assertion_trap.cpp puts one of its own
// in its place, which jumps back to where the stream was read. An exception would not do, since
// callers are compiled for a function that never throws. The jump skips no destructor: between it
// and the mark there is nothing but the stream's own read(), which owns nothing.
//
// An assertion outside of readBlock() and readByte() ends the process as usual, and is a finding.
#pragma once

class InputStream;

/// What readBlock() and readByte() return when the assertion struck. No stream returns it.
constexpr int AssertionStruck = -1000;

/// `stream.read(buffer, size)`, or AssertionStruck.
int readBlock(InputStream& stream, char* buffer, int size);

/// `stream.read()`, or AssertionStruck.
int readByte(InputStream& stream);
