// SHA-256, by nettle: it uses the processor's own instructions where there are any.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

/// Computes the SHA-256 of bytes that arrive in pieces.
class Sha256 {
public:
    Sha256();
    Sha256(const Sha256&) = delete;
    Sha256& operator=(const Sha256&) = delete;
    ~Sha256();

    void add(const void* data, std::size_t size);

    /// The digest of all bytes so far in 64 hexadecimal digits; what is added next is a new text.
    [[nodiscard]] std::string finish();

private:
    struct State;
    std::unique_ptr<State> state_;
};

/// Hashes the file behind `fd` from its first byte to its end, without moving the descriptor.
/// Returns 0 and sets `digest`, or the `errno` with which reading failed.
[[nodiscard]] int sha256OfFile(int fd, std::string& digest);
