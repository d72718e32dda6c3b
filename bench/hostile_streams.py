"""Deflate streams that cost an inflater much more than ordinary ones of their size.

Each function returns a file's content and the stream that inflates to it.
"""

import zlib

LITERALS_A_BLOCK = 40


def one_block(text):
    """Everything in a single block, of the fixed code: 64 letters, then a match, and so on."""
    distance, length = 322, 258
    codes = [to_bits(0x30 + letter, 8) for letter in range(128)]
    # Length 258 is symbol 285; distances from 257 to 384 are symbol 16 and seven bits more.
    match = to_bits(0xC5, 8) + to_bits(16, 5) + to_bits(distance - 257, 7)[::-1]
    text = text.translate(bytes(range(128)) * 2)  # letters of the code of eight bits
    content = bytearray()
    bits = ["1", "10"]
    for start in range(0, len(text), 64):
        letters = text[start : start + 64]
        content += letters
        bits += [codes[letter] for letter in letters]
        if len(content) >= distance:
            content += content[-distance:][:length]
            bits.append(match)
    bits.append("0000000")
    return bytes(content), to_bytes(bits)


def tiny_blocks(count):
    """`count` blocks of a few literals, each with a code of its own in its 13 first bytes."""
    # The code of the code lengths: 18 (a run of zeros) is 0, 1 is 10, 2 is 11.
    lengths = {18: 1, 1: 2, 2: 2}
    order = [16, 17, 18, 0, 8, 7, 9, 6, 10, 5, 11, 4, 12, 3, 13, 2, 14, 1]
    header = number(286 - 257, 5) + number(0, 5) + number(len(order) - 4, 4)
    header += "".join(number(lengths.get(symbol, 0), 3) for symbol in order)

    def zeros(run):
        return "0" + number(run - 11, 7)

    # "a" is 10, the end is 0, length 258 is 11, distance 1 is 0.
    header += zeros(97) + "11" + zeros(138) + zeros(20) + "10" + zeros(28) + "11" + "10"
    block = "01" + header + "10" * LITERALS_A_BLOCK + "0"
    bits = ["0" + block] * (count - 1) + ["1" + block]
    return b"a" * (LITERALS_A_BLOCK * count), to_bytes(bits)


def flushed_blocks(content):
    """A block for every 64 bytes, as a compressor writes them that is flushed so often."""
    compressor = zlib.compressobj(6, zlib.DEFLATED, -15)
    pieces = []
    for start in range(0, len(content), 64):
        pieces.append(compressor.compress(content[start : start + 64]))
        pieces.append(compressor.flush(zlib.Z_FULL_FLUSH))
    return content, b"".join(pieces) + compressor.flush()


def stored_blocks(content):
    compressor = zlib.compressobj(0, zlib.DEFLATED, -15)
    return content, compressor.compress(content) + compressor.flush()


def number(value, count):
    """A number of a header: the lowest bit first."""
    return to_bits(value, count)[::-1]


def to_bits(value, count):
    return format(value, f"0{count}b")


def to_bytes(bits):
    """The bytes that a list of bit texts makes up, each byte from its lowest bit on."""
    text = "".join(bits)
    return int(text[::-1], 2).to_bytes((len(text) + 7) // 8, "little")
