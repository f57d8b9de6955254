// SPDX-License-Identifier: Apache-2.0
// Texts in many languages, encoded for tests by a converter that is not the one under test.
#include "tests/platform/i18n/detection/corpus.h"

#include <iconv.h>

#include <fstream>
#include <iterator>
#include <map>
#include <stdexcept>
#include "tests/support/source_root.h"

namespace test {

namespace {

struct NamedCharset {
    const char* charset;
    const char* iconvName;
};

using Charsets = std::vector<NamedCharset>;

std::string convert(const char* to, const char* from, std::string_view text, bool& complete) {
    const iconv_t converter = iconv_open(to, from);
    if (converter == reinterpret_cast<iconv_t>(-1)) {
        throw std::runtime_error(std::string("iconv knows no ") + to);
    }
    std::string input(text);
    std::string output(text.size() * 4 + 64, '\0');
    char* in = input.data();
    std::size_t inLeft = input.size();
    char* out = output.data();
    std::size_t outLeft = output.size();
    const auto failed = static_cast<std::size_t>(-1);
    complete = iconv(converter, &in, &inLeft, &out, &outLeft) != failed &&
               iconv(converter, nullptr, nullptr, &out, &outLeft) != failed;
    iconv_close(converter);
    output.resize(output.size() - outLeft);
    return output;
}

void replaceAll(std::string& text, std::string_view from, std::string_view to) {
    for (std::size_t found = text.find(from); found != std::string::npos;
         found = text.find(from, found + to.size())) {
        text.replace(found, from.size(), to);
    }
}

}  // namespace

const std::vector<CorpusEntry>& corpusEntries() {
    static const std::vector<CorpusEntry> entries = [] {
        const Charsets western{{"windows-1252", "CP1252"},     {"ISO-8859-1", "ISO-8859-1"},
                               {"ISO-8859-15", "ISO-8859-15"}, {"IBM850", "CP850"},
                               {"IBM00858", "CP858"},          {"macintosh", "MACINTOSH"}};
        const Charsets central{{"windows-1250", "CP1250"},
                               {"ISO-8859-2", "ISO-8859-2"},
                               {"IBM852", "CP852"},
                               {"x-mac-centraleurroman", "MAC-CENTRALEUROPE"}};
        const Charsets southern{
            {"windows-1250", "CP1250"}, {"ISO-8859-2", "ISO-8859-2"}, {"IBM852", "CP852"}};
        const Charsets baltic{{"windows-1257", "CP1257"},
                              {"ISO-8859-13", "ISO-8859-13"},
                              {"ISO-8859-4", "ISO-8859-4"},
                              {"IBM775", "CP775"}};
        const Charsets russian{{"windows-1251", "CP1251"},   {"KOI8-R", "KOI8-R"},
                               {"ISO-8859-5", "ISO-8859-5"}, {"IBM866", "CP866"},
                               {"IBM855", "CP855"},          {"x-mac-cyrillic", "MAC-CYRILLIC"}};
        const Charsets cyrillic{{"windows-1251", "CP1251"},
                                {"ISO-8859-5", "ISO-8859-5"},
                                {"IBM855", "CP855"},
                                {"x-mac-cyrillic", "MAC-CYRILLIC"}};
        const Charsets unicode{{"UTF-8", "UTF-8"},
                               {"UTF-16LE", "UTF-16LE"},
                               {"UTF-16BE", "UTF-16BE"},
                               {"UTF-32LE", "UTF-32LE"},
                               {"UTF-32BE", "UTF-32BE"}};
        const std::vector<std::pair<std::string, Charsets>> legacy{
            {"en", western},
            {"fr", western},
            {"de", western},
            {"de", {{"IBM437", "CP437"}}},
            {"es", western},
            {"pt", western},
            {"it", western},
            {"nl", western},
            {"sv", western},
            {"sv", {{"ISO-8859-10", "ISO-8859-10"}}},
            {"da", western},
            {"fi", western},
            {"is",
             {{"windows-1252", "CP1252"},
              {"ISO-8859-1", "ISO-8859-1"},
              {"ISO-8859-10", "ISO-8859-10"},
              {"IBM850", "CP850"}}},
            {"pl", central},
            {"cs", central},
            {"sk", central},
            {"hu", southern},
            {"sl", southern},
            {"hr", southern},
            {"ro", southern},
            {"tr", {{"windows-1254", "CP1254"}, {"ISO-8859-9", "ISO-8859-9"}, {"IBM857", "CP857"}}},
            {"et",
             {{"windows-1257", "CP1257"},
              {"ISO-8859-13", "ISO-8859-13"},
              {"ISO-8859-15", "ISO-8859-15"},
              {"ISO-8859-4", "ISO-8859-4"}}},
            {"lv", baltic},
            {"lt", baltic},
            {"eo", {{"ISO-8859-3", "ISO-8859-3"}}},
            {"vi", {{"windows-1258", "CP1258"}, {"VISCII", "VISCII"}}},
            {"ru", russian},
            {"uk", cyrillic},
            {"uk", {{"KOI8-U", "KOI8-U"}}},
            {"be", cyrillic},
            {"bg", cyrillic},
            {"sr", cyrillic},
            {"mk", cyrillic},
            {"el", {{"windows-1253", "CP1253"}, {"ISO-8859-7", "ISO-8859-7"}, {"IBM737", "CP737"}}},
            {"he", {{"windows-1255", "CP1255"}, {"ISO-8859-8", "ISO-8859-8"}, {"IBM862", "CP862"}}},
            {"ar", {{"windows-1256", "CP1256"}, {"ISO-8859-6", "ISO-8859-6"}}},
            {"fa", {{"windows-1256", "CP1256"}}},
            {"th", {{"windows-874", "CP874"}, {"windows-874", "TIS-620"}}},
            {"ja", {{"Shift_JIS", "CP932"}, {"EUC-JP", "EUC-JP"}, {"ISO-2022-JP", "ISO-2022-JP"}}},
            {"zh-Hans",
             {{"GB18030", "GB2312"}, {"GB18030", "GB18030"}, {"ISO-2022-CN", "ISO-2022-CN"}}},
            {"zh-Hant", {{"Big5", "BIG5"}, {"GB18030", "GBK"}, {"EUC-TW", "EUC-TW"}}},
            {"ko",
             {{"EUC-KR", "EUC-KR"},
              {"EUC-KR", "CP949"},
              {"Johab", "JOHAB"},
              {"ISO-2022-KR", "ISO-2022-KR"}}},
        };
        std::vector<CorpusEntry> made;
        std::map<std::string, bool> withUnicode;
        for (const auto& [language, charsets] : legacy) {
            Charsets all = charsets;
            if (!withUnicode[language]) {
                withUnicode[language] = true;
                all.insert(all.end(), unicode.begin(), unicode.end());
            }
            for (const NamedCharset& charset : all) {
                made.push_back({language, charset.charset, charset.iconvName});
            }
        }
        return made;
    }();
    return entries;
}

const std::string& corpusText(const std::string& language) {
    static std::map<std::string, std::string> texts;
    std::string& text = texts[language];
    if (text.empty()) {
        std::ifstream file(test::sourceRoot() + "/tests/data/charsets/texts/" + language + ".txt");
        text.assign(std::istreambuf_iterator<char>(file), {});
        if (text.empty()) {
            throw std::runtime_error("no text in " + language);
        }
    }
    return text;
}

std::optional<std::string> iconvEncode(const std::string& iconvName, std::string_view utf8) {
    bool complete = false;
    // windows-1258 writes Vietnamese tones as marks of their own, which iconv does unasked.
    std::string bytes = convert(iconvName.c_str(), "UTF-8", utf8, complete);
    return complete ? std::optional(std::move(bytes)) : std::nullopt;
}

std::optional<std::string> iconvDecode(const std::string& iconvName, std::string_view bytes) {
    bool complete = false;
    std::string utf8 = convert("UTF-8", iconvName.c_str(), bytes, complete);
    return complete ? std::optional(std::move(utf8)) : std::nullopt;
}

std::u16string iconvUtf16(std::string_view utf8) {
    bool complete = false;
    const std::string bytes = convert("UTF-16LE", "UTF-8", utf8, complete);
    if (!complete) {
        throw std::runtime_error("not UTF-8");
    }
    std::u16string text;
    for (std::size_t i = 0; i + 1 < bytes.size(); i += 2) {
        text += static_cast<char16_t>(static_cast<unsigned char>(bytes[i]) |
                                      (static_cast<unsigned char>(bytes[i + 1]) << 8));
    }
    return text;
}

std::vector<std::string> linesOf(std::string_view text) {
    std::vector<std::string> lines;
    while (!text.empty()) {
        const std::size_t end = std::min(text.find('\n'), text.size());
        if (end > 0) {
            lines.emplace_back(text.substr(0, end));
        }
        text.remove_prefix(std::min(end + 1, text.size()));
    }
    return lines;
}

std::string grownTo(std::string_view text, std::size_t size) {
    const std::vector<std::string> lines = linesOf(text);
    std::string grown;
    for (std::size_t i = 0; grown.size() < size; ++i) {
        // A stride without a factor in common with most counts puts the lines in ever new order.
        grown += lines[(i * 7 + i / lines.size()) % lines.size()];
        grown += '\n';
    }
    return grown;
}

std::string withTypography(std::string_view text) {
    std::string made;
    bool opening = true;
    for (const char c : text) {
        if (c == '"') {
            made += opening ? "\xE2\x80\x9C" : "\xE2\x80\x9D";
            opening = !opening;
        } else {
            made += c;
        }
    }
    replaceAll(made, "\n- ", "\n\xE2\x80\x93 ");
    replaceAll(made, "'", "\xE2\x80\x99");
    return made;
}

std::string asHtml(std::string_view text) {
    std::string page =
        "<!DOCTYPE html PUBLIC \"-//W3C//DTD HTML 4.01//EN\">\n<html>\n<head>\n"
        "<style type=\"text/css\">body { margin: 0; font-family: sans-serif; }</style>\n"
        "<script type=\"text/javascript\">var page = "
        "window.location.href;</script>\n</head>\n<body>\n";
    for (const std::string& line : linesOf(text)) {
        page += "<div class=\"entry\"><a href=\"index.php?page=12&amp;sort=date\">#</a><p>" + line +
                "</p></div>\n";
    }
    return page + "</body>\n</html>\n";
}

std::string asXml(std::string_view text) {
    std::string document = "<?xml version=\"1.0\"?>\n<document>\n";
    for (const std::string& line : linesOf(text)) {
        document += "  <paragraph style=\"normal\" level=\"1\">" + line + "</paragraph>\n";
    }
    return document + "</document>\n";
}

std::string asCsv(std::string_view text) {
    std::string table = "id;date;amount;description\n";
    int row = 0;
    for (const std::string& line : linesOf(text)) {
        ++row;
        table += std::to_string(row) + ";2003-04-" + std::to_string(10 + row % 20) + ";" +
                 std::to_string(row * 37) + ".50;" + line + "\n";
    }
    return table;
}

std::string asSource(std::string_view text) {
    std::string source =
        "#include <stdio.h>\n\nint main(int argc, char **argv)\n{\n    int result = 0;\n";
    for (const std::string& line : linesOf(text)) {
        source += "    /* " + line +
                  " */\n    if (argc > 1 && argv[1] != NULL) {\n"
                  "        result = process_argument(argv[1], &options);\n    }\n";
    }
    return source + "    return result;\n}\n";
}

std::string asSubtitles(std::string_view text) {
    std::string subtitles;
    int number = 0;
    for (const std::string& line : linesOf(text)) {
        ++number;
        subtitles += std::to_string(number) + "\r\n00:0" + std::to_string(number % 10) +
                     ":12,345 --> 00:0" + std::to_string(number % 10) + ":15,678\r\n" + line +
                     "\r\n\r\n";
    }
    return subtitles;
}

}  // namespace test
