// SPDX-License-Identifier: Apache-2.0
// The charset that a document says it is in.
#include "platform/i18n/detection/declared_charset.h"

#include "platform/text/case.h"

namespace platform::i18n::detail {

namespace {

constexpr std::size_t headSize = 4096;
constexpr std::size_t longestName = 40;

bool isNameCharacter(char c) {
    const char low = text::toLowerAscii(c);
    return (low >= 'a' && low <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_' ||
           c == '.' || c == ':' || c == '+';
}

bool isBlankOrQuote(char c) {
    return c == ' ' || c == '\t' || c == '"' || c == '\'';
}

std::size_t skip(std::string_view text, std::size_t position, bool (*skipped)(char)) {
    while (position < text.size() && skipped(text[position])) {
        ++position;
    }
    return position;
}

// The name that follows a keyword which ends at `position`: after "=" or ":", perhaps in quotes.
std::string_view nameAfter(std::string_view text, std::size_t position) {
    position = skip(text, position, [](char c) { return c == ' ' || c == '\t'; });
    if (position == text.size() || (text[position] != '=' && text[position] != ':')) {
        return {};
    }
    const std::size_t begin = skip(text, position + 1, isBlankOrQuote);
    const std::size_t end = skip(text, begin, isNameCharacter);
    return end - begin > longestName ? std::string_view() : text.substr(begin, end - begin);
}

}  // namespace

std::string declaredCharset(std::string_view bytes) {
    const std::string head = text::toLowerAscii(bytes.substr(0, headSize));
    for (const std::string_view keyword : {"charset", "encoding", "coding"}) {
        for (std::size_t found = head.find(keyword); found != std::string::npos;
             found = head.find(keyword, found + 1)) {
            const std::string_view name = nameAfter(head, found + keyword.size());
            if (!name.empty()) {
                return std::string(name);
            }
        }
    }
    // CSS: @charset "name";
    constexpr std::string_view rule = "@charset \"";
    if (head.starts_with(rule)) {
        return head.substr(rule.size(), head.find('"', rule.size()) - rule.size());
    }
    return {};
}

}  // namespace platform::i18n::detail
