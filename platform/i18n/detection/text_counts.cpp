// SPDX-License-Identifier: Apache-2.0
// How often units of a text stand next to each other.
#include "platform/i18n/detection/text_counts.h"

#include <algorithm>
#include <cstddef>

namespace platform::i18n::detail {

namespace {

// Counts keys: a hash table with open addressing.
class Tally {
public:
    struct Entry {
        std::uint64_t key;
        std::uint32_t count;
    };

    void add(std::uint64_t key) {
        std::uint32_t& place = placeOf(key);
        if (place != 0) {
            ++entries_[place - 1].count;
            return;
        }
        entries_.push_back({key, 1});
        place = static_cast<std::uint32_t>(entries_.size());
        if (2 * entries_.size() > places_.size()) {
            grow();
        }
    }

    const std::vector<Entry>& entries() const { return entries_; }

    /// Puts the commonest first. Costs are summed up in this order until they are above a limit;
    /// to sort the rest takes longer than it saves.
    void putCommonestFirst() {
        const auto middle = entries_.begin() + static_cast<std::ptrdiff_t>(std::min(
                                                   entries_.size(), TextCounts::commonest));
        std::partial_sort(entries_.begin(), middle, entries_.end(),
                          [](const Entry& a, const Entry& b) {
                              return a.count != b.count ? a.count > b.count : a.key < b.key;
                          });
    }

private:
    // The slot that holds the place of `key`, or the free one for it.
    std::uint32_t& placeOf(std::uint64_t key) {
        std::size_t slot = (key * 0x9E3779B97F4A7C15U >> 32U) & (places_.size() - 1);
        while (places_[slot] != 0 && entries_[places_[slot] - 1].key != key) {
            slot = (slot + 1) & (places_.size() - 1);
        }
        return places_[slot];
    }

    void grow() {
        places_.assign(2 * places_.size(), 0);
        for (std::size_t i = 0; i < entries_.size(); ++i) {
            placeOf(entries_[i].key) = static_cast<std::uint32_t>(i + 1);
        }
    }

    std::vector<Entry> entries_;
    // In `entries_`, from one; zero where there is none. Their number is a power of two.
    std::vector<std::uint32_t> places_ = std::vector<std::uint32_t>(1024);
};

bool isWordUnit(char16_t unit) {
    return unit >= 0x80 || (unit >= u'a' && unit <= u'z') || (unit >= u'A' && unit <= u'Z');
}

Cost costOfAscii(char16_t unit) {
    return isStrayControl(static_cast<char>(unit)) ? strayControlBits : asciiBits;
}

std::uint64_t keyOf(char16_t first, char16_t second, char16_t third = 0) {
    return (std::uint64_t{first} << 32U) | (std::uint64_t{second} << 16U) | third;
}

// The triples of `units` around those from 0x80 on for which `isAskedFor` is true.
template <class IsAskedFor>
std::vector<UnitTriple> triplesOf(std::u16string_view units, IsAskedFor isAskedFor) {
    Tally tally;
    for (std::size_t i = 0; i < units.size(); ++i) {
        if (units[i] >= 0x80) {
            const char16_t before = i == 0 ? u'\0' : units[i - 1];
            const char16_t after = i + 1 == units.size() ? u'\0' : units[i + 1];
            if (isAskedFor(before, units[i], after)) {
                tally.add(keyOf(before, units[i], after));
            }
        }
    }
    std::vector<UnitTriple> triples;
    triples.reserve(tally.entries().size());
    for (const Tally::Entry& entry : tally.entries()) {
        triples.push_back({static_cast<char16_t>(entry.key >> 32U),
                           static_cast<char16_t>(entry.key >> 16U),
                           static_cast<char16_t>(entry.key), entry.count});
    }
    return triples;
}

}  // namespace

TextCounts::TextCounts(std::u16string_view units, Runs runs) {
    Tally tally;
    for (std::size_t begin = 0; begin < units.size();) {
        if (!isWordUnit(units[begin])) {
            asciiCost += costOfAscii(units[begin++]);
            continue;
        }
        std::size_t end = begin;
        char16_t highest = 0;
        for (; end < units.size() && isWordUnit(units[end]); ++end) {
            highest = std::max(highest, units[end]);
        }
        if (highest < 0x80 && runs == Runs::beyondAscii) {
            asciiCost += asciiBits * static_cast<Cost>(end - begin);
        } else {
            char16_t before = 0;
            for (std::size_t i = begin; i < end; ++i) {
                tally.add(keyOf(before, units[i]));
                before = units[i];
            }
            tally.add(keyOf(before, 0));
        }
        begin = end;
    }
    tally.putCommonestFirst();
    pairs.reserve(tally.entries().size());
    for (const Tally::Entry& entry : tally.entries()) {
        pairs.push_back({static_cast<char16_t>(entry.key >> 32U),
                         static_cast<char16_t>(entry.key >> 16U), entry.count});
    }
}

void TextCounts::countTriplesOfBytes(std::u16string_view units) {
    triples = triplesOf(units, [](char16_t, char16_t, char16_t) { return true; });
}

void TextCounts::countTriplesOfCharacters(std::u16string_view units) {
    const CharacterTraits* const traits = allTraits();
    triples = triplesOf(units, [traits](char16_t before, char16_t current, char16_t after) {
        return !traits[current].isLetter ||
               (!isLetterBeyondAscii(traits, before) && !isLetterBeyondAscii(traits, after));
    });
}

}  // namespace platform::i18n::detail
