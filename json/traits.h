// SPDX-License-Identifier: Apache-2.0
// The kinds of a JSON value: the types that a Value can hold, their order and their names.
#pragma once

#include <map>
#include <string>
#include <type_traits>
#include <variant>
#include <vector>

namespace json {

class Value;

/// Marks a value that was never set; what a default-constructed Value and a missing key hold.
struct Undefined {
    friend constexpr bool operator==(Undefined, Undefined) noexcept { return true; }
};

/// JSON `null`.
struct Null {
    friend constexpr bool operator==(Null, Null) noexcept { return true; }
};

using Array = std::vector<Value>;
using Object = std::map<std::string, Value>;

// The 64-bit integer kinds are `long` and `unsigned long`.
static_assert(sizeof(long) == 8);

/// The ten held types. A kind's index is its place in this list; the order is fixed.
using Storage = std::variant<Undefined, Null, bool, double, std::string, Array, Object, float, long,
                             unsigned long>;

/// `traits<T>::name` is the name of the kind that holds a T, as messages to users show it.
template <typename T>
struct traits;

template <>
struct traits<Undefined> {
    static constexpr char const* name = "undefined";
};
template <>
struct traits<Null> {
    static constexpr char const* name = "null";
};
template <>
struct traits<bool> {
    static constexpr char const* name = "boolean";
};
template <>
struct traits<double> {
    static constexpr char const* name = "double";
};
template <>
struct traits<std::string> {
    static constexpr char const* name = "string";
};
template <>
struct traits<Array> {
    static constexpr char const* name = "array";
};
template <>
struct traits<Object> {
    static constexpr char const* name = "object";
};
template <>
struct traits<float> {
    static constexpr char const* name = "float";
};
template <>
struct traits<long> {
    static constexpr char const* name = "int64";
};
template <>
struct traits<unsigned long> {
    static constexpr char const* name = "uint64";
};

namespace detail {

template <typename T, typename Variant>
struct IsAlternative;

template <typename T, typename... Held>
struct IsAlternative<T, std::variant<Held...>> {
    static constexpr bool value = (std::is_same_v<T, Held> || ...);
};

}  // namespace detail

/// Exactly one of the ten held types; types that would only convert to one do not count.
template <typename T>
concept HeldType = detail::IsAlternative<T, Storage>::value;

}  // namespace json
