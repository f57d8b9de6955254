// SPDX-License-Identifier: Apache-2.0
// Writes the tables by which the page decodes and encodes texts, one file for each charset, so that
// it does to the byte what the converters here do.
//
// Usage: make_charset_tables FOLDER
//
// A charset gets a table when its characters have fixed codes of one to four bytes: no escapes, no
// shifts. The encoding forms of Unicode get none, as they are arithmetic. charsets.json names the
// file of each charset. The sets of characters that escapes and shifts choose from get one each.
//
// A file is a sequence of numbers, each in bytes of seven bits, the low ones first, with the high
// bit set in all but the last byte:
//
//   how many lengths of codes there are, and for each of them
//     the length in bytes
//     for each byte: the lowest and the highest value that it has in a code of this length
//     how many runs there are, and for each of them
//       how many codes lie between the previous run and this one
//       twice how many codes it has, and one more when they are decoded only
//       the first character less the one behind the previous run's last, zigzag
//
// In a run, codes and characters follow each other. The code behind another one is that with the
// last byte raised by one, or, where it is the highest already, with its lowest and the byte before
// raised.
#include <unicode/ucnv.h>
#include <unicode/utf16.h>

#include <algorithm>
#include <bitset>
#include <cctype>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/detection/legacy_charsets.h"

namespace {

using platform::i18n::detail::Charset;
using platform::i18n::detail::isSameCharset;
using platform::i18n::detail::openCharset;

constexpr std::size_t longestCode = 4;

struct Code {
    std::string bytes;
    char32_t character;
    bool isDecodedOnly;
};

// The charset has no table.
class NoTable : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

std::u16string textOf(char32_t character) {
    std::u16string text;
    if (character > 0xFFFF) {
        text += static_cast<char16_t>(U16_LEAD(character));
        text += static_cast<char16_t>(U16_TRAIL(character));
    } else {
        text += static_cast<char16_t>(character);
    }
    return text;
}

// The one character of `text`; nothing when it has several or none.
std::optional<char32_t> characterOf(std::u16string_view text) {
    if (text.size() == 1) {
        return text[0];
    }
    if (text.size() == 2 && U16_IS_LEAD(text[0]) && U16_IS_TRAIL(text[1])) {
        return static_cast<char32_t>(U16_GET_SUPPLEMENTARY(text[0], text[1]));
    }
    return std::nullopt;
}

// Finds all codes of a charset, by trying them.
class CodeFinder {
public:
    explicit CodeFinder(const std::string& charset)
        : strict_(openCharset(charset, true)), lenient_(openCharset(charset, false)) {}

    // In the order of their lengths and bytes.
    std::vector<Code> find() {
        collect("", Bytes().set());
        std::stable_sort(codes_.begin(), codes_.end(), [](const Code& a, const Code& b) {
            return a.bytes.size() < b.bytes.size();
        });
        requireFixedCodes();
        return std::move(codes_);
    }

private:
    using Bytes = std::bitset<0x100>;

    // All codes that begin with `prefix` and go on with one of `candidates`.
    void collect(const std::string& prefix, const Bytes& candidates) {
        bool isFirst = true;
        for (unsigned byte = 0; byte < candidates.size(); ++byte) {
            if (!candidates[byte]) {
                continue;
            }
            const std::string bytes = prefix + static_cast<char>(byte);
            std::u16string text;
            try {
                text = strict_->decode(bytes);
            } catch (const std::runtime_error& error) {
                if (std::string_view(error.what()).find("ends inside") == std::string_view::npos) {
                    continue;
                }
                if (bytes.size() == longestCode) {
                    throw NoTable("its codes are too long");
                }
                // To try all of the 40 million last bytes of GB18030 would take a minute.
                const bool isLast = bytes.size() + 1 == longestCode;
                collect(bytes, isLast && !isFirst ? lastBytes_ : Bytes().set());
                isFirst = false;
                continue;
            }
            add(bytes, text);
        }
    }

