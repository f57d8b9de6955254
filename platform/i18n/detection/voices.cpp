// SPDX-License-Identifier: Apache-2.0
// What other detectors say.
#include "platform/i18n/detection/voices.h"

#include <uchardet/uchardet.h>
#include <unicode/ucsdet.h>

#include <algorithm>
#include <memory>
#include <type_traits>

namespace platform::i18n::detail {

namespace {

struct DeleteUchardet {
    void operator()(uchardet_t detector) const { uchardet_delete(detector); }
};
struct CloseUcsdet {
    void operator()(UCharsetDetector* detector) const { ucsdet_close(detector); }
};

}  // namespace

std::string charsetOfUchardet(std::string_view name) {
    struct Pair {
        const char* uchardet;
        const char* ours;
    };
    constexpr Pair renamed[] = {
        {"", ""},
        {"ASCII", ""},
        {"BIG5", "Big5"},
        {"MAC-CENTRALEUROPE", "x-mac-centraleurroman"},
        {"MAC-CYRILLIC", "x-mac-cyrillic"},
        {"SHIFT_JIS", "Shift_JIS"},
        {"TIS-620", "windows-874"},
        {"ISO-8859-11", "windows-874"},
        {"UHC", "EUC-KR"},
    };
    for (const Pair& pair : renamed) {
        if (name == pair.uchardet) {
            return pair.ours;
        }
    }
    std::string ours(name);
    if (ours.starts_with("WINDOWS-")) {
        ours.replace(0, 7, "windows");
    }
    return ours;
}

std::string uchardetGuess(std::string_view bytes) {
    const std::unique_ptr<std::remove_pointer_t<uchardet_t>, DeleteUchardet> detector(
        uchardet_new());
    if (uchardet_handle_data(detector.get(), bytes.data(), bytes.size()) != 0) {
        return {};
    }
    uchardet_data_end(detector.get());
    return charsetOfUchardet(uchardet_get_charset(detector.get()));
}

namespace {

// Throws std::bad_alloc unless `bytes` can be had. They are given back at once, to where the
// thread's next allocations of smaller pieces come from.
void proveMemory(std::size_t bytes) {
    ::operator delete(::operator new(bytes));
}

}  // namespace

std::vector<std::string> icuGuesses(std::string_view bytes) {
    // ICU's detector breaks the heap when an allocation of its own fails; all take some 20 KB.
    proveMemory(std::size_t{64} * 1024);
    UErrorCode error = U_ZERO_ERROR;
    const std::unique_ptr<UCharsetDetector, CloseUcsdet> detector(ucsdet_open(&error));
    ucsdet_setText(detector.get(), bytes.data(), static_cast<std::int32_t>(bytes.size()), &error);
    std::int32_t count = 0;
    const UCharsetMatch** const matches = ucsdet_detectAll(detector.get(), &count, &error);
    std::vector<std::string> names;
    for (std::int32_t i = 0; U_SUCCESS(error) && i < count; ++i) {
        names.emplace_back(ucsdet_getName(matches[i], &error));
    }
    return names;
}

}  // namespace platform::i18n::detail
