#include "sha256.h"

#include <cerrno>
#include <vector>

#include <nettle/sha2.h>
#include <unistd.h>

struct Sha256::State {
    sha256_ctx context;
};

Sha256::Sha256() : state_(std::make_unique<State>())
{
    sha256_init(&state_->context);
}

Sha256::~Sha256() = default;

void Sha256::add(const void* data, std::size_t size)
{
    sha256_update(&state_->context, size, static_cast<const std::uint8_t*>(data));
}

std::string Sha256::finish()
{
    std::array<std::uint8_t, SHA256_DIGEST_SIZE> digest = {};
    sha256_digest(&state_->context, digest.size(), digest.data()); // and begins anew

    std::string text;
    for (const std::uint8_t byte : digest) {
        text += "0123456789abcdef"[byte >> 4];
        text += "0123456789abcdef"[byte & 15];
    }
    return text;
}

int sha256OfFile(int fd, std::string& digest)
{
    constexpr std::size_t pieceSize = std::size_t{128} * 1024;
    Sha256 hash;
    std::vector<char> piece(pieceSize);
    off_t at = 0;
    for (;;) {
        const ssize_t count = pread(fd, piece.data(), piece.size(), at);
        if (count < 0 && errno == EINTR)
            continue;
        if (count < 0)
            return errno;
        if (count == 0)
            break;
        hash.add(piece.data(), static_cast<std::size_t>(count));
        at += count;
    }
    digest = hash.finish();
    return 0;
}
