// SPDX-License-Identifier: Apache-2.0
// Writes a tree of values by walking it with a stack of its own, so that no depth can exhaust the
// thread's. The memory for the text is allocated once, by an estimate of its length.
#include "json/serialize.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <iterator>
#include <limits>
#include <stack>
#include <string_view>
#include <type_traits>
#include <variant>
#include <vector>

#include "json/string_kernels.h"
#include "json/text_memory.h"

namespace json {
namespace {

// ---- Walking the tree ----

/// Passes the parts of a tree to `Visitor` in the order of the text: `open`, `close`, `comma`,
/// `key`, and `leaf` with the content of each value that is not a container; until it is `done`.
template <typename Visitor>
class TreeWalk {
public:
    explicit TreeWalk(Visitor& target) : visitor(target) {}

    void walk(const Value& root) {
        start(root);
        while (!open.empty() && !visitor.done())
            std::visit([this](auto& container) { this->goOn(container); }, open.top());
    }

private:
    /// An array or object of which the elements before `next` have been visited.
    template <typename Container>
    struct Open {
        const Container* container;
        typename Container::const_iterator next;
    };

    template <typename Container>
    static constexpr bool isArray = std::is_same_v<Container, Array>;

    /// Visits a value whole, or the opening of an array or object.
    void start(const Value& value) {
        value.visit([this](const auto& held) {
            using Held = std::remove_cvref_t<decltype(held)>;
            if constexpr (isArray<Held> || std::is_same_v<Held, Object>) {
                visitor.open(isArray<Held> ? '[' : '{');
                open.emplace(Open<Held>{&held, held.begin()});
            } else {
                visitor.leaf(held);
            }
        });
    }

    void start(const Object::value_type& member) {
        visitor.key(member.first);
        start(member.second);
    }

    /// Visits elements up to the first that is itself left open, or the closing after the last.
    template <typename Container>
    void goOn(Open<Container>& current) {
        const std::size_t depth = open.size();
        while (current.next != current.container->end()) {
            if (current.next != current.container->begin())
                visitor.comma();
            start(*current.next++);
            if (open.size() != depth || visitor.done())
                return;
        }
        visitor.close(isArray<Container> ? ']' : '}');
        open.pop();
    }

    Visitor& visitor;
    using AnyOpen = std::variant<Open<Array>, Open<Object>>;
    std::stack<AnyOpen, std::vector<AnyOpen>> open;  // from the outermost to the innermost
};

// ---- Estimating the length ----

/// The number of bytes that need an escape; of a long text about that, by samples of it.
std::size_t estimateEscapes(const std::string& text) {
    constexpr std::size_t samples = 4;
    constexpr std::size_t sampleSize = 1024;
    const auto count = [&text](std::size_t at, std::size_t size) {
        return detail::stringKernels().countEscapes(text.data() + at, text.data() + at + size);
    };
    if (text.size() <= samples * sampleSize)
        return count(0, text.size());
    std::size_t escapes = 0;
    for (std::size_t i = 0; i < samples; ++i)
        escapes += count((text.size() - sampleSize) / (samples - 1) * i, sampleSize);
    constexpr std::size_t margin = 32;
    return text.size() / (samples * sampleSize) * escapes + text.size() / margin;
}

/// Estimates the length of the text of a tree. Gives up on a tree of many small values: visiting it
/// twice takes longer than enlarging the memory now and then.
class Estimate {
public:
    bool done() const {
        constexpr std::size_t few = 256;
        constexpr std::size_t smallValue = 64;
        return values > few && length < values * smallValue;
    }

    void open(char) { ++length; }
    void close(char) { ++length; }
    void comma() { ++length; }

    void key(const std::string& name) {
        leaf(name);
        ++length;
    }

    void leaf(const std::string& text) { add(text.size() + estimateEscapes(text) + 2); }

    template <typename Leaf>
    void leaf(const Leaf&) {
        constexpr std::size_t usualNumber = 12;
        add(usualNumber);
    }

    // Not zero, since each write needs room for the longest text that it could produce.
    std::size_t length = 64;

private:
    void add(std::size_t count) {
        length += count;
        ++values;
    }

