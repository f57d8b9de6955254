// SPDX-License-Identifier: Apache-2.0
// Charsets that ICU converts. ICU counts in 32 bits, so input goes through it in pieces.
#include "platform/i18n/charsets/icu_charset.h"

#include <unicode/ucnv.h>
#include <unicode/ucnv_err.h>
#include <unicode/uset.h>
#include <unicode/utf16.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <mutex>
#include <new>
#include <optional>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/detection/kept_codes.h"

namespace platform::i18n::detail {

namespace {

constexpr std::size_t pieceSize = std::size_t{1} << 16;
constexpr char16_t asciiDelete = 0x7F;

struct CloseConverter {
    void operator()(UConverter* converter) const { ucnv_close(converter); }
};
using Converter = std::unique_ptr<UConverter, CloseConverter>;

constexpr bool isControl(char16_t unit) {
    return unit < 0x20 || unit == asciiDelete;
}

void checkOutOfMemory(UErrorCode error) {
    if (error == U_MEMORY_ALLOCATION_ERROR) {
        throw std::bad_alloc();
    }
}

// What the control codes of ASCII stand for in ICU's table, and back. Tables of IBM's tradition
// exchange 1A, 1C and 7F among themselves, which is right on its mainframes and in no file that
// anyone has.
class ControlCodes {
public:
    explicit ControlCodes(UConverter* converter) {
        for (std::size_t i = 0; i < toAscii_.size(); ++i) {
            toAscii_[i] = fromAscii_[i] = static_cast<char16_t>(i);
        }
        for (char16_t code = 0; code <= asciiDelete; ++code) {
            if (isControl(code)) {
                const char16_t meaning = decodeAlone(converter, static_cast<char>(code));
                if (meaning != code && isControl(meaning)) {
                    toAscii_[meaning] = code;
                    fromAscii_[code] = meaning;
                    exchanged_ = true;
                }
            }
        }
        ucnv_resetToUnicode(converter);
    }

    void toAscii(char16_t* first, const char16_t* last) const { apply(toAscii_, first, last); }
    void fromAscii(char16_t* first, const char16_t* last) const { apply(fromAscii_, first, last); }

private:
    using Table = std::array<char16_t, asciiDelete + 1>;

    // The character that `byte` stands for; itself when it stands for none.
    static char16_t decodeAlone(UConverter* converter, char byte) {
        char16_t unit = 0;
        UErrorCode error = U_ZERO_ERROR;
        ucnv_resetToUnicode(converter);
        const auto length = ucnv_toUChars(converter, &unit, 1, &byte, 1, &error);
        return U_SUCCESS(error) && length == 1 ? unit : static_cast<unsigned char>(byte);
    }

    void apply(const Table& table, char16_t* first, const char16_t* last) const {
        if (!exchanged_) {
            return;
        }
        for (; first != last; ++first) {
            if (*first <= asciiDelete) {
                *first = table[*first];
            }
        }
    }

    Table toAscii_{};
    Table fromAscii_{};
    bool exchanged_ = false;
};

// Whether bytes of ASCII letters, digits and line ends stand for themselves; in EBCDIC they do not,
// and its control codes are its own.
bool isAsciiCompatible(UConverter* converter) {
    constexpr std::string_view sample = "AZaz09\r\n";
    std::array<char16_t, sample.size()> text{};
    UErrorCode error = U_ZERO_ERROR;
    ucnv_resetToUnicode(converter);
    const auto length =
        ucnv_toUChars(converter, text.data(), static_cast<std::int32_t>(text.size()), sample.data(),
                      static_cast<std::int32_t>(sample.size()), &error);
    return U_SUCCESS(error) && static_cast<std::size_t>(length) == sample.size() &&
           std::equal(sample.begin(), sample.end(), text.begin(), [](char byte, char16_t unit) {
               return static_cast<unsigned char>(byte) == unit;
           });
}

// Whether a character's code is the same in every text. It is not where sequences of escapes or
// shifts change the meaning of bytes, and where two characters in a row have a code of their own.
bool hasFixedCodes(UConverter* converter) {
    constexpr std::array fixed = {UCNV_SBCS, UCNV_DBCS, UCNV_MBCS, UCNV_LATIN_1, UCNV_US_ASCII};
    if (std::find(fixed.begin(), fixed.end(), ucnv_getType(converter)) == fixed.end()) {
        return false;
    }
    const std::unique_ptr<USet, void (*)(USet*)> characters(uset_openEmpty(), uset_close);
    UErrorCode error = U_ZERO_ERROR;
    ucnv_getUnicodeSet(converter, characters.get(), UCNV_ROUNDTRIP_SET, &error);
    return U_SUCCESS(error) && !uset_hasStrings(characters.get());
}

// What is known of the codes of a converter; null where they are not fixed. One for all the
// charsets that the converter is opened for, alive as long as the program.
KeptCodes* keptCodesOf(UConverter* converter) {
    static std::mutex mutex;
    static std::map<std::string, std::unique_ptr<KeptCodes>> known;  // guarded by mutex
    UErrorCode error = U_ZERO_ERROR;
    const std::string name = ucnv_getName(converter, &error);
    const std::lock_guard lock(mutex);
    const auto [found, isNew] = known.try_emplace(name);
    if (isNew && hasFixedCodes(converter)) {
        found->second = std::make_unique<KeptCodes>();
    }
    return found->second.get();
}

class IcuCharset final : public Charset {
public:
    IcuCharset(std::string name, Converter converter, bool strict)
        : name_(std::move(name)), converter_(std::move(converter)), strict_(strict) {
        if (isAsciiCompatible(converter_.get())) {
            controls_.emplace(converter_.get());
        }
        UErrorCode error = U_ZERO_ERROR;
        ucnv_setFallback(converter_.get(), false);
        if (strict) {
            ucnv_setToUCallBack(converter_.get(), UCNV_TO_U_CALLBACK_STOP, nullptr, nullptr,
                                nullptr, &error);
            ucnv_setFromUCallBack(converter_.get(), UCNV_FROM_U_CALLBACK_STOP, nullptr, nullptr,
                                  nullptr, &error);
        } else if (controls_) {
            ucnv_setSubstString(converter_.get(), u"?", 1, &error);
        }
    }

