// SPDX-License-Identifier: Apache-2.0
// Charsets of single bytes that ICU lacks.
#include "platform/i18n/charsets/single_byte_charsets.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"

namespace platform::i18n::detail {

namespace {

// What a charset makes of each byte.
using Table = std::array<char16_t, 256>;

// ASCII and what follows it up to byte `from`, then `upper`.
constexpr Table tableOf(std::u16string_view upper, std::size_t from) {
    Table table{};
    for (std::size_t i = 0; i < table.size(); ++i) {
        table[i] = i < from ? static_cast<char16_t>(i) : upper[i - from];
    }
    return table;
}

// Romanian and its neighbours; the bytes from A0.
constexpr Table iso8859_16 = tableOf(
    u"\u00A0\u0104\u0105\u0141\u20AC\u201E\u0160\u00A7\u0161\u00A9\u0218\u00AB"
    u"\u0179\u00AD\u017A\u017B\u00B0\u00B1\u010C\u0142\u017D\u201D\u00B6\u00B7"
    u"\u017E\u010D\u0219\u00BB\u0152\u0153\u0178\u017C\u00C0\u00C1\u00C2\u0102"
    u"\u00C4\u0106\u00C6\u00C7\u00C8\u00C9\u00CA\u00CB\u00CC\u00CD\u00CE\u00CF"
    u"\u0110\u0143\u00D2\u00D3\u00D4\u0150\u00D6\u015A\u0170\u00D9\u00DA\u00DB"
    u"\u00DC\u0118\u021A\u00DF\u00E0\u00E1\u00E2\u0103\u00E4\u0107\u00E6\u00E7"
    u"\u00E8\u00E9\u00EA\u00EB\u00EC\u00ED\u00EE\u00EF\u0111\u0144\u00F2\u00F3"
    u"\u00F4\u0151\u00F6\u015B\u0171\u00F9\u00FA\u00FB\u00FC\u0119\u021B\u00FF",
    0xA0);

// Vietnamese (RFC 1456); the bytes from 80. Six rare capitals stand among the control codes.
constexpr Table viscii = [] {
    Table table = tableOf(
        u"\u1EA0\u1EAE\u1EB0\u1EB6\u1EA4\u1EA6\u1EA8\u1EAC\u1EBC\u1EB8\u1EBE\u1EC0"
        u"\u1EC2\u1EC4\u1EC6\u1ED0\u1ED2\u1ED4\u1ED6\u1ED8\u1EE2\u1EDA\u1EDC\u1EDE"
        u"\u1ECA\u1ECE\u1ECC\u1EC8\u1EE6\u0168\u1EE4\u1EF2\u00D5\u1EAF\u1EB1\u1EB7"
        u"\u1EA5\u1EA7\u1EA9\u1EAD\u1EBD\u1EB9\u1EBF\u1EC1\u1EC3\u1EC5\u1EC7\u1ED1"
        u"\u1ED3\u1ED5\u1ED7\u1EE0\u01A0\u1ED9\u1EDD\u1EDF\u1ECB\u1EF0\u1EE8\u1EEA"
        u"\u1EEC\u01A1\u1EDB\u01AF\u00C0\u00C1\u00C2\u00C3\u1EA2\u0102\u1EB3\u1EB5"
        u"\u00C8\u00C9\u00CA\u1EBA\u00CC\u00CD\u0128\u1EF3\u0110\u1EE9\u00D2\u00D3"
        u"\u00D4\u1EA1\u1EF7\u1EEB\u1EED\u00D9\u00DA\u1EF9\u1EF5\u00DD\u1EE1\u01B0"
        u"\u00E0\u00E1\u00E2\u00E3\u1EA3\u0103\u1EEF\u1EAB\u00E8\u00E9\u00EA\u1EBB"
        u"\u00EC\u00ED\u0129\u1EC9\u0111\u1EF1\u00F2\u00F3\u00F4\u00F5\u1ECF\u1ECD"
        u"\u1EE5\u00F9\u00FA\u0169\u1EE7\u00FD\u1EE3\u1EEE",
        0x80);
    table[0x02] = u'\u1EB2';
    table[0x05] = u'\u1EB4';
    table[0x06] = u'\u1EAA';
    table[0x14] = u'\u1EF6';
    table[0x19] = u'\u1EF8';
    table[0x1E] = u'\u1EF4';
    return table;
}();

// Kazakh, as Windows and as older systems of Central Asia write it; the bytes from 80. Byte 98
// stands for nothing in KZ-1048: it is a control code, as in windows-1251.
constexpr Table kz1048 = tableOf(
    u"\u0402\u0403\u201A\u0453\u201E\u2026\u2020\u2021\u20AC\u2030\u0409\u2039"
    u"\u040A\u049A\u04BA\u040F\u0452\u2018\u2019\u201C\u201D\u2022\u2013\u2014"
    u"\x98\u2122\u0459\u203A\u045A\u049B\u04BB\u045F\u00A0\u04B0\u04B1\u04D8"
    u"\u00A4\u04E8\u00A6\u00A7\u0401\u00A9\u0492\u00AB\u00AC\u00AD\u00AE\u04AE"
    u"\u00B0\u00B1\u0406\u0456\u04E9\u00B5\u00B6\u00B7\u0451\u2116\u0493\u00BB"
    u"\u04D9\u04A2\u04A3\u04AF\u0410\u0411\u0412\u0413\u0414\u0415\u0416\u0417"
    u"\u0418\u0419\u041A\u041B\u041C\u041D\u041E\u041F\u0420\u0421\u0422\u0423"
    u"\u0424\u0425\u0426\u0427\u0428\u0429\u042A\u042B\u042C\u042D\u042E\u042F"
    u"\u0430\u0431\u0432\u0433\u0434\u0435\u0436\u0437\u0438\u0439\u043A\u043B"
    u"\u043C\u043D\u043E\u043F\u0440\u0441\u0442\u0443\u0444\u0445\u0446\u0447"
    u"\u0448\u0449\u044A\u044B\u044C\u044D\u044E\u044F",
    0x80);
constexpr Table ptcp154 = tableOf(
    u"\u0496\u0492\u04EE\u0493\u201E\u2026\u04B6\u04AE\u04B2\u04AF\u04A0\u04E2"
    u"\u04A2\u049A\u04BA\u04B8\u0497\u2018\u2019\u201C\u201D\u2022\u2013\u2014"
    u"\u04B3\u04B7\u04A1\u04E3\u04A3\u049B\u04BB\u04B9\u00A0\u040E\u045E\u0408"
    u"\u04E8\u0498\u04B0\u00A7\u0401\u00A9\u04D8\u00AB\u00AC\u04EF\u00AE\u049C"
    u"\u00B0\u04B1\u0406\u0456\u0499\u04E9\u00B6\u00B7\u0451\u2116\u04D9\u00BB"
    u"\u0458\u04AA\u04AB\u049D\u0410\u0411\u0412\u0413\u0414\u0415\u0416\u0417"
    u"\u0418\u0419\u041A\u041B\u041C\u041D\u041E\u041F\u0420\u0421\u0422\u0423"
    u"\u0424\u0425\u0426\u0427\u0428\u0429\u042A\u042B\u042C\u042D\u042E\u042F"
    u"\u0430\u0431\u0432\u0433\u0434\u0435\u0436\u0437\u0438\u0439\u043A\u043B"
    u"\u043C\u043D\u043E\u043F\u0440\u0441\u0442\u0443\u0444\u0445\u0446\u0447"
    u"\u0448\u0449\u044A\u044B\u044C\u044D\u044E\u044F",
    0x80);

class SingleByteCharset final : public Charset {
public:
    SingleByteCharset(std::string name, const Table& table, bool strict)
        : name_(std::move(name)), table_(table), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        std::u16string text(bytes.size(), u'\0');
        std::transform(bytes.begin(), bytes.end(), text.begin(),
                       [this](char byte) { return table_[static_cast<unsigned char>(byte)]; });
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::string bytes;
        bytes.reserve(text.size());
        for (std::size_t i = 0; i < text.size(); ++i) {
            bytes += encodeOne(text, i);
        }
        return bytes;
    }

private:
    // The byte for the character at `position`, which moves to its last code unit.
    char encodeOne(std::u16string_view text, std::size_t& position) const {
        const char16_t unit = text[position];
        if (unit < table_.size() && table_[unit] == unit) {
            return static_cast<char>(unit);
        }
        const auto found = std::find(table_.begin(), table_.end(), unit);
        if (found != table_.end()) {
            return static_cast<char>(found - table_.begin());
        }
        if (strict_) {
            throwCannotEncode(name_, text, position);
        }
        if (startsWithPair(text.substr(position))) {
            ++position;
        }
        return '?';
    }

    std::string name_;
    const Table& table_;
    bool strict_;
};

}  // namespace

std::unique_ptr<Charset> makeIso8859_16(std::string name, bool strict) {
    return std::make_unique<SingleByteCharset>(std::move(name), iso8859_16, strict);
}

std::unique_ptr<Charset> makeViscii(std::string name, bool strict) {
    return std::make_unique<SingleByteCharset>(std::move(name), viscii, strict);
}

std::unique_ptr<Charset> makeKz1048(std::string name, bool strict) {
    return std::make_unique<SingleByteCharset>(std::move(name), kz1048, strict);
}

std::unique_ptr<Charset> makePtcp154(std::string name, bool strict) {
    return std::make_unique<SingleByteCharset>(std::move(name), ptcp154, strict);
}

}  // namespace platform::i18n::detail
