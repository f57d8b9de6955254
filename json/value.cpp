// SPDX-License-Identifier: Apache-2.0
// Copying, comparing and destroying trees of values without recursing into them as deep as they
// are.
#include "json/value.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <iterator>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace json {
namespace {

static_assert(std::is_nothrow_move_constructible_v<Storage> &&
              std::is_nothrow_move_assignable_v<Storage>);

template <typename... Held>
constexpr auto namesOf(std::type_identity<std::variant<Held...>>) {
    return std::array{traits<Held>::name...};
}

constexpr auto kindNames = namesOf(std::type_identity<Storage>());

// ---- Copying ----

struct CopyTask {
    const Value* source;
    Value* target;
};

/// Makes `target` an array of copies. Elements that hold others are left undefined and added to
/// `tasks`.
void copyElements(const Array& source, Array& target, std::vector<CopyTask>& tasks) {
    target.reserve(source.size());
    for (const Value& element : source) {
        if (element.holdsElements())
            tasks.push_back({&element, &target.emplace_back()});
        else
            target.push_back(element);
    }
}

void copyElements(const Object& source, Object& target, std::vector<CopyTask>& tasks) {
    for (const auto& [key, element] : source) {
        if (element.holdsElements())
            tasks.push_back({&element, &target.emplace_hint(target.end(), key, Value())->second});
        else
            target.emplace_hint(target.end(), key, element);
    }
}

void copyTree(const Value& source, Value& target) {
    std::vector<CopyTask> tasks;
    CopyTask task{&source, &target};
    for (;;) {
        if (task.source->is<Array>())
            copyElements(task.source->get<Array>(), task.target->emplace<Array>(), tasks);
        else
            copyElements(task.source->get<Object>(), task.target->emplace<Object>(), tasks);
        if (tasks.empty())
            return;
        task = tasks.back();
        tasks.pop_back();
    }
}

// ---- Assigning ----

struct ArrayAssignment {
    Array* target;
    Array* source;  // whose elements are taken

    bool isInPlace() const { return source->size() <= target->capacity(); }
    std::size_t common() const { return std::min(source->size(), target->size()); }

    /// Whether the elements at `index` are both arrays, to be assigned in the same way.
    bool hasNested(std::size_t index) const {
        return (*target)[index].is<Array>() && (*source)[index].is<Array>();
    }