    std::u16string decode(std::string_view bytes) override {
        std::u16string text;
        text.reserve(bytes.size());
        std::array<char16_t, pieceSize> piece;  // NOLINT(*-member-init): filled before it is read
        const char* const end = bytes.data() + bytes.size();
        const char* position = bytes.data();
        ucnv_resetToUnicode(converter_.get());
        bool more = true;
        while (more) {
            const char* const limit =
                position + std::min(static_cast<std::size_t>(end - position), pieceSize);
            char16_t* out = piece.data();
            UErrorCode error = U_ZERO_ERROR;
            ucnv_toUnicode(converter_.get(), &out, piece.data() + piece.size(), &position, limit,
                           nullptr, static_cast<UBool>(limit == end), &error);
            if (U_FAILURE(error) && error != U_BUFFER_OVERFLOW_ERROR) {
                failDecoding(error, static_cast<std::size_t>(position - bytes.data()));
            }
            if (controls_) {
                controls_->toAscii(piece.data(), out);
            }
            text.append(piece.data(), out);
            more = error == U_BUFFER_OVERFLOW_ERROR || limit != end;
        }
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::string bytes;
        bytes.reserve(text.size());
        std::array<char16_t, pieceSize> piece;  // NOLINT(*-member-init): filled before it is read
        std::size_t done = 0;
        ucnv_resetFromUnicode(converter_.get());
        do {
            const std::u16string_view source = text.substr(done, pieceSize);
            std::copy(source.begin(), source.end(), piece.begin());
            char16_t* const pieceEnd = piece.data() + source.size();
            if (controls_) {
                controls_->fromAscii(piece.data(), pieceEnd);
            }
            encodePiece(piece.data(), pieceEnd, done, done + source.size() == text.size(), bytes);
            done += source.size();
        } while (done < text.size());
        return bytes;
    }

    bool keeps(std::string_view bytes) override {
        KeptCodes* const codes = strict_ ? keptCodesOf(converter_.get()) : nullptr;
        return codes != nullptr && codes->holdAll(bytes, *this);
    }

private:
    void encodePiece(const char16_t* position, const char16_t* end, std::size_t offset, bool isLast,
                     std::string& bytes) {
        const char16_t* const begin = position;
        std::array<char, pieceSize> piece;  // NOLINT(*-member-init): filled before it is read
        bool more = true;
        while (more) {
            char* out = piece.data();
            UErrorCode error = U_ZERO_ERROR;
            ucnv_fromUnicode(converter_.get(), &out, piece.data() + piece.size(), &position, end,
                             nullptr, static_cast<UBool>(isLast), &error);
            if (U_FAILURE(error) && error != U_BUFFER_OVERFLOW_ERROR) {
                failEncoding(error, offset + static_cast<std::size_t>(position - begin));
            }
            bytes.append(piece.data(), out);
            more = error == U_BUFFER_OVERFLOW_ERROR;
        }
    }

    // `consumed` counts the bytes read so far, those of the failing character included.
    [[noreturn]] void failDecoding(UErrorCode reason, std::size_t consumed) const {
        checkOutOfMemory(reason);
        std::array<char, 32> invalid{};
        auto length = static_cast<std::int8_t>(invalid.size());
        UErrorCode error = U_ZERO_ERROR;
        ucnv_getInvalidChars(converter_.get(), invalid.data(), &length, &error);
        const auto invalidLength = U_SUCCESS(error) ? static_cast<std::size_t>(length) : 0;
        const std::size_t offset = consumed - std::min(invalidLength, consumed);
        if (reason == U_TRUNCATED_CHAR_FOUND) {
            throwTruncated(name_, offset);
        }
        throwMalformed(name_, offset);
    }

    [[noreturn]] void failEncoding(UErrorCode reason, std::size_t consumed) const {
        checkOutOfMemory(reason);
        std::array<char16_t, 32> invalid{};
        auto length = static_cast<std::int8_t>(invalid.size());
        UErrorCode error = U_ZERO_ERROR;
        ucnv_getInvalidUChars(converter_.get(), invalid.data(), &length, &error);
        const auto invalidLength = U_SUCCESS(error) ? static_cast<std::size_t>(length) : 0;
        const std::size_t offset = consumed - std::min(invalidLength, consumed);
        if (invalidLength == 2) {
            throwUnmappable(name_,
                            static_cast<char32_t>(U16_GET_SUPPLEMENTARY(invalid[0], invalid[1])),
                            offset);
        }
        const char16_t unit = invalidLength == 0 ? u'\0' : invalid[0];
        if (U16_IS_SURROGATE(unit)) {
            throwUnpairedSurrogate(name_, offset);
        }
        throwUnmappable(name_, unit, offset);
    }

    std::string name_;
    Converter converter_;
    bool strict_;
    std::optional<ControlCodes> controls_;
};

}  // namespace

std::unique_ptr<Charset> makeIcuCharset(std::string name, const std::string& converter,
                                        bool strict) {
    UErrorCode error = U_ZERO_ERROR;
    Converter opened(ucnv_open(converter.c_str(), &error));
    checkOutOfMemory(error);
    if (U_FAILURE(error)) {
        return nullptr;
    }
    return std::make_unique<IcuCharset>(std::move(name), std::move(opened), strict);
}

}  // namespace platform::i18n::detail
