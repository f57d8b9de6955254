// SPDX-License-Identifier: Apache-2.0
// Random values and random JSON-like texts, the same on every run for the same seed.
#pragma once

#include <bit>
#include <cmath>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "json/value.h"

namespace json {

class RandomJson {
public:
    explicit RandomJson(unsigned seed) : engine(seed) {}

    /// A number from 0 to `limit` - 1.
    std::size_t below(std::size_t limit) {
        return static_cast<std::size_t>(engine() % static_cast<std::uint64_t>(limit));
    }

    bool oneIn(std::size_t times) { return below(times) == 0; }

    /// Any bytes, of which one in four is a character that JSON text treats specially.
    std::string bytes(std::size_t longest) {
        static const std::string special("\"\\/\b\f\n\r\t\0u{}[]", 15);
        std::string result(below(longest + 1), '\0');
        for (char& c : result)
            c = oneIn(4) ? special[below(special.size())] : static_cast<char>(below(256));
        return result;
    }

    /// Any finite double, also small whole numbers.
    double finite() {
        if (oneIn(2))
            return static_cast<double>(below(2000)) - 1000;
        const double number = std::bit_cast<double>(engine());
        return std::isfinite(number) ? number : 0.5;
    }

    /// A tree of the kinds that the parser produces without types, about `depth` levels deep.
    Value tree(int depth) {
        if (depth <= 0 || oneIn(30))
            return scalar();
        // One element goes deep; the others stay small, so that the whole does too.
        const std::size_t size = depth > 1 ? 1 + below(4) : below(4);
        const std::size_t deep = size > 0 ? below(size) : 0;
        const auto element = [&](std::size_t i) { return tree(i == deep ? depth - 1 : depth / 5); };
        if (oneIn(2)) {
            Array array;
            for (std::size_t i = 0; i < size; ++i)
                array.push_back(element(i));
            return array;
        }
        Object object;
        for (std::size_t i = 0; i < size; ++i)
            object[bytes(8)] = element(i);
        return object;
    }

    /// Text that is often, but by far not always, well-formed: typed data in every order, repeated
    /// keys, comments, odd numbers and escapes.
    std::string text(int depth) { return mutated(oneIn(3) ? value(depth) : object(depth)); }

private:
    Value scalar() {
        switch (below(4)) {
            case 0:
                return Null();
            case 1:
                return oneIn(2);
            case 2:
                return finite();
            default:
                return bytes(20);
        }
    }

    std::string pick(const std::vector<std::string>& choices) {
        return choices[below(choices.size())];
    }

    std::string space() {
        if (!oneIn(4))
            return "";
        return oneIn(6) ? pick({"/* c */", "// c\n", "/**/"}) : pick({" ", "\n", "\t\r", "\v\f"});
    }

    std::string number() {
        if (oneIn(15))
            return pick({"01", "-", "1.", "1e", "1e+", "-x", "+1"});
        return pick({"0", "-0", "1", "12", "-3", "300", "0.5", "1e5", "-1.25E-3", "1E+2", "1e999",
                     "1e-999", "99999999999999999999", "-99999999999999999999",
                     "18446744073709551615", "-9223372036854775808"});
    }

    std::string string() {
        if (oneIn(10))
            return pick({R"("\ud83d")", R"("\ud83dx12345")", R"("\x")", R"("\u12g4")"});
        return pick({R"("")", R"("a")", R"("\n\t\"\\\/")", R"("\u0041")", R"("\ud83d\ude00")",
                     R"("\ud83d\u0041")", R"("\ude00")", "\"\x01\xFF\"",
                     R"("long enough for whole words\n and more")"});
    }

    std::string integers() {
        std::string result = "[" + space();
        for (std::size_t i = 0, count = below(4); i < count; ++i)
            result += (i > 0 ? "," + space() : "") + number() + space();
        return result + "]";
    }

    std::string member(int depth) {
        switch (below(5)) {
            case 0:
                return R"("kqtype")" + space() + ":" + space() +
                       pick({R"("int64")", R"("int32")", R"("int16")", R"("int8")", R"("uint64")",
                             R"("uint32")", R"("uint16")", R"("uint8")", R"("double")", "1",
                             R"(["int8"])"});
            case 1:
            case 2:
                return R"("kqdata")" + space() + ":" + space() +
                       (oneIn(4) ? value(depth - 1) : integers());
            default:
                return pick({R"("a")", R"("b")", R"("")", R"("\u0061")", R"("c d")"}) + space() +
                       ":" + space() + value(depth - 1);
        }
    }

    std::string object(int depth) {
        std::string result = "{" + space();
        for (std::size_t i = 0, count = below(6); i < count; ++i)
            result += (i > 0 ? "," + space() : "") + member(depth) + space();
        return result + "}";
    }

    std::string array(int depth) {
        std::string result = "[" + space();
        for (std::size_t i = 0, count = below(4); i < count; ++i)
            result += (i > 0 ? "," + space() : "") + value(depth - 1) + space();
        return result + "]";
    }

    std::string value(int depth) {
        switch (depth > 0 ? below(7) : below(4)) {
            case 0:
                return string();
            case 1:
            case 2:
                return number();
            case 3:
                return oneIn(10) ? pick({"tru", "nulll"}) : pick({"true", "false", "null"});
            case 4:
                return array(depth);
            default:
                return object(depth);
        }
    }

    std::string mutated(std::string text) {
        static const std::string alphabet = "{}[]\",:\\u/*0159.-+eEtfn \n\xFF";
        for (std::size_t changes = below(3); changes > 0 && !text.empty(); --changes) {
            const std::size_t place = below(text.size());
            switch (below(4)) {
                case 0:
                    text.erase(place, 1 + below(3));
                    break;
                case 1:
                    text.insert(place, 1, alphabet[below(alphabet.size())]);
                    break;
                case 2:
                    text[place] = alphabet[below(alphabet.size())];
                    break;
                default:
                    text.resize(place);
            }
        }
        return text;
    }

    std::mt19937_64 engine;
};

}  // namespace json
