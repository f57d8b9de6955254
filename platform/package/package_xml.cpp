// SPDX-License-Identifier: Apache-2.0
#include "platform/package/package_xml.h"

#include <expat.h>
#include <sys/random.h>

#include <algorithm>
#include <cstddef>
#include <exception>
#include <memory>
#include <new>
#include <stdexcept>

#include "platform/i18n/codecvt.h"
#include "platform/package/about.h"
#include "platform/posix/system_error.h"
#include "platform/text/case.h"

namespace platform::package {
namespace {

constexpr std::string_view byteOrderMark = "\xEF\xBB\xBF";

// Stands between namespace and local name in the names that the parser gives. It refuses namespaces
// with this character in them.
constexpr char separator = '\n';

// Package XML has two levels; a few more are allowed for what future versions may add. The parser
// keeps all elements that are open, and a document of nothing else would take fifty times its size.
constexpr std::size_t maxDepth = 256;

// The salt of the parser's hash tables, so that nobody can make a document whose names collide.
// Left to choose one itself, the parser ends the process when the system has no random number.
unsigned long hashSalt() {
    static const unsigned long salt = [] {
        unsigned long number = 0;
        if (::getrandom(&number, sizeof number, GRND_NONBLOCK) != sizeof number) {
            throwSystemError("needs a random number to read");
        }
        return number | 1U;  // zero means none
    }();
    return salt;
}

// The charset of `xml` if it begins as UTF-16 does, with a byte-order mark or with "<"; else null.
const char* utf16Charset(std::span<const std::uint8_t> xml) {
    if (xml.size() < 2) {
        return nullptr;
    }
    switch (xml[0] << 8U | xml[1]) {
        case 0xFEFF:
        case '<':
            return "UTF-16BE";
        case 0xFFFE:
        case '<' << 8U:
            return "UTF-16LE";
        default:
            return nullptr;
    }
}

// Reads one document.
class ElementReader {
public:
    ElementReader(std::string_view root, std::string_view namespaceUri,
                  const std::function<void(const XmlElement&)>& visit)
        : root_(root), namespaceUri_(namespaceUri), visit_(visit) {}

    void read(std::span<const std::uint8_t> xml) {
        // The parser takes the halves of surrogate pairs as they come, so it gets UTF-8 always.
        const char* charset = utf16Charset(xml);
        isUtf16_ = charset != nullptr;
        const std::string_view text(reinterpret_cast<const char*>(xml.data()), xml.size());
        if (isUtf16_) {
            i18n::codecvt_string_to_ustring converter(charset, true);
            parse(i18n::to_string(i18n::to_ustring(text, converter)));
        } else {
            parse(text);
        }
        if (!hasRoot_) {
            throw std::runtime_error("has another root element than " + std::string(root_));
        }
    }

private:
    struct FreeParser {
        void operator()(XML_Parser parser) const noexcept { XML_ParserFree(parser); }
    };

    void parse(std::string_view utf8) {
        parser_.reset(XML_ParserCreateNS("UTF-8", separator));
        if (!parser_) {
            throw std::bad_alloc();
        }
        XML_SetHashSalt(parser_.get(), hashSalt());
        XML_SetUserData(parser_.get(), this);
        XML_SetElementHandler(parser_.get(), onStart, onEnd);
        XML_SetXmlDeclHandler(parser_.get(), onDeclaration);
        XML_SetStartDoctypeDeclHandler(parser_.get(), onDocumentType);
        // With a mark in front, the parser does not mistake zeros in the text for UTF-16.
        feed(byteOrderMark, XML_FALSE);
        utf8.remove_prefix(utf8.starts_with(byteOrderMark) ? byteOrderMark.size() : 0);
        feed(utf8, XML_TRUE);
    }

    void feed(std::string_view utf8, XML_Bool isEnd) {
        const XML_Status status =
            XML_Parse(parser_.get(), utf8.data(), static_cast<int>(utf8.size()), isEnd);
        if (failure_) {
            std::rethrow_exception(failure_);
        }
        if (status != XML_STATUS_OK) {
            fail();
        }
    }

    [[noreturn]] void fail() const {
        const XML_Error error = XML_GetErrorCode(parser_.get());
        if (error == XML_ERROR_NO_MEMORY) {
            throw std::bad_alloc();
        }
        throw std::runtime_error(std::string("is not well-formed XML: ") + XML_ErrorString(error) +
                                 " in line " +
                                 std::to_string(XML_GetCurrentLineNumber(parser_.get())));
    }

    // Exceptions must not pass through the parser, which is C: the first is kept, and thrown when
    // the parser has returned. It may call back once more before it does.
    template <class Work>
    static void guarded(void* self, Work work) noexcept {
        auto& reader = *static_cast<ElementReader*>(self);
        if (reader.failure_) {
            return;
        }
        try {
            work(reader);
        } catch (...) {
            reader.failure_ = std::current_exception();
            XML_StopParser(reader.parser_.get(), XML_FALSE);
        }
    }

