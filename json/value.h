// SPDX-License-Identifier: Apache-2.0
// The one in-memory JSON value: requests are parsed into it, documents and responses are built from
// it.
#pragma once

#include <cstddef>
#include <string>
#include <type_traits>
#include <utility>
#include <variant>

#include "json/traits.h"

namespace json {

/// A JSON value: a tagged union of ten kinds that owns its contents outright. Copying copies the
/// whole tree; nothing is shared.
///
/// Nesting may be of any depth: no operation uses stack in proportion to it, and each takes time
/// linear in the size of the tree. This holds as well for an Array or Object on its own.
///
/// Arrays and objects are used through the containers that hold them:
///
///     json::Object result;
///     result["status"] = true;
///     result["parts"] = json::Array();
///     result["parts"].get<json::Array>().push_back("text");
///     std::string text = json::serialize(std::move(result));
class Value {
public:
    /// Makes an `Undefined` value.
    Value() noexcept = default;

    /// Makes a value of the kind that holds a T. Only the ten held types themselves are accepted:
    /// an `int` has no kind (write `long(n)`, `double(n)`), and no pointer becomes a boolean.
    template <typename T>
    requires HeldType<std::remove_cvref_t<T>>
    // NOLINTNEXTLINE(google-explicit-constructor,bugprone-forwarding-reference-overload)
    Value(T&& held)
    noexcept(std::is_nothrow_constructible_v<std::remove_cvref_t<T>, T&&>)
        : storage(std::in_place_type<std::remove_cvref_t<T>>, std::forward<T>(held)) {}

    /// Makes a string of the bytes up to the NUL, as they stand.
    // NOLINTNEXTLINE(google-explicit-constructor)
    Value(char const* text) : storage(std::in_place_type<std::string>, text) {}

    // NOLINTNEXTLINE(google-explicit-constructor)
    Value(std::nullptr_t) = delete;

    /// Copies the tree. When memory runs out the partial copy is destroyed and std::bad_alloc
    /// thrown.
    Value(const Value& other);

    /// Takes over the contents. `other` keeps its kind; an array or object in it is left empty.
    Value(Value&& other) noexcept = default;

    /// Assigns a copy. `other` may be part of this value's own tree. An array is assigned to an
    /// array as std::vector does it, element by element: references to the elements that stay are
    /// kept, unless there is no room for those that are new. On std::bad_alloc this value is as it
    /// was.
    Value& operator=(const Value& other);

    /// Assigns the contents of `other`, which may be part of this value's own tree.
    Value& operator=(Value&& other) noexcept {
        Value taken(std::move(other));
        storage = std::move(taken.storage);
        return *this;
    }

    ~Value() {
        if (holdsElements())
            releaseElements();
    }

    /// The index of the kind, 0 to 9, in the order of `Storage`.
    std::size_t index() const noexcept { return storage.index(); }

    /// Whether the value's kind is the one that holds a T.
    template <HeldType T>
    bool is() const noexcept {
        return std::holds_alternative<T>(storage);
    }

    /// Whether the value is an array or object that is not empty: only these have others within
    /// them.
    bool holdsElements() const noexcept {
        if (const Array* array = std::get_if<Array>(&storage))
            return !array->empty();
        if (const Object* object = std::get_if<Object>(&storage))
            return !object->empty();
        return false;
    }

    /// The held T. There is no conversion between kinds: unless the value's kind is the one that
    /// holds a T, throws std::runtime_error "invalid conversion: <kind> to <kind of T>".
    template <HeldType T>
    T& get() {
        if (T* held = std::get_if<T>(&storage))
            return *held;
        throwInvalidConversion(traits<T>::name);
    }

    template <HeldType T>
    const T& get() const {
        if (const T* held = std::get_if<T>(&storage))
            return *held;
        throwInvalidConversion(traits<T>::name);
    }

    /// Calls `visitor` with the held object, and returns what it returns.
    template <typename Visitor>
    decltype(auto) visit(Visitor&& visitor) const {
        return std::visit(std::forward<Visitor>(visitor), storage);
    }

    /// Replaces the contents by a default-made T, and returns it.
    template <HeldType T>
    T& emplace() noexcept {
        return storage.emplace<T>();
    }

    /// Whether kinds and contents are the same. Different kinds are never equal, even when both are
    /// numbers; numbers of one kind compare as C++ does (so NaN differs from itself).
    friend bool operator==(const Value& left, const Value& right);

private:
    void releaseElements() noexcept;
    [[noreturn]] void throwInvalidConversion(char const* target) const;

    Storage storage;
};

bool operator==(const Value& left, const Value& right);

}  // namespace json
