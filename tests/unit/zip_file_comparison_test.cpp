// Compares the deflated stream, and the extracted files, with a plain model of the stream on random
// entries, sound and damaged.
//
// Each entry comes from a seed of its own: its content, how it was compressed, what is wrong with
// it, and the calls that read it. A long run, and a single entry again:
//
//     WZOR_STREAM_ENTRIES=50000 unit_tests --gtest_filter='StreamComparison*'
//     WZOR_STREAM_ENTRIES=1 WZOR_STREAM_SEED=1234 unit_tests --gtest_filter='StreamComparison*'
#include "entry_extraction.h"
#include "reference_inflate_stream.h"
#include "sample_bytes.h"
#include "test_files.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include <sys/wait.h>
#include <unistd.h>
#include <zlib.h>

namespace {

/// Numbers from a seed, the same with every C++ library.
class Dice {
public:
    explicit Dice(std::uint32_t seed) : engine_(seed) {}

    /// 0 to `limit` - 1.
    std::uint32_t below(std::size_t limit)
    {
        return static_cast<std::uint32_t>(engine_()) % static_cast<std::uint32_t>(limit);
    }

    /// `low` to `high`.
    int between(int low, int high)
    {
        return low + static_cast<int>(below(static_cast<std::size_t>(high - low) + 1));
    }

    bool oneIn(std::size_t count) { return below(count) == 0; }

private:
    std::mt19937 engine_;
};

/// An entry in a file, and what its directory says about it.
struct Sample {
    std::string content;
    std::string archive;
    ZipEntry entry;
    std::string damage; ///< in words
};

// Contents and their compression.

/// A size about as large as a few blocks of `block` bytes, by at most `away` off.
std::size_t sizeNearBlocks(Dice& dice, int block, int most, int away)
{
    const int size = block * dice.between(1, most) + dice.between(-away, away);
    return static_cast<std::size_t>(size);
}

std::size_t anySize(Dice& dice)
{
    switch (dice.below(5)) {
    case 0:
        return 1 + dice.below(600);
    case 1:
        return sizeNearBlocks(dice, 4096, 4, 20);
    case 2:
    case 3:
        return sizeNearBlocks(dice, 8192, 6, 300);
    default:
        return 1 + dice.below(dice.oneIn(6) ? 500000 : 150000);
    }
}

std::string piece(Dice& dice, std::size_t size)
{
    switch (dice.below(4)) {
    case 0:
        return noiseBytes(size, dice.below(1000000));
    case 1:
        return std::string(size, static_cast<char>(dice.below(256)));
    default:
        return textBytes(size, dice.below(1000000));
    }
}

std::string anyContent(Dice& dice)
{
    const std::size_t size = anySize(dice);
    if (!dice.oneIn(3))
        return piece(dice, size);
    std::string content;
    while (content.size() < size)
        content += piece(dice, 1 + dice.below(20000));
    content.resize(size);
    return content;
}

/// Deflates `content` with parameters of every kind, in one go or with flushes between.
std::string anyDeflate(Dice& dice, const std::string& content)
{
    z_stream stream = {};
    EXPECT_EQ(Z_OK, deflateInit2(&stream, dice.between(0, 9), Z_DEFLATED, -dice.between(9, 15),
                                 dice.between(1, 9), dice.between(0, 4)));
    const int flush = std::vector<int>{Z_SYNC_FLUSH, Z_FULL_FLUSH, Z_PARTIAL_FLUSH}[dice.below(3)];
    const std::size_t step = dice.oneIn(3) ? 100 + dice.below(9000) : content.size();

    std::string data(2 * content.size() + 100000, '\0');
    stream.next_out = reinterpret_cast<Bytef*>(data.data());
    stream.avail_out = static_cast<uInt>(data.size());
    stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(content.data()));
    for (std::size_t done = 0; done < content.size(); done += step) {
        stream.avail_in = static_cast<uInt>(std::min(step, content.size() - done));
        EXPECT_EQ(Z_OK, deflate(&stream, flush));
    }
    EXPECT_EQ(Z_STREAM_END, deflate(&stream, Z_FINISH));
    data.resize(data.size() - stream.avail_out);
    (void)deflateEnd(&stream);
    return data;
}