    /// Assigns what is not a nested assignment of its own.
    void carryOut() const noexcept {
        if (!isInPlace()) {
            *target = std::move(*source);
            return;
        }
        const std::size_t staying = common();
        for (std::size_t i = 0; i < staying; ++i) {
            if (!hasNested(i))
                (*target)[i] = std::move((*source)[i]);
        }
        const auto end = static_cast<std::ptrdiff_t>(staying);
        target->erase(target->begin() + end, target->end());
        std::move(source->begin() + end, source->end(), std::back_inserter(*target));
    }
};

void assignElements(Array& target, Array& source) {
    // All allocations come first, so that nothing has changed yet when one fails.
    std::vector<ArrayAssignment> assignments{{&target, &source}};
    for (std::size_t done = 0; done < assignments.size(); ++done) {
        const ArrayAssignment outer = assignments[done];
        for (std::size_t i = 0; outer.isInPlace() && i < outer.common(); ++i) {
            if (outer.hasNested(i))
                assignments.push_back(
                    {&(*outer.target)[i].get<Array>(), &(*outer.source)[i].get<Array>()});
        }
    }
    for (const ArrayAssignment& assignment : assignments)
        assignment.carryOut();
}

// ---- Destroying ----

/// Levels of nesting that are destroyed by plain recursion, which is the quickest way for usual
/// trees.
constexpr int recursiveLevels = 32;

/// How many destructors of values that hold others run on this thread, each within the one before.
/// It is in the thread's initial memory: glibc would otherwise allocate it when a thread first
/// comes here, and end the process on failure.
[[gnu::tls_model("initial-exec")]] thread_local int runningDestructors = 0;

Value& first(Value& container) {
    return container.is<Array>() ? container.get<Array>().front()
                                 : container.get<Object>().begin()->second;
}

Value& last(Value& container) {
    return container.is<Array>() ? container.get<Array>().back()
                                 : container.get<Object>().rbegin()->second;
}

void removeLast(Value& container) {
    if (container.is<Array>())
        container.get<Array>().pop_back();
    else
        container.get<Object>().erase(std::prev(container.get<Object>().end()));
}

bool hasOneElement(const Value& container) {
    return container.is<Array>() ? container.get<Array>().size() == 1
                                 : container.get<Object>().size() == 1;
}

/// Destroys the contents of a tree of any depth. A destructor may neither recurse that deep nor
/// allocate a stack of its own, so the way back up is kept in the tree itself: going down from
/// `current` to its last element, that element takes in `current` as its own first one, and what
/// was first there moves up to the place that became free.
///
///     current: [a, [b, c]]   becomes   current: [[a, b], c]
///
/// From there c is destroyed, then [a, b] is the only element and becomes `current` again. Each
/// container is entered once, so the time is linear.
void unwind(Value& root) noexcept {
    Value current(std::move(root));
    while (current.holdsElements()) {
        Value& deepest = last(current);
        if (!deepest.holdsElements()) {
            removeLast(current);
            continue;
        }
        Value next(std::move(deepest));
        if (!hasOneElement(current)) {
            deepest = std::move(first(next));
            first(next) = std::move(current);
        }
        current = std::move(next);
    }
}

// ---- Comparing ----

using Comparison = std::pair<const Value*, const Value*>;

/// Compares two arrays except for elements that hold others on both sides, which are added to
/// `tasks`.
bool equalBut(const Array& left, const Array& right, std::vector<Comparison>& tasks) {
    if (left.size() != right.size())
        return false;
    for (std::size_t i = 0; i < left.size(); ++i) {
        if (left[i].holdsElements() && right[i].holdsElements())
            tasks.emplace_back(&left[i], &right[i]);
        else if (!(left[i] == right[i]))
            return false;
    }
    return true;
}

bool equalBut(const Object& left, const Object& right, std::vector<Comparison>& tasks) {
    if (left.size() != right.size())
        return false;
    for (auto l = left.begin(), r = right.begin(); l != left.end(); ++l, ++r) {
        if (l->first != r->first)
            return false;
        if (l->second.holdsElements() && r->second.holdsElements())
            tasks.emplace_back(&l->second, &r->second);
        else if (!(l->second == r->second))
            return false;
    }
    return true;
}

}  // namespace

Value::Value(const Value& other) : storage(other.holdsElements() ? Storage() : other.storage) {
    if (other.holdsElements())
        copyTree(other, *this);
}

Value& Value::operator=(const Value& other) {
    Value copy(other);
    if (is<Array>() && copy.is<Array>())
        assignElements(get<Array>(), copy.get<Array>());
    else
        *this = std::move(copy);
    return *this;
}

void Value::releaseElements() noexcept {
    if (runningDestructors == recursiveLevels) {
        unwind(*this);
        return;
    }
    ++runningDestructors;
    storage.emplace<Undefined>();
    --runningDestructors;
}

void Value::throwInvalidConversion(char const* target) const {
    throw std::runtime_error(std::string("invalid conversion: ") + kindNames[index()] + " to " +
                             target);
}

bool operator==(const Value& left, const Value& right) {
    if (left.index() != right.index())
        return false;
    if (!left.holdsElements() || !right.holdsElements())
        return left.storage == right.storage;
    std::vector<Comparison> tasks{{&left, &right}};
    while (!tasks.empty()) {
        const Value& l = *tasks.back().first;
        const Value& r = *tasks.back().second;
        tasks.pop_back();
        if (l.index() != r.index())
            return false;
        const bool equal = l.is<Array>() ? equalBut(l.get<Array>(), r.get<Array>(), tasks)
                                         : equalBut(l.get<Object>(), r.get<Object>(), tasks);
        if (!equal)
            return false;
    }
    return true;
}

}  // namespace json
