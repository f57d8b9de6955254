// SPDX-License-Identifier: Apache-2.0
// HZ, Chinese in seven bits (RFC 1843).
//
//     ~{              shift: pairs of bytes follow, row and column of GB 2312, each 21 to 7E
//     ~}              shift: ASCII follows, as at the beginning and at the end of a text
//     ~~              in ASCII, the character ~
//     ~ line feed     in ASCII, nothing: the line goes on
//
// Our own because ICU's converter silently drops what is malformed or cut off, and writes a
// needless ~} in front of every text.
#include "platform/i18n/charsets/hz.h"

#include <unicode/utf16.h>

#include <cstddef>
#include <optional>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/charsets/row_table.h"

namespace platform::i18n::detail {

namespace {

constexpr char16_t replacementCharacter = 0xFFFD;
constexpr char16_t endOfAscii = 0x80;

const RowTable& gb2312() {
    static const RowTable table("GB2312");
    return table;
}

// Decodes one text.
class HzDecoder {
public:
    HzDecoder(const std::string& name, bool strict, std::string_view bytes)
        : name_(name), strict_(strict), bytes_(bytes) {}

    std::u16string decode() {
        text_.reserve(bytes_.size());
        while (position_ < bytes_.size()) {
            if (inRows_) {
                decodePair();
            } else {
                decodeAscii();
            }
        }
        if (inRows_ && strict_) {
            throwTruncated(name_, bytes_.size());
        }
        return std::move(text_);
    }

private:
    bool nextIs(std::string_view bytes) const {
        return bytes_.substr(position_).starts_with(bytes);
    }

    void decodeAscii() {
        const auto byte = static_cast<unsigned char>(bytes_[position_]);
        if (nextIs("~{")) {
            shift(true);
        } else if (nextIs("~~")) {
            take(u'~', 2);
        } else if (nextIs("~\n") && !strict_) {
            position_ += 2;
        } else if (byte == '~' || byte >= endOfAscii) {
            refuse(byte == '~' ? 2 : 1);
        } else {
            take(byte, 1);
        }
    }

    void decodePair() {
        if (nextIs("~}")) {
            shift(false);
            return;
        }
        const std::string_view pair = bytes_.substr(position_, 2);
        const auto character = pair.size() < 2
                                   ? std::nullopt
                                   : gb2312().character(static_cast<unsigned char>(pair[0]),
                                                        static_cast<unsigned char>(pair[1]));
        if (character) {
            take(*character, 2);
        } else if (nextIs("\n") && !strict_) {
            // Some programs omit the shift at the end of a line.
            inRows_ = false;
        } else {
            refuse(2);
        }
    }

    // A shift right after another is refused: encoding would leave both out.
    void shift(bool toRows) {
        if (position_ == lastShiftEnd_ && strict_) {
            throwMalformed(name_, position_);
        }
        inRows_ = toRows;
        position_ += 2;
        lastShiftEnd_ = position_;
    }

    void take(char16_t character, std::size_t length) {
        text_ += character;
        position_ += length;
    }

    // No character begins here; one would have `length` bytes.
    void refuse(std::size_t length) {
        if (strict_ && length > bytes_.size() - position_) {
            throwTruncated(name_, position_);
        }
        if (strict_) {
            throwMalformed(name_, position_);
        }
        take(replacementCharacter, 1);
    }

    const std::string& name_;
    bool strict_;
    std::string_view bytes_;
    std::u16string text_;
    std::size_t position_ = 0;
    bool inRows_ = false;
    std::size_t lastShiftEnd_ = std::string_view::npos;
};

// Encodes one text.
class HzEncoder {
public:
    HzEncoder(const std::string& name, bool strict) : name_(name), strict_(strict) {}

    std::string encode(std::u16string_view text) {
        bytes_.reserve(text.size() * 2);
        for (std::size_t i = 0; i < text.size(); ++i) {
            if (text[i] < endOfAscii) {
                appendAscii(static_cast<char>(text[i]));
            } else if (const auto place = gb2312().place(text[i])) {
                shift(true);
                bytes_ += static_cast<char>(place->row);
                bytes_ += static_cast<char>(place->column);
            } else {
                if (strict_) {
                    throwCannotEncode(name_, text, i);
                }
                appendAscii('?');
                i += startsWithPair(text.substr(i)) ? 1 : 0;
            }
        }
        shift(false);
        return std::move(bytes_);
    }

private:
    void shift(bool toRows) {
        if (inRows_ != toRows) {
            bytes_ += toRows ? "~{" : "~}";
            inRows_ = toRows;
        }
    }

    void appendAscii(char byte) {
        shift(false);
        bytes_ += byte;
        if (byte == '~') {
            bytes_ += byte;
        }
    }

    const std::string& name_;
    bool strict_;
    std::string bytes_;
    bool inRows_ = false;
};

class Hz final : public Charset {
public:
    Hz(std::string name, bool strict) : name_(std::move(name)), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        return HzDecoder(name_, strict_, bytes).decode();
    }

    std::string encode(std::u16string_view text) override {
        return HzEncoder(name_, strict_).encode(text);
    }

private:
    std::string name_;
    bool strict_;
};

}  // namespace

std::unique_ptr<Charset> makeHz(std::string name, bool strict) {
    return std::make_unique<Hz>(std::move(name), strict);
}

}  // namespace platform::i18n::detail
