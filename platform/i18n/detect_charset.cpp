// Detection of the charset of a text file.
#include "platform/i18n/detect_charset.h"

#include <simdjson.h>
#include <uchardet/uchardet.h>

#include <array>
#include <memory>
#include <optional>
#include <ostream>
#include <stdexcept>

#include "platform/i18n/codecvt.h"

namespace platform::i18n {

namespace {

struct Mark {
    std::string_view bytes;
    const char* charset;
};

// UTF-32's little-endian mark begins with UTF-16's, so it comes first.
using namespace std::string_view_literals;
constexpr std::array<Mark, 5> marks{{
    {"\xEF\xBB\xBF"sv, "UTF-8"},
    {"\xFF\xFE\0\0"sv, "UTF-32LE"},
    {"\0\0\xFE\xFF"sv, "UTF-32BE"},
    {"\xFF\xFE"sv, "UTF-16LE"},
    {"\xFE\xFF"sv, "UTF-16BE"},
}};

bool holds(const std::string& charset, std::string_view bytes) {
    try {
        codecvt_string_to_ustring decoder(charset, true);
        codecvt_ustring_to_string encoder(charset, true);
        return to_string(to_ustring(bytes, decoder), encoder) == bytes;
    } catch (const std::runtime_error&) {
        return false;
    }
}

std::string askUchardet(std::string_view bytes) {
    struct Delete {
        void operator()(uchardet_t detector) const { uchardet_delete(detector); }
    };
    const std::unique_ptr<std::remove_pointer_t<uchardet_t>, Delete> detector(uchardet_new());
    uchardet_handle_data(detector.get(), bytes.data(), bytes.size());
    uchardet_data_end(detector.get());
    return uchardet_get_charset(detector.get());
}

}  // namespace

std::string detect_charset(const char* data, std::size_t length, std::ostream& diagnostics,
                           std::u16string_view sourceName) {
    const std::string_view bytes(data, length);
    for (const Mark& mark : marks) {
        if (bytes.starts_with(mark.bytes) && holds(mark.charset, bytes)) {
            return mark.charset;
        }
    }
    if (simdjson::validate_utf8(data, length)) {
        return "UTF-8";
    }
    const std::string guess = askUchardet(bytes);
    const std::string name = guess == "SHIFT_JIS" ? "Shift_JIS" : guess;
    if (holds(name, bytes)) {
        return name;
    }
    codecvt_ustring_to_string toUtf8("UTF-8", false);
    diagnostics << "No known charset fits " << to_string(sourceName, toUtf8)
                << "; read as ISO-8859-1\n";
    return "ISO-8859-1";
}

}  // namespace platform::i18n
