// SPDX-License-Identifier: Apache-2.0
// The encoding forms of Unicode. ICU has them too, but handles byte-order marks differently, and is
// slower on the one charset that nearly every file is in.
#include "platform/i18n/charsets/unicode_charsets.h"

#include <simdjson.h>
#include <unicode/utf16.h>
#include <unicode/utf8.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"

namespace platform::i18n::detail {

namespace {

constexpr char16_t replacementCharacter = 0xFFFD;
constexpr std::size_t wordSize = sizeof(std::uint64_t);

void appendCodePoint(std::u16string& text, char32_t character) {
    if (character <= 0xFFFF) {
        text += static_cast<char16_t>(character);
    } else {
        text += static_cast<char16_t>(U16_LEAD(character));
        text += static_cast<char16_t>(U16_TRAIL(character));
    }
}

// The character at `position`, which moves past it. For an unpaired surrogate, throws if `strict`,
// naming `charset`, else returns U+FFFD.
char32_t nextCharacter(std::u16string_view text, std::size_t& position, const std::string& charset,
                       bool strict) {
    const char16_t unit = text[position++];
    if (!U_IS_SURROGATE(unit)) {
        return unit;
    }
    if (U16_IS_LEAD(unit) && position < text.size() && U16_IS_TRAIL(text[position])) {
        return static_cast<char32_t>(U16_GET_SUPPLEMENTARY(unit, text[position++]));
    }
    if (strict) {
        throwUnpairedSurrogate(charset, position - 1);
    }
    return replacementCharacter;
}

class Utf8 final : public Charset {
public:
    Utf8(std::string name, bool strict) : name_(std::move(name)), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        // One code unit for each byte is enough: no sequence becomes more units than it has bytes.
        std::u16string text(bytes.size(), u'\0');
        char16_t* out = text.data();
        std::size_t position = 0;
        while (position < bytes.size()) {
            const std::size_t run = copyAscii(bytes.substr(position), out);
            position += run;
            out += run;
            if (position < bytes.size()) {
                out = decodeOne(bytes, position, out);
            }
        }
        text.resize(static_cast<std::size_t>(out - text.data()));
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::string bytes;
        bytes.reserve(text.size() + text.size() / 8);
        std::size_t position = 0;
        while (position < text.size()) {
            appendUtf8(bytes, nextCharacter(text, position, name_, strict_));
        }
        return bytes;
    }

    // Every character has one form in UTF-8.
    bool roundTrips(std::string_view bytes) override {
        return simdjson::validate_utf8(bytes.data(), bytes.size());
    }

private:
    // Copies the ASCII characters that `bytes` begins with, eight at a time, and returns their
    // number.
    static std::size_t copyAscii(std::string_view bytes, char16_t* out) {
        std::size_t done = 0;
        for (; bytes.size() - done >= wordSize; done += wordSize) {
            std::uint64_t word;
            std::memcpy(&word, bytes.data() + done, wordSize);
            if ((word & 0x8080808080808080U) != 0) {
                break;
            }
            for (std::size_t i = 0; i < wordSize; ++i) {
                out[done + i] = static_cast<unsigned char>(bytes[done + i]);
            }
        }
        for (; done < bytes.size() && static_cast<unsigned char>(bytes[done]) < 0x80; ++done) {
            out[done] = static_cast<unsigned char>(bytes[done]);
        }
        return done;
    }

    char16_t* decodeOne(std::string_view bytes, std::size_t& position, char16_t* out) const {
        // U8_NEXT counts in 32 bits; no sequence is longer than four bytes.
        const auto* const here = reinterpret_cast<const std::uint8_t*>(bytes.data() + position);
        const auto limit =
            static_cast<std::int32_t>(std::min<std::size_t>(bytes.size() - position, 4));
        std::int32_t used = 0;
        UChar32 character = 0;
        U8_NEXT(here, used, limit, character);
        if (character < 0) {
            if (strict_) {
                throwMalformed(name_, position);
            }
            character = replacementCharacter;
        }
        position += static_cast<std::size_t>(used);
        if (character <= 0xFFFF) {
            *out++ = static_cast<char16_t>(character);
        } else {
            *out++ = static_cast<char16_t>(U16_LEAD(character));
            *out++ = static_cast<char16_t>(U16_TRAIL(character));
        }
        return out;
    }

    static void appendUtf8(std::string& bytes, char32_t character) {
        if (character < 0x80) {
            bytes += static_cast<char>(character);
            return;
        }
        std::uint8_t encoded[U8_MAX_LENGTH];
        std::size_t length = 0;
        U8_APPEND_UNSAFE(encoded, length, character);
        bytes.append(reinterpret_cast<const char*>(encoded), length);
    }