    void add(const std::string& bytes, const std::u16string& text) {
        const std::optional<char32_t> character = characterOf(text);
        if (!character) {
            throw NoTable("it has codes of several characters, or of none");
        }
        if (bytes.size() > 1 && bytes[0] == '\0') {
            throw NoTable("its codes begin with zeros");
        }
        if (bytes.size() == longestCode) {
            lastBytes_.set(static_cast<unsigned char>(bytes.back()));
        }
        const bool isDecodedOnly = strict_->encode(text) != bytes;
        codes_.push_back({bytes, *character, isDecodedOnly});
    }

    // That there are no other codes, and that a text's code is made of those of its characters.
    void requireFixedCodes() {
        std::map<std::u16string, std::string> encoded;
        std::u16string text;
        std::string bytes;
        for (const Code& code : codes_) {
            if (!code.isDecodedOnly) {
                encoded.emplace(textOf(code.character), code.bytes);
            }
        }
        // Characters from both ends in turn: in the order of the codes, shifts would be rare.
        for (auto [low, high] = std::pair(encoded.begin(), encoded.rbegin()); low != encoded.end();
             ++low, ++high) {
            text += low->first + high->first;
            bytes += low->second + high->second;
        }
        if (lenient_->encode(text) != bytes || lenient_->decode(bytes) != text) {
            throw NoTable("its codes depend on each other");
        }
        for (char32_t character = 0; character <= 0xFFFF; ++character) {
            const std::u16string one = textOf(character);
            // What has no code becomes another character, or is replaced by one.
            if (!encoded.contains(one) && lenient_->decode(lenient_->encode(one)) == one) {
                throw NoTable("it has codes that do not stand alone");
            }
        }
    }

    std::unique_ptr<Charset> strict_;
    std::unique_ptr<Charset> lenient_;
    std::vector<Code> codes_;
    Bytes lastBytes_;  // which end codes of the greatest length
};

// A file under construction.
class TableFile {
public:
    explicit TableFile(const std::vector<Code>& codes) {
        std::map<std::size_t, std::vector<const Code*>> byLength;
        for (const Code& code : codes) {
            byLength[code.bytes.size()].push_back(&code);
        }
        number(byLength.size());
        for (const auto& [length, some] : byLength) {
            codesOfLength(length, some);
        }
    }

    const std::string& bytes() const { return bytes_; }

private:
    struct Run {
        std::uint64_t first;  // the place of its first code among all that there could be
        std::uint64_t count;
        char32_t character;
        bool isDecodedOnly;
    };

    void number(std::uint64_t value) {
        for (; value >= 0x80; value >>= 7) {
            bytes_ += static_cast<char>(value | 0x80);
        }
        bytes_ += static_cast<char>(value);
    }

    void difference(std::int64_t value) {
        number(value < 0 ? static_cast<std::uint64_t>(-2 * value - 1)
                         : static_cast<std::uint64_t>(2 * value));
    }

    void codesOfLength(std::size_t length, const std::vector<const Code*>& codes) {
        std::vector<unsigned> lowest(length, 0xFF);
        std::vector<unsigned> highest(length, 0);
        for (const Code* code : codes) {
            for (std::size_t i = 0; i < length; ++i) {
                const unsigned byte = static_cast<unsigned char>(code->bytes[i]);
                lowest[i] = std::min(lowest[i], byte);
                highest[i] = std::max(highest[i], byte);
            }
        }
        number(length);
        for (std::size_t i = 0; i < length; ++i) {
            number(lowest[i]);
            number(highest[i]);
        }
        std::vector<Run> runs;
        for (const Code* code : codes) {
            std::uint64_t place = 0;
            for (std::size_t i = 0; i < length; ++i) {
                place = place * (highest[i] - lowest[i] + 1) +
                        static_cast<unsigned char>(code->bytes[i]) - lowest[i];
            }
            append(runs, {place, 1, code->character, code->isDecodedOnly});
        }
        write(runs);
    }

