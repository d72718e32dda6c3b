// Compresses one chunk of a file so that the chunks of a file can be joined to one stream.
//
// libdeflate compresses three times as fast as zlib at the same size, but ends a stream with every
// call: its last block carries the mark of a final one. A chunk that others follow is made to go
// on: the mark is cleared, and an empty stored block brings the stream to the next byte, as zlib's
// Z_SYNC_FLUSH does. So chunks are compressed independently, on all processors, and the bytes do
// not depend on how many there are.
//
// Where the last block begins has to be found. Its header is searched backwards from the end: few
// bit positions look like one, and only that is taken from which zlib inflates exactly the last
// bytes of the input. If the search finds nothing, as in data that can't be compressed, zlib walks
// through the whole stream block by block.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

/// Compresses chunks; each thread has its own.
class ChunkDeflater {
public:
    ChunkDeflater();
    ChunkDeflater(const ChunkDeflater&) = delete;
    ChunkDeflater& operator=(const ChunkDeflater&) = delete;
    ~ChunkDeflater();

    /// Compresses `size` bytes at `data` to raw deflated ones in `packed`, a part of a stream that
    /// ends with the chunk if `last`. Returns false when memory runs out.
    [[nodiscard]] bool deflate(const unsigned char* data, std::size_t size, bool last,
                               std::vector<unsigned char>& packed);

private:
    struct State;

    bool makeGoOn(const unsigned char* data, std::size_t size, std::vector<unsigned char>& packed);
    std::unique_ptr<State> state_;
};
