// SPDX-License-Identifier: Apache-2.0
// UTF-7, Unicode in seven bits for mail (RFC 2152).
//
//     visible ASCII but \ and ~, blank, tab, line ends    themselves, except +
//     +-                                                  the character +
//     + base64 -                                          UTF-16BE code units, in base64 without
//                                                         padding
//
// The "-" can be left out in front of a direct character that is neither in base64's alphabet nor a
// "-", and at the end of the text. Our own because ICU's converter drops a + that begins nothing,
// and accepts halves of surrogate pairs.
#include "platform/i18n/charsets/utf7.h"

#include <unicode/utf16.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"

namespace platform::i18n::detail {

namespace {

constexpr char16_t replacementCharacter = 0xFFFD;
constexpr std::string_view alphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

bool isDirect(char16_t character) {
    const bool visible = character >= ' ' && character < '~' && character != '\\';
    return (visible && character != '+') || character == '\t' || character == '\n' ||
           character == '\r';
}

constexpr std::uint32_t noDigit = 64;

// The value of each ASCII character as a digit of base64.
constexpr std::array<std::uint32_t, 0x80> makeDigitValues() {
    std::array<std::uint32_t, 0x80> values{};
    values.fill(noDigit);
    for (std::size_t i = 0; i < alphabet.size(); ++i) {
        values[static_cast<std::size_t>(alphabet[i])] = static_cast<std::uint32_t>(i);
    }
    return values;
}

constexpr std::array<std::uint32_t, 0x80> digitValues = makeDigitValues();

bool isBase64(char16_t character) {
    return character < digitValues.size() && digitValues[character] != noDigit;
}

// Decodes one text.
class Utf7Decoder {
public:
    Utf7Decoder(const std::string& name, bool strict, std::string_view bytes)
        : name_(name), strict_(strict), bytes_(bytes) {}

    std::u16string decode() {
        text_.reserve(bytes_.size());
        while (position_ < bytes_.size()) {
            const auto byte = static_cast<unsigned char>(bytes_[position_]);
            if (byte == '+') {
                decodeRun();
            } else {
                if (isDirect(byte)) {
                    text_ += byte;
                } else {
                    refuse(position_);
                }
                ++position_;
            }
        }
        return std::move(text_);
    }

private:
    // Decodes what follows a +, and its end.
    void decodeRun() {
        const std::size_t start = position_++;
        std::size_t end = position_;
        while (end < bytes_.size() && isBase64(static_cast<unsigned char>(bytes_[end]))) {
            ++end;
        }
        const bool closed = end < bytes_.size() && bytes_[end] == '-';
        if (end == position_) {
            if (closed) {
                text_ += u'+';
            } else {
                refuse(start);
            }
        } else {
            decodeUnits(start, bytes_.substr(position_, end - position_));
        }
        position_ = closed ? end + 1 : end;
    }

    void decodeUnits(std::size_t start, std::string_view run) {
        const std::size_t first = text_.size();
        std::uint32_t bits = 0;
        int count = 0;
        for (const char digit : run) {
            bits = bits << 6U | digitValues[static_cast<unsigned char>(digit)];
            count += 6;
            if (count >= 16) {
                count -= 16;
                text_ += static_cast<char16_t>(bits >> count & 0xFFFFU);
                bits &= (1U << count) - 1;
            }
        }
        // The remaining bits fill the last digit, padded with zeros.
        if (count >= 6 || bits != 0) {
            refuse(start);
        }
        refuseLoneSurrogates(start, first);
    }

    void refuseLoneSurrogates(std::size_t start, std::size_t first) {
        for (std::size_t i = first; i < text_.size(); ++i) {
            if (startsWithPair(std::u16string_view(text_).substr(i))) {
                ++i;
            } else if (U16_IS_SURROGATE(text_[i])) {
                if (strict_) {
                    throwMalformed(name_, start);
                }
                text_[i] = replacementCharacter;
            }
        }
    }

    void refuse(std::size_t start) {
        if (strict_ && start + 1 == bytes_.size() && bytes_[start] == '+') {
            throwTruncated(name_, start);
        }
        if (strict_) {
            throwMalformed(name_, start);
        }
        text_ += replacementCharacter;
    }

    const std::string& name_;
    bool strict_;
    std::string_view bytes_;
    std::u16string text_;
    std::size_t position_ = 0;
};

// Encodes one text.
class Utf7Encoder {
public:
    Utf7Encoder(const std::string& name, bool strict) : name_(name), strict_(strict) {}

    std::string encode(std::u16string_view text) {
        bytes_.reserve(text.size());
        for (std::size_t i = 0; i < text.size(); ++i) {
            if (isDirect(text[i])) {
                endRun(isBase64(text[i]) || text[i] == '-');
                bytes_ += static_cast<char>(text[i]);
            } else if (text[i] == '+' && !inRun_) {
                bytes_ += "+-";
            } else if (startsWithPair(text.substr(i))) {
                appendUnit(text[i]);
                appendUnit(text[++i]);
            } else if (U16_IS_SURROGATE(text[i])) {
                if (strict_) {
                    throwUnpairedSurrogate(name_, i);
                }
                appendUnit(replacementCharacter);
            } else {
                appendUnit(text[i]);
            }
        }
        endRun(true);
        return std::move(bytes_);
    }

private:
    void appendUnit(char16_t unit) {
        if (!inRun_) {
            bytes_ += '+';
            inRun_ = true;
        }
        bits_ = bits_ << 16U | unit;
        count_ += 16;
        while (count_ >= 6) {
            count_ -= 6;
            bytes_ += alphabet[bits_ >> count_ & 63U];
        }
        bits_ &= (1U << count_) - 1;
    }

    void endRun(bool needsMark) {
        if (!inRun_) {
            return;
        }
        if (count_ != 0) {
            bytes_ += alphabet[bits_ << (6U - count_) & 63U];
        }
        if (needsMark) {
            bytes_ += '-';
        }
        inRun_ = false;
        bits_ = 0;
        count_ = 0;
    }

    const std::string& name_;
    bool strict_;
    std::string bytes_;
    bool inRun_ = false;
    // The last `count_` bits of the run, which do not fill a digit yet.
    std::uint32_t bits_ = 0;
    unsigned count_ = 0;
};

class Utf7 final : public Charset {
public:
    Utf7(std::string name, bool strict) : name_(std::move(name)), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        return Utf7Decoder(name_, strict_, bytes).decode();
    }

    std::string encode(std::u16string_view text) override {
        return Utf7Encoder(name_, strict_).encode(text);
    }

private:
    std::string name_;
    bool strict_;
};

}  // namespace

std::unique_ptr<Charset> makeUtf7(std::string name, bool strict) {
    return std::make_unique<Utf7>(std::move(name), strict);
}

}  // namespace platform::i18n::detail