    std::string name_;
    bool strict_;
};

// Reads and writes units of `width` bytes in one byte order.
template <std::size_t width>
char32_t loadUnit(const char* bytes, ByteOrder order) {
    char32_t unit = 0;
    for (std::size_t i = 0; i < width; ++i) {
        const std::size_t place = order == ByteOrder::big ? i : width - 1 - i;
        unit = (unit << 8) | static_cast<unsigned char>(bytes[place]);
    }
    return unit;
}

template <std::size_t width>
void storeUnit(char* bytes, char32_t unit, ByteOrder order) {
    for (std::size_t i = 0; i < width; ++i) {
        const std::size_t place = order == ByteOrder::big ? width - 1 - i : i;
        bytes[place] = static_cast<char>(unit & 0xFF);
        unit >>= 8;
    }
}

// The byte order in which to read `bytes`.
template <std::size_t width>
ByteOrder readingOrder(std::string_view bytes, ByteOrder order) {
    if (order != ByteOrder::fromMark) {
        return order;
    }
    const bool bigMark =
        bytes.size() >= width && loadUnit<width>(bytes.data(), ByteOrder::big) == 0xFEFF;
    return bigMark ? ByteOrder::big : ByteOrder::little;
}

ByteOrder writingOrder(ByteOrder order) {
    return order == ByteOrder::fromMark ? ByteOrder::little : order;
}

class Utf16 final : public Charset {
public:
    Utf16(std::string name, ByteOrder order, bool strict)
        : name_(std::move(name)), order_(order), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        const ByteOrder order = readingOrder<2>(bytes, order_);
        std::u16string text(bytes.size() / 2, u'\0');
        for (std::size_t i = 0; i < text.size(); ++i) {
            text[i] = static_cast<char16_t>(loadUnit<2>(bytes.data() + 2 * i, order));
        }
        treatSurrogates(text, [&](std::size_t unit) { throwMalformed(name_, 2 * unit); });
        if (bytes.size() % 2 != 0) {
            if (strict_) {
                throwTruncated(name_, bytes.size() - 1);
            }
            text += replacementCharacter;
        }
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::u16string paired(text);
        treatSurrogates(paired, [&](std::size_t unit) { throwUnpairedSurrogate(name_, unit); });
        std::string bytes(paired.size() * 2, '\0');
        const ByteOrder order = writingOrder(order_);
        for (std::size_t i = 0; i < paired.size(); ++i) {
            storeUnit<2>(bytes.data() + 2 * i, paired[i], order);
        }
        return bytes;
    }

    // Text without surrogates; whether those of other text are paired is left to the conversion.
    bool roundTrips(std::string_view bytes) override {
        if (order_ == ByteOrder::fromMark || bytes.size() % 2 != 0) {
            return false;
        }
        const std::size_t highByte = order_ == ByteOrder::big ? 0 : 1;
        bool surrogates = false;
        for (std::size_t i = highByte; i < bytes.size(); i += 2) {
            surrogates |= (static_cast<unsigned char>(bytes[i]) & 0xF8U) == 0xD8;
        }
        return !surrogates;
    }

private:
    // Strict: calls `fail` with the place of the first unpaired surrogate. Else replaces each.
    template <typename Fail>
    void treatSurrogates(std::u16string& text, Fail fail) const {
        for (std::size_t i = 0; i < text.size(); ++i) {
            if (!U16_IS_SURROGATE(text[i])) {
                continue;
            }
            if (U16_IS_LEAD(text[i]) && i + 1 < text.size() && U16_IS_TRAIL(text[i + 1])) {
                ++i;
            } else if (strict_) {
                fail(i);
            } else {
                text[i] = replacementCharacter;
            }
        }
    }

    std::string name_;
    ByteOrder order_;
    bool strict_;
};

class Utf32 final : public Charset {
public:
    Utf32(std::string name, ByteOrder order, bool strict)
        : name_(std::move(name)), order_(order), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        const ByteOrder order = readingOrder<4>(bytes, order_);
        std::u16string text;
        text.reserve(bytes.size() / 4 + 1);
        const std::size_t whole = bytes.size() - bytes.size() % 4;
        for (std::size_t i = 0; i < whole; i += 4) {
            char32_t character = loadUnit<4>(bytes.data() + i, order);
            if (character > 0x10FFFF || U_IS_SURROGATE(character)) {
                if (strict_) {
                    throwMalformed(name_, i);
                }
                character = replacementCharacter;
            }
            appendCodePoint(text, character);
        }
        if (whole != bytes.size()) {
            if (strict_) {
                throwTruncated(name_, whole);
            }
            text += replacementCharacter;
        }
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::string bytes(text.size() * 4, '\0');
        const ByteOrder order = writingOrder(order_);
        char* out = bytes.data();
        std::size_t position = 0;
        while (position < text.size()) {
            storeUnit<4>(out, nextCharacter(text, position, name_, strict_), order);
            out += 4;
        }
        bytes.resize(static_cast<std::size_t>(out - bytes.data()));
        return bytes;
    }

private:
    std::string name_;
    ByteOrder order_;
    bool strict_;
};

}  // namespace

std::unique_ptr<Charset> makeUtf8(std::string name, bool strict) {
    return std::make_unique<Utf8>(std::move(name), strict);
}

std::unique_ptr<Charset> makeUtf16(std::string name, ByteOrder order, bool strict) {
    return std::make_unique<Utf16>(std::move(name), order, strict);
}

std::unique_ptr<Charset> makeUtf32(std::string name, ByteOrder order, bool strict) {
    return std::make_unique<Utf32>(std::move(name), order, strict);
}

}  // namespace platform::i18n::detail
