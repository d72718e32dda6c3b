#include "deflate_chunk.h"

#include <gtest/gtest.h>

#include <random>
#include <string>

#include <zlib.h>

namespace {

using Bytes = std::vector<unsigned char>;

/// `size` bytes with `kinds` different values in runs of up to `run`.
Bytes sample(std::size_t size, unsigned kinds, unsigned run)
{
    std::mt19937 random(size + kinds);
    Bytes bytes;
    while (bytes.size() < size)
        bytes.insert(bytes.end(), 1 + random() % run, static_cast<unsigned char>(random() % kinds));
    bytes.resize(size);
    return bytes;
}

Bytes inflated(const Bytes& stream, std::size_t size)
{
    Bytes result(size + 1);
    z_stream inflater = {};
    EXPECT_EQ(inflateInit2(&inflater, -15), Z_OK);
    inflater.next_in = const_cast<Bytef*>(stream.data());
    inflater.avail_in = static_cast<uInt>(stream.size());
    inflater.next_out = result.data();
    inflater.avail_out = static_cast<uInt>(result.size());
    EXPECT_EQ(inflate(&inflater, Z_FINISH), Z_STREAM_END);
    EXPECT_EQ(inflater.avail_in, 0U);
    result.resize(inflater.total_out);
    (void)inflateEnd(&inflater);
    return result;
}

void expectToJoin(const std::vector<Bytes>& chunks)
{
    ChunkDeflater deflater;
    Bytes stream;
    Bytes content;
    for (std::size_t i = 0; i < chunks.size(); ++i) {
        Bytes packed;
        ASSERT_TRUE(
            deflater.deflate(chunks[i].data(), chunks[i].size(), i + 1 == chunks.size(), packed));
        stream.insert(stream.end(), packed.begin(), packed.end());
        content.insert(content.end(), chunks[i].begin(), chunks[i].end());
    }
    EXPECT_TRUE(inflated(stream, content.size()) == content);
}

TEST(DeflateChunk, ASingleChunkIsAStream)
{
    expectToJoin({sample(100, 4, 3)});
}

TEST(DeflateChunk, ChunksOfManyBlocksJoin)
{
    expectToJoin({sample(700000, 40, 5), sample(900000, 3, 2), sample(5, 2, 1)});
}

TEST(DeflateChunk, ChunksThatCannotBeCompressedJoin)
{
    expectToJoin({sample(300000, 256, 1), sample(65535, 256, 1), sample(1, 256, 1)});
}

TEST(DeflateChunk, ChunksOfOneValueJoin)
{
    expectToJoin({Bytes(500000, 'a'), Bytes(1, 'a'), Bytes(258, 'b')});
}

TEST(DeflateChunk, ChunksOfEverySmallSizeJoin)
{
    for (std::size_t size = 1; size < 400; size += 7)
        expectToJoin({sample(size, 20, 4), sample(size + 1, 256, 2), sample(size + 2, 2, 1)});
}

TEST(DeflateChunk, AStreamWithinTheDataIsNotTakenForItsEnd)
{
    ChunkDeflater deflater;
    const Bytes inner = sample(60000, 30, 4);
    Bytes packed;
    ASSERT_TRUE(deflater.deflate(inner.data(), inner.size(), true, packed));
    Bytes data = sample(20000, 30, 4);
    data.insert(data.end(), packed.begin(), packed.end()); // ends with a final block of its own

    expectToJoin({data, data, sample(100, 4, 3)});
}

} // namespace
