// Streams that are hard on an inflater: one kind of block, repeated until the content is large. The
// extraction, which does not inflate by zlib where it can, must take at most 1.1 times as long as
// zlib takes for the same bytes.
//
// Head: 1 byte kind (bit 0: blocks with a code of their own, otherwise stored blocks), 1 byte
// letters of the code, 2 bytes size of a block's content, little-endian, 0 for everything in
// one block. The rest is the content, repeated.
#include "entry_extraction.h"
#include "fuzz_support.h"
#include "zip_file.h"

#include <algorithm>
#include <bit>
#include <limits>
#include <vector>

#include <fcntl.h>
#include <unistd.h>
#include <zlib.h>

namespace {

constexpr std::size_t HeadSize = 4;
constexpr std::uint32_t Deflated = 8;
constexpr double MostTimesZlib = 1.1;
constexpr int FewRounds = 3;
constexpr int ManyRounds = 100; // before an input is a finding: other programs disturb the caches

/// Enough to take milliseconds, so that opening and closing files does not count.
constexpr std::size_t ContentSize = 4096 * KiB;
constexpr std::size_t CodedBlocks = 2000;
constexpr std::size_t StoredBlocks = 60000;

/// A deflate stream, bit by bit.
class BitWriter {
public:
    /// The lowest `count` bits of `value`, the lowest first.
    void number(unsigned value, unsigned count)
    {
        for (unsigned bit = 0; bit < count; ++bit)
            put(value >> bit & 1);
    }

    /// A Huffman code, its highest bit first.
    void code(unsigned value, unsigned length)
    {
        while (length-- != 0)
            put(value >> length & 1);
    }

    [[nodiscard]] const std::string& bytes() const { return bytes_; }

private:
    void put(unsigned bit)
    {
        if (used_ == 0)
            bytes_.push_back('\0');
        if (bit != 0)
            bytes_.back() = static_cast<char>(bytes_.back() | 1 << used_);
        used_ = (used_ + 1) % 8;
    }

    std::string bytes_;
    unsigned used_ = 0; ///< bits of the last byte
};

/// A complete code of the first `letters` literals and the end of a block: the first symbols have
/// `shortest` bits, the others one more.
struct BlockCode {
    explicit BlockCode(unsigned count)
        : letters(count), shortest(static_cast<unsigned>(std::bit_width(count + 1)) - 1),
          shortOnes((2U << shortest) - (count + 1))
    {
    }

    [[nodiscard]] unsigned lengthOf(unsigned index) const
    {
        return index < shortOnes ? shortest : shortest + 1;
    }

    [[nodiscard]] unsigned codeOf(unsigned index) const
    {
        return index < shortOnes ? index : index + shortOnes;
    }