// Damage.

/// Another size than `size`, at least 1: by little, by much, or at a step of the readers.
std::uint32_t otherSize(Dice& dice, std::uint32_t size, bool smaller)
{
    const std::uint32_t step = dice.oneIn(2) ? 4096 : 8192;
    const std::uint32_t by = dice.oneIn(2) ? 1 + dice.below(10) : 1 + dice.below(size);
    std::uint32_t other = smaller ? size - std::min(by, size) : size + by;
    if (dice.oneIn(4))
        other = (smaller ? size / step : size / step + 1) * step;
    else if (!smaller && dice.oneIn(8))
        other = 0xFFFFFFFFU - dice.below(10);
    return std::max(1U, other); // an entry of size 0 has no stream
}

std::uint32_t placeIn(Dice& dice, const std::string& data)
{
    const auto size = static_cast<std::uint32_t>(data.size());
    const std::uint32_t place = dice.below(size);
    return dice.oneIn(2) ? place : size - 1 - std::min(place, dice.below(64));
}

void flipBits(Dice& dice, std::string& data)
{
    for (int flips = dice.between(1, 3); flips > 0; --flips) {
        char& byte = data[placeIn(dice, data)];
        byte = static_cast<char>(static_cast<unsigned char>(byte) ^ 1U << dice.below(8));
    }
}

/// Damages the sample in one way; returns a description.
const char* damageOnce(Dice& dice, std::string& data, ZipEntry& entry, bool& cut)
{
    switch (dice.below(8)) {
    case 0:
    case 1:
        flipBits(dice, data);
        return " bits flipped;";
    case 2:
        entry.compressedSize = otherSize(dice, entry.compressedSize, true);
        return " compressed size too small;";
    case 3:
        entry.compressedSize = otherSize(dice, entry.compressedSize, false);
        return " compressed size too large;";
    case 4:
        entry.uncompressedSize = otherSize(dice, entry.uncompressedSize, true);
        return " size too small;";
    case 5:
        entry.uncompressedSize = otherSize(dice, entry.uncompressedSize, false);
        return " size too large;";
    case 6:
        data.resize(otherSize(dice, static_cast<std::uint32_t>(data.size()), true));
        cut = true;
        return " file cut short;";
    default:
        data.erase(placeIn(dice, data), 1 + dice.below(8));
        data += std::string(1, '\x55'); // never empty
        return " bytes missing;";
    }
}