    std::size_t values = 0;
};

// ---- Writing ----

/// Writes the text of a tree, until it turns out longer than allowed.
class Writer {
public:
    /// `resize` makes the memory for the text; it is enlarged where `estimate` turns out too low.
    Writer(const TextMemory& resize, std::size_t estimate, std::size_t limit)
        : resizeText(resize), maxLength(limit) {
        enlarge(0, estimate);
    }

    bool done() const { return tooLong; }

    void open(char c) { put(c); }
    void close(char c) { put(c); }
    void comma() { put(','); }

    void key(const std::string& name) {
        leaf(name);
        put(':');
    }

    void leaf(Undefined) { put("null"); }
    void leaf(Null) { put("null"); }
    void leaf(bool value) { put(value ? "true" : "false"); }

    void leaf(const std::string& string) {
        put('"');
        const char* in = string.data();
        const char* const last = in + string.size();
        if (end - position < std::ssize(string) &&
            !enlarge(string.size(), string.size() + estimateEscapes(string)))
            return;
        for (;;) {
            const auto copied = kernels.escape(in, last, position, end);
            in = copied.in;
            position = copied.out;
            if (in == last)
                return put('"');
            if (!require(detail::maxEscapeLength))
                return;
        }
    }

    template <typename Number>
    requires std::is_arithmetic_v<Number>
    void leaf(Number number) {
        if constexpr (std::is_floating_point_v<Number>) {
            if (!std::isfinite(number))
                return leaf(Null());
        }
        if (require(longestNumber))
            position = std::to_chars(position, end, number).ptr;
    }

    /// Gives up the memory that is not used. Returns false when the text is too long.
    bool finish() {
        if (tooLong || length() > maxLength)
            return false;
        resizeText(length());
        return true;
    }

private:
    std::size_t length() const { return static_cast<std::size_t>(position - begin); }

    void put(char c) {
        if (require(1))
            *position++ = c;
    }

    void put(std::string_view literal) {
        if (require(std::ssize(literal)))
            position = std::copy(literal.begin(), literal.end(), position);
    }

    /// Makes room for `count` more bytes. Returns false when the text is too long already.
    bool require(std::ptrdiff_t count) {
        return end - position >= count || enlarge(0, static_cast<std::size_t>(count));
    }

    /// Makes room for `wanted` more bytes, or for as many as are allowed. `certain`: how many bytes
    /// will be written at least; returns false when the text is too long with them.
    bool enlarge(std::size_t certain, std::size_t wanted) {
        const std::size_t used = length();
        if (used > maxLength || certain > maxLength - used) {
            tooLong = true;
            return false;
        }
        // A little more than allowed, since each write needs room for the longest text that it
        // could produce.
        constexpr std::size_t margin = 2 * longestNumber;
        const std::size_t size = std::min(used + std::max(wanted, used / 2), maxLength + margin);
        begin = resizeText(size);
        position = begin + used;
        end = begin + size;
        return true;
    }

    static constexpr std::ptrdiff_t longestNumber = 32;

    const detail::StringKernels& kernels = detail::stringKernels();
    const TextMemory& resizeText;
    const std::size_t maxLength;
    bool tooLong = false;
    char* begin = nullptr;  // of the memory
    char* position = nullptr;
    char* end = nullptr;
};

char* resize(std::string& text, std::size_t size) {
    detail::overwrite(text, size, [size](char*) { return size; });
    return text.data();
}

}  // namespace

bool serialize(const Value& value, std::size_t maxLength, const TextMemory& resize) {
    constexpr std::size_t longest = std::numeric_limits<std::ptrdiff_t>::max() / 2;
    Estimate estimate;
    TreeWalk(estimate).walk(value);
    Writer writer(resize, estimate.length, std::min(maxLength, longest));
    TreeWalk(writer).walk(value);
    return writer.finish();
}

std::string serialize(const Value& value) {
    std::string text;
    const auto resizeText = [&text](std::size_t size) { return resize(text, size); };
    serialize(value, std::numeric_limits<std::size_t>::max(), resizeText);
    return text;
}

}  // namespace json
