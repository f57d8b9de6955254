// SPDX-License-Identifier: Apache-2.0
// The loops of the string kernels, written once for every kind of block: 64 bytes, with a bit mask
// each for the backslashes, the quotes, and the bytes that need an escape.
//
// This header is for the files that define blocks. It has no external linkage and calls no library
// function: a file compiled for some instructions must not bring versions of shared functions with
// it that the linker could choose for machines without them.
#pragma once

#include "json/string_kernels.h"

namespace json::detail {
namespace {
// Every including file gets a table of its own, for the reason above.
// NOLINTBEGIN(misc-definitions-in-headers)

using Mask = unsigned long;  // bit i is about byte i of a block
static_assert(sizeof(Mask) == 8);

constexpr std::ptrdiff_t blockSize = 64;

inline std::ptrdiff_t lowest(Mask mask) {
    return __builtin_ctzl(mask);
}

inline std::size_t count(Mask mask) {
    return static_cast<std::size_t>(__builtin_popcountl(mask));
}

/// Of backslashes, those that begin an escape: in each run of them the first, the third and so on.
/// The subtraction carries through each run and so finds whether what follows it is escaped.
constexpr Mask escapeStarts(Mask backslashes) {
    constexpr Mask oddBits = 0xAAAA'AAAA'AAAA'AAAA;
    return ((((backslashes << 1) | oddBits) - backslashes) ^ oddBits) & backslashes;
}

/// An escape of two characters, and what it stands for.
struct ShortEscape {
    char letter;
    char character;
};

constexpr ShortEscape shortEscapes[] = {{'"', '"'},  {'\\', '\\'}, {'/', '/'},  {'b', '\b'},
                                        {'f', '\f'}, {'n', '\n'},  {'r', '\r'}, {'t', '\t'}};

constexpr unsigned indexOf(char c) {
    return static_cast<unsigned char>(c);
}

/// What the escapes of two characters stand for, by their letter; NUL for letters that are none.
struct LetterTable {
    constexpr LetterTable() {
        for (const auto& [letter, character] : shortEscapes)
            characters[indexOf(letter)] = character;
    }
    char characters[256] = {};
};

constexpr LetterTable letterTable;

inline char escapedCharacter(char letter) {
    return letterTable.characters[indexOf(letter)];
}

/// What a byte is written as.
struct Escape {
    char text[7] = {};
    unsigned char length = 0;  // 0 for a byte that needs no escape
};
static_assert(sizeof(Escape) == 8);

struct EscapeTable {
    constexpr EscapeTable() {
        constexpr char hexadecimal[] = "0123456789abcdef";
        for (unsigned c = 0; c < 0x20; ++c)
            escapes[c] = {{'\\', 'u', '0', '0', hexadecimal[c >> 4], hexadecimal[c & 0xF]}, 6};
        for (const auto& [letter, character] : shortEscapes) {
            if (character != '/')
                escapes[indexOf(character)] = {{'\\', letter}, 2};
        }
    }
    Escape escapes[256];
};

constexpr EscapeTable escapeTable;

inline const Escape& escapeOf(char c) {
    return escapeTable.escapes[indexOf(c)];
}

using Word = unsigned long;
constexpr std::ptrdiff_t wordSize = 8;
static_assert(sizeof(Word) == wordSize);

/// Whether the eight bytes at `in` need no escape.
inline bool arePlain(const char* in) {
    constexpr Word ones = 0x0101'0101'0101'0101;
    Word word;
    __builtin_memcpy(&word, in, sizeof word);
    const Word backslash = word ^ (ones * '\\');
    const Word quote = word ^ (ones * '"');
    // A byte's subtraction borrows where the byte is smaller.
    const Word borrows = ((word - ones * 0x20) & ~word) | ((backslash - ones) & ~backslash) |
                         ((quote - ones) & ~quote);
    return (borrows & (ones * 0x80)) == 0;
}

template <typename Block>
StringExtent measure(const char* in, const char* end) {
    std::size_t escapes = 0;
    while (end - in >= blockSize) {
        const Block block(in);
        const Mask backslashes = block.backslashes();
        const Mask quotes = block.quotes();
        if ((backslashes | quotes) == 0) {
            in += blockSize;
            continue;
        }
        const Mask starts = escapeStarts(backslashes);
        const Mask closing = quotes & ~(starts << 1);
        if (closing != 0) {
            const Mask before = (closing - 1) & ~closing;
            return {in + lowest(closing), escapes + count(starts & before)};
        }
        escapes += count(starts);
        in += blockSize + static_cast<std::ptrdiff_t>(starts >> 63);  // with the escape's letter
    }
    while (in < end && *in != '"') {
        const bool starts = *in == '\\';
        escapes += starts ? 1 : 0;
        in += starts ? 2 : 1;
    }
    return {in < end ? in : end, escapes};
}

template <typename Block>
Copied unescape(const char* in, const char* end, char* out, char* outEnd) {
    // Whatever lies between two escapes is copied as a whole block, and overwritten by what
    // follows.
    while (end - in >= 2 * blockSize && outEnd - out >= 2 * blockSize) {
        const Block block(in);
        Mask starts = escapeStarts(block.backslashes());
        if (starts == 0) {
            block.store(out);
            in += blockSize;
            out += blockSize;
            continue;
        }
        const char* const next = in + blockSize;
        const char* run = in;
        do {
            const char* const escape = in + lowest(starts);
            const char c = escapedCharacter(escape[1]);
            Block(run).store(out);
            out += escape - run;
            if (c == '\0')
                return {escape, out};
            *out++ = c;
            run = escape + 2;
            starts &= starts - 1;
        } while (starts != 0);
        in = run;
        if (run < next) {
            Block(run).store(out);
            out += next - run;
            in = next;
        }
    }
    while (in != end) {
        if (*in != '\\') {
            *out++ = *in++;
            continue;
        }
        if (end - in < 2 || escapedCharacter(in[1]) == '\0')
            break;
        *out++ = escapedCharacter(in[1]);
        in += 2;
    }
    return {in, out};
}

template <typename Block>
Copied escape(const char* in, const char* end, char* out, char* outEnd) {
    constexpr std::ptrdiff_t longestBlock = blockSize * maxEscapeLength + blockSize;
    while (end - in >= 2 * blockSize && outEnd - out >= longestBlock) {
        const Block block(in);
        Mask special = block.specials();
        if (special == 0) {
            block.store(out);
            in += blockSize;
            out += blockSize;
            continue;
        }
        const char* const next = in + blockSize;
        const char* run = in;
        do {
            const char* const at = in + lowest(special);
            Block(run).store(out);
            out += at - run;
            const Escape& text = escapeOf(*at);
            __builtin_memcpy(out, &text, sizeof text);
            out += text.length;
            run = at + 1;
            special &= special - 1;
        } while (special != 0);
        Block(run).store(out);
        out += next - run;
        in = next;
    }
    while (in != end && outEnd - out >= maxEscapeLength) {
        if (end - in >= wordSize && outEnd - out >= wordSize && arePlain(in)) {
            __builtin_memcpy(out, in, sizeof(Word));
            in += wordSize;
            out += wordSize;
            continue;
        }
        const Escape& text = escapeOf(*in);
        if (text.length == 0) {
            *out++ = *in++;
            continue;
        }
        __builtin_memcpy(out, text.text, static_cast<std::size_t>(maxEscapeLength));
        out += text.length;
        ++in;
    }
    return {in, out};
}

template <typename Block>
std::size_t countEscapes(const char* in, const char* end) {
    std::size_t escapes = 0;
    for (; end - in >= blockSize; in += blockSize)
        escapes += count(Block(in).specials());
    while (end - in >= wordSize && arePlain(in))
        in += wordSize;
    for (; in != end; ++in)
        escapes += escapeOf(*in).length != 0 ? 1 : 0;
    return escapes;
}

template <typename Block>
constexpr StringKernels kernelsOf(const char* name) {
    return {name, measure<Block>, unescape<Block>, escape<Block>, countEscapes<Block>};
}

// NOLINTEND(misc-definitions-in-headers)
}  // namespace
}  // namespace json::detail