    static void onStart(void* self, const char* name, const char** attributes) noexcept {
        guarded(self, [&](ElementReader& reader) { reader.start(name, attributes); });
    }

    static void onEnd(void* self, const char*) noexcept {
        guarded(self, [](ElementReader& reader) { --reader.depth_; });
    }

    static void onDeclaration(void* self, const char*, const char* encoding, int) noexcept {
        guarded(self, [&](ElementReader& reader) {
            if (encoding != nullptr) {
                reader.checkEncoding(encoding);
            }
        });
    }

    static void onDocumentType(void* self, const char*, const char*, const char*, int) noexcept {
        guarded(self, [](ElementReader&) {
            throw std::runtime_error("has a document type declaration, which is not allowed");
        });
    }

    void start(std::string_view name, const char* const* attributes) {
        const std::size_t end = name.find(separator);
        const bool hasNamespace = end != std::string_view::npos;
        const std::string_view localName = hasNamespace ? name.substr(end + 1) : name;
        const bool isOurs = hasNamespace && name.substr(0, end) == namespaceUri_;
        if (depth_ == maxDepth) {
            throw std::runtime_error("has elements more than " + std::to_string(maxDepth) +
                                     " levels deep");
        }
        if (depth_ == 0) {
            hasRoot_ = isOurs && localName == root_;
        } else if (depth_ == 1 && hasRoot_ && isOurs) {
            visit_(XmlElement(localName, attributes));
        }
        ++depth_;
    }

    // Some producers write "utf8", which is not a registered name but can mean nothing else.
    void checkEncoding(const std::string& encoding) const {
        const std::string name = text::toLowerAscii(encoding);
        const bool saysUtf16 = name == "utf-16" || name == "utf-16le" || name == "utf-16be";
        const bool saysUtf8 = name == "utf-8" || name == "utf8";
        if (isUtf16_ ? saysUtf16 : saysUtf8) {
            return;
        }
        throw std::runtime_error("declares the encoding " + quoted(encoding) +
                                 (saysUtf16 || saysUtf8
                                      ? ", but its bytes are not in it"
                                      : ", but only UTF-8 and UTF-16 are allowed"));
    }

    std::string_view root_;
    std::string_view namespaceUri_;
    const std::function<void(const XmlElement&)>& visit_;
    std::unique_ptr<XML_ParserStruct, FreeParser> parser_;
    std::exception_ptr failure_;
    bool isUtf16_ = false;
    bool hasRoot_ = false;
    std::size_t depth_ = 0;
};

}  // namespace

std::optional<std::string_view> XmlElement::attribute(std::string_view name) const {
    for (const char* const* at = attributes_; *at != nullptr; at += 2) {
        if (*at == name) {
            return at[1];
        }
    }
    return std::nullopt;
}

std::string_view XmlElement::requiredAttribute(std::string_view name) const {
    if (const auto value = attribute(name)) {
        return *value;
    }
    throw std::runtime_error("has a " + std::string(localName_) + " without " + std::string(name));
}

void forEachElement(std::span<const std::uint8_t> xml, std::string_view root,
                    std::string_view namespaceUri,
                    const std::function<void(const XmlElement&)>& visit) {
    ElementReader(root, namespaceUri, visit).read(xml);
}

std::string xmlStart(std::string_view root, std::string_view namespaceUri) {
    std::string xml = "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n<";
    xml.append(root);
    appendAttribute(xml, "xmlns", namespaceUri);
    return xml.append(">");
}

void appendAttribute(std::string& xml, std::string_view name, std::string_view value) {
    xml.append(" ").append(name).append("=\"");
    appendEscaped(xml, value);
    xml.append("\"");
}

void requireXmlCharacters(std::string_view text) {
    const auto isForbidden = [](char c) {
        return static_cast<unsigned char>(c) < 0x20 && c != '\t' && c != '\n' && c != '\r';
    };
    if (text.find("\xEF\xBF\xBE") != std::string_view::npos ||
        text.find("\xEF\xBF\xBF") != std::string_view::npos ||
        std::any_of(text.begin(), text.end(), isForbidden)) {
        throw std::runtime_error("has a character that XML cannot hold");
    }
}

void appendEscaped(std::string& xml, std::string_view text) {
    requireXmlCharacters(text);
    for (const char c : text) {
        switch (c) {
            case '&':
                xml += "&amp;";
                break;
            case '<':
                xml += "&lt;";
                break;
            case '>':
                xml += "&gt;";
                break;
            case '"':
                xml += "&quot;";
                break;
            case '\t':
                xml += "&#9;";
                break;
            case '\n':
                xml += "&#10;";
                break;
            case '\r':
                xml += "&#13;";
                break;
            default:
                xml += c;
        }
    }
}

}  // namespace platform::package