std::uint32_t checksum(const std::string& bytes)
{
    return static_cast<std::uint32_t>(
        crc32_z(0, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
}

Sample makeSample(std::uint32_t seed)
{
    Dice dice(seed);
    Sample sample;
    sample.content = anyContent(dice);
    std::string data = anyDeflate(dice, sample.content);
    sample.entry.method = 8;
    sample.entry.compressedSize = static_cast<std::uint32_t>(data.size());
    sample.entry.uncompressedSize = static_cast<std::uint32_t>(sample.content.size());
    if (!dice.oneIn(8)) // else unknown, as some packers leave it
        sample.entry.crc32 = checksum(sample.content);
    bool cut = false;
    for (std::uint32_t times = dice.below(10) * 3 / 10; times > 0; --times)
        sample.damage += damageOnce(dice, data, sample.entry, cut);

    sample.entry.dataOffset = dice.below(100);
    sample.archive = noiseBytes(sample.entry.dataOffset, seed) + data;
    if (!cut)
        sample.archive += noiseBytes(dice.below(6000), seed);
    return sample;
}

// Calls.

/// One call of a stream: read() for Single, else read(buf, len).
struct Call {
    static constexpr int Single = -1000;
    int len = 0;
};

/// The calls that read a sample: in one of several manners at first, then as the file writer does.
class Caller {
public:
    explicit Caller(std::uint32_t seed) : dice_(seed), manner_(dice_.below(4)) {}

    Call next()
    {
        if (++calls_ > 300 || manner_ == 0)
            return {8192};
        if (manner_ == 1)
            return {1 + static_cast<int>(dice_.below(10000))};
        if (manner_ == 2 && !dice_.oneIn(10))
            return {Call::Single};
        if (dice_.oneIn(200))
            return {-static_cast<int>(dice_.below(3))};
        static const std::vector<int> lengths = {1,    2,    3,    100,  257,   258,          4095,
                                                 4096, 4097, 8191, 8192, 8193,  16384,        65536,
                                                 7,    8,    9,    1000, 40000, Call::Single, 10};
        return {lengths[dice_.below(lengths.size())]};
    }

private:
    Dice dice_;
    std::uint32_t manner_;
    int calls_ = 0;
};

/// What a call returned.
struct Answer {
    int count = 0;
    std::string bytes;
    int available = 0;
};

template <typename Stream>
Answer make(const Call& call, Stream& stream)
{
    Answer answer;
    if (call.len == Call::Single) {
        const int before = stream.available();
        answer.count = stream.read();
        if (stream.available() == before - 1) // -1 may be the byte 0xFF
            answer.bytes = std::string(1, static_cast<char>(answer.count));
    } else {
        std::vector<char> buffer(static_cast<std::size_t>(std::max(call.len, 1)));
        answer.count = stream.read(buffer.data(), call.len);
        if (answer.count > 0 && answer.count <= call.len)
            answer.bytes.assign(buffer.data(), static_cast<std::size_t>(answer.count));
    }
    answer.available = stream.available();
    return answer;
}

// The comparison.

/// How reading an entry ended.
enum Ending : int {
    Whole,    ///< its content was delivered
    Part,     ///< damage or a wrong size ended it before, or let something else through
    Abort,    ///< the next call would have ended the program
    Mismatch, ///< the streams differed
};

constexpr std::uint32_t FirstSeed = 20221202;

std::uint32_t numberFromEnvironment(const char* name, std::uint32_t fallback)
{
    const char* const text = std::getenv(name); // NOLINT(concurrency-mt-unsafe)
    return text == nullptr ? fallback : static_cast<std::uint32_t>(std::strtoul(text, nullptr, 10));
}

class StreamComparisonTest : public testing::Test {
protected:
    void writeSample(const Sample& sample) const
    {
        (void)unlink(path.c_str()); // some file systems write a file out when it is truncated
        writeFile(path, sample.archive);
    }

    std::unique_ptr<InputStream> openSample(const Sample& sample) const
    {
        writeSample(sample);
        return std::unique_ptr<InputStream>(ZipFile(path.c_str()).getInputStream(&sample.entry));
    }

    static ReferenceInflateStream modelOf(const Sample& sample)
    {
        const std::string_view archive = sample.archive;
        return {archive.substr(sample.entry.dataOffset), sample.entry.compressedSize,
                sample.entry.uncompressedSize};
    }

    /// Reads the sample through both streams; stops before a call that would end the program.
    Ending compare(const Sample& sample, std::uint32_t seed)
    {
        const std::unique_ptr<InputStream> stream = openSample(sample);
        ReferenceInflateStream model = modelOf(sample);
        Caller caller(seed);
        std::string delivered;

        for (int zeros = 0; zeros < 3;) {
            const Call call = caller.next();
            const Answer expected = make(call, model);
            if (model.aborted())
                return Abort;
            const Answer answer = make(call, *stream);

            EXPECT_EQ(expected.count, answer.count) << "read of " << call.len;
            EXPECT_TRUE(expected.bytes == answer.bytes) << "bytes of a read of " << call.len;
            EXPECT_EQ(expected.available, answer.available) << "after a read of " << call.len;
            if (HasFailure())
                return Mismatch;
            delivered += answer.bytes;
            zeros = call.len == 8192 && answer.count == 0 ? zeros + 1 : 0;
        }
        return delivered == sample.content ? Whole : Part;
    }

    TempDir dir;
    std::string path = dir / "sample";
};

TEST_F(StreamComparisonTest, TheStreamDoesWhatItsModelDoesOnRandomEntries)
{
    const std::uint32_t entries = numberFromEnvironment("WZOR_STREAM_ENTRIES", 1000);
    const std::uint32_t first = numberFromEnvironment("WZOR_STREAM_SEED", FirstSeed);
    std::uint32_t endings[Mismatch] = {};

    for (std::uint32_t seed = first; seed != first + entries; ++seed) {
        const Sample sample = makeSample(seed);

        const Ending ending = compare(sample, seed);

        ASSERT_NE(Mismatch, ending)
            << "run again: WZOR_STREAM_ENTRIES=1 WZOR_STREAM_SEED=" << seed << " ("
            << sample.content.size() << " bytes;" << sample.damage << ")";
        ASSERT_TRUE(ending != Part || !sample.damage.empty())
            << "a sound entry did not arrive whole: WZOR_STREAM_SEED=" << seed;
        ++endings[ending];
    }

    // The samples are useful only if they end in every way.
    if (entries >= 1000) {
        EXPECT_GT(endings[Whole], entries / 5);
        EXPECT_GT(endings[Part], entries / 8);
        EXPECT_GT(endings[Abort], entries / 20);
    }
}

TEST_F(StreamComparisonTest, TheProgramAbortsWhereTheModelDoes)
{
    int deaths = 0;
    for (std::uint32_t seed = FirstSeed; deaths < 10; ++seed) {
        const Sample sample = makeSample(seed);
        if (compare(sample, seed) != Abort)
            continue;
        ++deaths;

        const auto readToTheEnd = [&] {
            const std::unique_ptr<InputStream> stream = openSample(sample);
            ReferenceInflateStream model = modelOf(sample);
            for (Caller caller(seed); !model.aborted();) {
                const Call call = caller.next();
                (void)make(call, model);
                (void)make(call, *stream); // the last one does not return
            }
        };
        EXPECT_EXIT(readToTheEnd(), testing::KilledBySignal(SIGABRT),
                    "Assertion `available_ >= \\(unsigned\\) result' failed")
            << seed;
    }
}

class ExtractionComparisonTest : public StreamComparisonTest {
protected:
    /// What a run that reads the sample in blocks leaves in a file; `aborts` says whether the
    /// program is aborted.
    static std::string expectedFile(const Sample& sample, bool& aborts)
    {
        ReferenceInflateStream model = modelOf(sample);
        std::string content;
        for (;;) {
            const Answer answer = make({8192}, model);
            aborts = model.aborted();
            if (aborts || answer.count == 0)
                return content;
            content += answer.bytes;
        }
    }

    /// Extracts the sample in a process of its own, since that may end it; returns the wait status.
    int extractApart(const Sample& sample) const
    {
        const pid_t child = fork();
        if (child == 0) {
            (void)close(STDERR_FILENO); // the assertion's message
            _exit(extract(sample));
        }
        int status = -1;
        (void)waitpid(child, &status, 0);
        return status;
    }

    int extract(const Sample& sample) const
    {
        FileTransaction transaction;
        return extractFile(transaction, ZipFile(path.c_str()), &sample.entry, destination, 0600);
    }

    std::string destination = dir / "extracted";
};

TEST_F(ExtractionComparisonTest, TheFileHoldsWhatTheModelDelivers)
{
    const std::uint32_t entries = numberFromEnvironment("WZOR_STREAM_ENTRIES", 500);
    const std::uint32_t first = numberFromEnvironment("WZOR_STREAM_SEED", FirstSeed);
    std::uint32_t rescued = 0;

    for (std::uint32_t seed = first; seed != first + entries; ++seed) {
        const Sample sample = makeSample(seed);
        writeSample(sample);
        (void)unlink(destination.c_str());
        bool aborts = false;
        const std::string expected = expectedFile(sample, aborts);

        const int status = aborts ? extractApart(sample) : extract(sample);

        const std::string again =
            "run again: WZOR_STREAM_ENTRIES=1 WZOR_STREAM_SEED=" + std::to_string(seed) + " (" +
            sample.damage + ")";
        ASSERT_TRUE(aborts ? WIFSIGNALED(status) && WTERMSIG(status) == SIGABRT : status == 0)
            << again;
        const std::string file = readFile(destination);
        if (file == expected)
            continue;
        // Whole where zlib refuses to deliver it whole: see wholeContent().
        ASSERT_TRUE(file == sample.content && sample.entry.crc32 == checksum(file)) << again;
        ++rescued;
    }

    RecordProperty("rescued", static_cast<int>(rescued));
    EXPECT_LE(rescued, 1 + entries / 1000);
}

} // namespace
