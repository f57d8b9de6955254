// Writes a tree of values by walking it with a stack of its own, so that no depth can exhaust the
// thread's.
#include "json/serialize.h"

#include <charconv>
#include <cmath>
#include <iterator>
#include <stack>
#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>

#include "json/byte_scan.h"

namespace json {
namespace {

void writeEscaped(std::string& out, char c) {
    constexpr std::string_view hexadecimal = "0123456789abcdef";
    switch (c) {
        case '"':
            out += "\\\"";
            return;
        case '\\':
            out += "\\\\";
            return;
        case '\b':
            out += "\\b";
            return;
        case '\f':
            out += "\\f";
            return;
        case '\n':
            out += "\\n";
            return;
        case '\r':
            out += "\\r";
            return;
        case '\t':
            out += "\\t";
            return;
        default:
            out += "\\u00";
            out += hexadecimal[static_cast<unsigned char>(c) >> 4];
            out += hexadecimal[static_cast<unsigned char>(c) & 0xF];
    }
}

void write(std::string& out, const std::string& text) {
    out += '"';
    const char* position = text.data();
    const char* const end = position + text.size();
    for (;;) {
        const char* const special = detail::findFirst<detail::NeedsEscape>(position, end);
        out.append(position, special);
        if (special == end)
            break;
        writeEscaped(out, *special);
        position = special + 1;
    }
    out += '"';
}

void write(std::string& out, Undefined) {
    out += "null";
}

void write(std::string& out, Null) {
    out += "null";
}

void write(std::string& out, bool value) {
    out += value ? "true" : "false";
}

template <typename Number>
requires std::is_arithmetic_v<Number>
void write(std::string& out, Number number) {
    if constexpr (std::is_floating_point_v<Number>) {
        if (!std::isfinite(number)) {
            write(out, Null());
            return;
        }
    }
    char text[32];
    const auto result = std::to_chars(std::begin(text), std::end(text), number);
    out.append(text, result.ptr);
}

class TreeWriter {
public:
    std::string write(const Value& root) {
        start(root);
        while (!open.empty())
            std::visit([this](auto& container) { continueContainer(container); }, open.top());
        return std::move(out);
    }

private:
    /// An array or object of which the elements before `next` have been written.
    template <typename Container>
    struct Open {
        const Container* container;
        typename Container::const_iterator next;
    };

    /// Writes a value whole, or the opening of an array or object.
    void start(const Value& value) {
        value.visit([this](const auto& held) { start(held); });
    }

    void start(const Array& array) {
        out += '[';
        open.emplace(Open<Array>{&array, array.begin()});
    }

    void start(const Object& object) {
        out += '{';
        open.emplace(Open<Object>{&object, object.begin()});
    }

    void start(const Object::value_type& member) {
        json::write(out, member.first);
        out += ':';
        start(member.second);
    }

    template <HeldType Leaf>
    void start(const Leaf& leaf) {
        json::write(out, leaf);
    }

    /// Writes the start of the next element, or the closing after the last.
    template <typename Container>
    void continueContainer(Open<Container>& current) {
        if (current.next == current.container->end()) {
            out += std::is_same_v<Container, Array> ? ']' : '}';
            open.pop();
            return;
        }
        if (current.next != current.container->begin())
            out += ',';
        start(*current.next++);
    }

    std::string out;
    std::stack<std::variant<Open<Array>, Open<Object>>> open;
};

}  // namespace

std::string serialize(const Value& value) {
    return TreeWriter().write(value);
}

}  // namespace json
