// The floor of an unpacker: what any program must do, and nothing else.
//
//     floor ARCHIVE DIRECTORY libdeflate
//     floor ARCHIVE DIRECTORY zlib [PIECE]
//
// Maps the archive, walks its local headers, and for each entry makes the directory, or opens,
// writes, fchmods and closes the file. A deflated entry is inflated in one call, or by zlib in
// pieces of PIECE bytes. No journal, no index, no check: the benchmark's packages are sound and
// carry their sizes in their local headers. Exit status 0, or 1 at the first failure.
#include <fcntl.h>
#include <libdeflate.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zlib.h>

enum { LocalHeaderSize = 30, FileMode = 0755 };

static void check(int ok, const char* what)
{
    if (ok)
        return;
    perror(what);
    exit(1);
}

static uint32_t read16(const unsigned char* at)
{
    return (uint32_t)(at[0] | at[1] << 8);
}

static uint32_t read32(const unsigned char* at)
{
    return read16(at) | read16(at + 2) << 16;
}

/// At least `size` bytes, which the next call takes back.
static unsigned char* buffer(size_t size)
{
    static unsigned char* bytes;
    static size_t room;
    if (size > room) {
        free(bytes);
        bytes = malloc(room = size);
        check(bytes != NULL, "malloc");
    }
    return bytes;
}

static void writeTo(int file, const unsigned char* bytes, size_t count)
{
    check(write(file, bytes, count) == (ssize_t)count, "write");
}

static void inflateAtOnce(int file, const unsigned char* data, size_t packed, size_t size)
{
    static struct libdeflate_decompressor* decompressor;
    if (decompressor == NULL)
        decompressor = libdeflate_alloc_decompressor();
    unsigned char* const content = buffer(size);
    check(libdeflate_deflate_decompress(decompressor, data, packed, content, size, NULL) ==
              LIBDEFLATE_SUCCESS,
          "libdeflate");
    writeTo(file, content, size);
}

/// In pieces of `piece` bytes; 0: in one.
static void inflateByZlib(int file, const unsigned char* data, uint32_t packed, size_t size,
                          size_t piece)
{
    static z_stream stream;
    static int status = Z_STREAM_ERROR;
    status = status == Z_STREAM_ERROR ? inflateInit2(&stream, -15) : inflateReset(&stream);
    stream.next_in = (unsigned char*)data;
    stream.avail_in = packed;
    const size_t room = piece != 0 ? piece : size;
    while (status == Z_OK) {
        stream.next_out = buffer(room);
        stream.avail_out = (uInt)room;
        status = inflate(&stream, Z_NO_FLUSH);
        writeTo(file, buffer(room), room - stream.avail_out);
    }
    check(status == Z_STREAM_END, "inflate");
}

int main(int argc, char** argv)
{
    if (argc < 4)
        return 1;
    const int byZlib = strcmp(argv[3], "zlib") == 0;
    const size_t piece = argc > 4 ? strtoul(argv[4], NULL, 10) : 0;
    const int archive = open(argv[1], O_RDONLY);
    struct stat status;
    check(archive >= 0 && fstat(archive, &status) == 0, argv[1]);
    const unsigned char* at =
        mmap(NULL, (size_t)status.st_size, PROT_READ, MAP_PRIVATE, archive, 0);
    check(at != MAP_FAILED, "mmap");
    umask(0);

    while (memcmp(at, "PK\3\4", 4) == 0) {
        const uint32_t packed = read32(at + 18);
        const uint32_t size = read32(at + 22);
        const uint32_t nameLength = read16(at + 26);
        char path[4096];
        const int length = snprintf(path, sizeof path, "%s/%.*s", argv[2], (int)nameLength,
                                    (const char*)at + LocalHeaderSize);
        const unsigned char* const data = at + LocalHeaderSize + nameLength + read16(at + 28);
        if (path[length - 1] == '/') {
            check(mkdir(path, FileMode) == 0, path);
        } else {
            const int file = open(path, O_WRONLY | O_CREAT | O_TRUNC, FileMode);
            check(file >= 0, path);
            if (read16(at + 8) == 0)
                writeTo(file, data, size);
            else if (byZlib)
                inflateByZlib(file, data, packed, size, piece);
            else
                inflateAtOnce(file, data, packed, size);
            check(fchmod(file, FileMode) == 0 && close(file) == 0, path);
        }
        at = data + packed;
    }
    return 0;
}