    unsigned letters;
    unsigned shortest;
    unsigned shortOnes;
};

void writeHeader(BitWriter& writer, const BlockCode& code)
{
    // The code of the code lengths: four bits for each length, so that a length is its own code.
    constexpr unsigned lengthCodes = 19;
    constexpr unsigned endOfBlock = 256;
    writer.number(2, 2); // dynamic codes
    writer.number(0, 5); // 257 literals and lengths
    writer.number(0, 5); // one distance
    writer.number(lengthCodes - 4, 4);
    constexpr unsigned order[] = {16, 17, 18, 0, 8, 7, 9, 6, 10, 5, 11, 4, 12, 3, 13, 2, 14, 1, 15};
    for (const unsigned length : order)
        writer.number(length < 16 ? 4 : 0, 3);
    for (unsigned symbol = 0; symbol < endOfBlock; ++symbol)
        writer.code(symbol < code.letters ? code.lengthOf(symbol) : 0, 4);
    writer.code(code.lengthOf(code.letters), 4);
    writer.code(1, 4); // the distance, which is not used
}

/// `content` in blocks of `blockSize` bytes, each with a code of `letters` letters; the content is
/// changed to these letters.
std::string inBlocks(std::string& content, std::size_t blockSize, unsigned letters)
{
    const BlockCode code(letters);
    BitWriter writer;
    for (char& byte : content)
        byte = static_cast<char>(static_cast<unsigned char>(byte) % letters);
    for (std::size_t start = 0; start < content.size(); start += blockSize) {
        const std::size_t end = std::min(content.size(), start + blockSize);
        writer.number(end == content.size() ? 1 : 0, 1);
        writeHeader(writer, code);
        for (std::size_t at = start; at < end; ++at) {
            const auto letter = static_cast<unsigned char>(content[at]);
            writer.code(code.codeOf(letter), code.lengthOf(letter));
        }
        writer.code(code.codeOf(letters), code.lengthOf(letters));
    }
    return writer.bytes();
}

/// `content` in stored blocks of `blockSize` bytes.
std::string inStoredBlocks(const std::string& content, std::size_t blockSize)
{
    std::string packed;
    for (std::size_t start = 0; start < content.size(); start += blockSize) {
        const auto size = static_cast<std::uint16_t>(std::min(blockSize, content.size() - start));
        BitWriter header;
        header.number(start + size == content.size() ? 1 : 0, 8);
        header.number(size, 16);
        header.number(static_cast<std::uint16_t>(~size), 16);
        packed += header.bytes() + content.substr(start, size);
    }
    return packed;
}

/// Inflates `packed` into the file, in the pieces that the extraction takes.
void inflateByZlib(const MemoryFile& package, std::size_t size, const MemoryFile& file)
{
    constexpr std::size_t inputSize = 64 * KiB;
    constexpr std::size_t pieceSize = 128 * KiB;
    static unsigned char input[inputSize];
    static unsigned char piece[pieceSize];
    const int from = open(package.path().c_str(), O_RDONLY | O_CLOEXEC);
    const int to = open(file.path().c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
    require(from >= 0 && to >= 0, "the files of the comparison can be opened");
    z_stream state = {};
    require(inflateInit2(&state, -15) == Z_OK, "zlib starts");
    int status = Z_OK;
    while (status == Z_OK) {
        state.next_out = piece;
        state.avail_out = pieceSize;
        while (status == Z_OK && state.avail_out != 0) {
            if (state.avail_in == 0) {
                state.next_in = input;
                state.avail_in = static_cast<uInt>(std::max<ssize_t>(
                    0, read(from, input, std::min(inputSize, size - state.total_in))));
            }
            status = inflate(&state, Z_NO_FLUSH);
        }
        const std::size_t count = pieceSize - state.avail_out;
        require(write(to, piece, count) == static_cast<ssize_t>(count), "the piece is written");
    }
    require(status == Z_STREAM_END, "zlib accepts what the target made");
    (void)inflateEnd(&state);
    (void)close(from);
    (void)close(to);
}

/// Processor time of this thread, in nanoseconds.
double now()
{
    timespec time = {};
    (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) * 1e9 + static_cast<double>(time.tv_nsec);
}

template <typename Work>
void keepLeastTime(const Work& work, double& least)
{
    const double start = now();
    work();
    least = std::min(least, now() - start);
}

std::string repeated(const std::string& text, std::size_t size)
{
    std::string content;
    content.reserve(size + text.size());
    while (content.size() < size)
        content += text;
    content.resize(size);
    return content;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    if (size <= HeadSize)
        return 0;
    const bool isCoded = (data[0] & 1) != 0;
    const unsigned letters = std::max<unsigned>(1, data[1]);
    const std::size_t givenSize = data[2] | static_cast<std::size_t>(data[3]) << 8;
    const std::size_t blockSize = givenSize != 0 ? givenSize : isCoded ? ContentSize : 1;
    std::string content =
        repeated(std::string(reinterpret_cast<const char*>(data + HeadSize), size - HeadSize),
                 std::min(ContentSize, blockSize * (isCoded ? CodedBlocks : StoredBlocks)));
    const std::string packed =
        isCoded ? inBlocks(content, blockSize, letters) : inStoredBlocks(content, blockSize);

    static const MemoryFile file;
    static const MemoryFile extracted;
    static const MemoryFile inflated;
    file.write(packed.data(), packed.size());
    ZipEntry entry;
    entry.method = Deflated;
    entry.compressedSize = static_cast<std::uint32_t>(packed.size());
    entry.uncompressedSize = static_cast<std::uint32_t>(content.size());
    entry.crc32 = static_cast<std::uint32_t>(
        crc32_z(0, reinterpret_cast<const Bytef*>(content.data()), content.size()));

    const ZipFile archive(file.path().c_str());
    FileTransaction transaction;
    transaction.backup = false;
    double ours = std::numeric_limits<double>::max();
    double zlib = ours;
    for (int round = 0; round < FewRounds || (ours > MostTimesZlib * zlib && round < ManyRounds);
         ++round) {
        keepLeastTime(
            [&] {
                require(extractFile(transaction, archive, &entry, extracted.path(), 0) == FileOk,
                        "a sound entry is extracted");
            },
            ours);
        keepLeastTime([&] { inflateByZlib(file, packed.size(), inflated); }, zlib);
    }
    require(extracted.content() == content, "what is extracted is what was packed");
    require(ours <= MostTimesZlib * zlib, "a hostile stream takes at most 1.1 times zlib's time");
    return 0;
}