    static void append(std::vector<Run>& runs, const Run& one) {
        if (!runs.empty()) {
            Run& last = runs.back();
            if (last.first + last.count == one.first &&
                last.character + last.count == one.character &&
                last.isDecodedOnly == one.isDecodedOnly) {
                ++last.count;
                return;
            }
        }
        runs.push_back(one);
    }

    void write(const std::vector<Run>& runs) {
        number(runs.size());
        std::uint64_t place = 0;
        std::int64_t character = 0;
        for (const Run& run : runs) {
            number(run.first - place);
            number(2 * run.count + (run.isDecodedOnly ? 1 : 0));
            difference(static_cast<std::int64_t>(run.character) - character);
            place = run.first + run.count;
            character = static_cast<std::int64_t>(run.character + run.count);
        }
    }

    std::string bytes_;
};

// A set of characters that texts with escapes or shifts choose from.
struct GraphicSet {
    const char* file;
    const char* charset;  // one that has it
    const char* before;   // what a text has in front of a code of the set
    const char* after;
    std::size_t length;  // of its codes
};

constexpr GraphicSet graphicSets[] = {
    {"set-jis-x-0208.bin", "ISO-2022-JP", "\x1B$B", "\x1B(B", 2},
    {"set-jis-x-0212.bin", "ISO-2022-JP-1", "\x1B$(D", "\x1B(B", 2},
    {"set-latin-1.bin", "ISO-2022-JP-2", "\x1B.A\x1BN", "", 1},
    {"set-greek.bin", "ISO-2022-JP-2", "\x1B.F\x1BN", "", 1},
    {"set-ks-x-1001.bin", "ISO-2022-KR", "\x1B$)C\x0E", "\x0F", 2},
    {"set-ks-c-5601.bin", "ISO-2022-JP-2", "\x1B$(C", "\x1B(B", 2},
    {"set-gb-2312.bin", "ISO-2022-CN", "\x1B$)A\x0E", "\x0F", 2},
    {"set-iso-ir-165.bin", "ISO-2022-CN-EXT", "\x1B$)E\x0E", "\x0F", 2},
    {"set-cns-1.bin", "ISO-2022-CN", "\x1B$)G\x0E", "\x0F", 2},
    {"set-cns-2.bin", "ISO-2022-CN", "\x1B$*H\x1BN", "", 2},
    {"set-hz.bin", "HZ", "~{", "~}", 2},
};

// The codes of a set, in order.
std::vector<Code> codesOf(const GraphicSet& set) {
    const std::unique_ptr<Charset> charset = openCharset(set.charset, true);
    std::vector<Code> codes;
    const auto add = [&](const std::string& code) {
        try {
            const auto character = characterOf(charset->decode(set.before + code + set.after));
            if (character) {
                codes.push_back({code, *character, true});
            }
        } catch (const std::runtime_error&) {
            return;  // no code of the set
        }
    };
    for (char first = ' '; first <= '~'; ++first) {
        for (char second = '!'; second <= '~' && set.length == 2; ++second) {
            add({first, second});
        }
        if (set.length == 1) {
            add({first});
        }
    }
    if (codes.empty()) {
        throw std::runtime_error(std::string(set.file) + ": no text has characters of this set");
    }
    return codes;
}

bool isArithmetic(const std::string& name) {
    constexpr const char* forms[] = {"UTF-8",  "UTF-16",   "UTF-16LE", "UTF-16BE",
                                     "UTF-32", "UTF-32LE", "UTF-32BE"};
    return std::any_of(std::begin(forms), std::end(forms),
                       [&](const char* form) { return isSameCharset(name, form); });
}

// The charsets that files are found in, with the variants of which only the bytes tell.
std::vector<std::string> foundCharsets() {
    std::vector<std::string> names = {"x-Shift_JIS-nec", "x-Shift_JIS-ibm", "x-EUC-JP-nec",
                                      "x-Big5-eten"};
    for (const auto& charset : platform::i18n::detail::legacyCharsets()) {
        names.push_back(charset.name());
    }
    return names;
}

// Whether nothing but a table of codes makes ICU's converter.
bool isTable(const char* converter) {
    UErrorCode error = U_ZERO_ERROR;
    const std::unique_ptr<UConverter, void (*)(UConverter*)> opened(ucnv_open(converter, &error),
                                                                    ucnv_close);
    constexpr UConverterType tables[] = {UCNV_SBCS, UCNV_DBCS, UCNV_MBCS, UCNV_LATIN_1,
                                         UCNV_US_ASCII};
    return opened &&
           std::count(std::begin(tables), std::end(tables), ucnv_getType(opened.get())) != 0;
}

// Whether lines of ASCII can be written in it, as in no set of Chinese characters alone.
bool holdsText(const std::string& charset) {
    try {
        openCharset(charset, true)->encode(u"AZaz09 \r\n");
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

// Further ones that a person may choose: those that ICU knows and IANA has registered,
// under the names that mail and web have for them.
std::vector<std::string> registeredCharsets() {
    std::vector<std::string> names;
    for (std::int32_t i = 0; i < ucnv_countAvailable(); ++i) {
        const char* const converter = ucnv_getAvailableName(i);
        const char* name = nullptr;
        for (const char* standard : {"IANA", "MIME"}) {
            UErrorCode error = U_ZERO_ERROR;
            const char* const found = ucnv_getStandardName(converter, standard, &error);
            name = found != nullptr ? found : name;
        }
        if (name != nullptr && isTable(converter) && holdsText(name)) {
            names.emplace_back(name);
        }
    }
    return names;
}

std::string fileNameOf(const std::string& charset) {
    std::string name;
    for (const char c : charset) {
        const auto byte = static_cast<unsigned char>(c);
        name += std::isalnum(byte) ? static_cast<char>(std::tolower(byte)) : '-';
    }
    return name + ".bin";
}

void writeFile(const std::filesystem::path& path, std::string_view content) {
    std::ofstream file(path, std::ios::binary);
    file.write(content.data(), static_cast<std::streamsize>(content.size()));
    file.close();
    if (!file) {
        throw std::runtime_error("cannot write " + path.string());
    }
}

// All tables, by the names of their charsets.
std::map<std::string, TableFile> makeTables() {
    std::map<std::string, TableFile> tables;
    for (const std::string& name : foundCharsets()) {
        try {
            tables.emplace(name, CodeFinder(name).find());
        } catch (const NoTable& reason) {
            throw std::runtime_error(name + " cannot have a table: " + reason.what());
        }
    }
    for (const std::string& name : registeredCharsets()) {
        const bool isThere =
            isArithmetic(name) || std::any_of(tables.begin(), tables.end(), [&](const auto& known) {
                return isSameCharset(name, known.first);
            });
        if (isThere) {
            continue;
        }
        try {
            tables.emplace(name, CodeFinder(name).find());
        } catch (const std::runtime_error& reason) {
            std::cout << name << " has no table: " << reason.what() << '\n';
        }
    }
    return tables;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::cerr << "usage: make_charset_tables FOLDER\n";
        return 2;
    }
    try {
        const std::filesystem::path folder = argv[1];
        std::filesystem::create_directories(folder);
        std::string index;
        for (const auto& [name, table] : makeTables()) {
            writeFile(folder / fileNameOf(name), table.bytes());
            index += (index.empty() ? "{\n" : ",\n");
            index += "  \"" + name + "\": \"" + fileNameOf(name) + "\"";
        }
        for (const GraphicSet& set : graphicSets) {
            writeFile(folder / set.file, TableFile(codesOf(set)).bytes());
        }
        writeFile(folder / "charsets.json", index + "\n}\n");
    } catch (const std::exception& error) {
        std::cerr << "make_charset_tables: " << error.what() << '\n';
        return 1;
    }
}
