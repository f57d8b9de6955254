// SPDX-License-Identifier: Apache-2.0
#include "platform/package/quillet_file_reader.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <stdexcept>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/about.h"
#include "platform/package/content_types.h"
#include "platform/package/package_xml.h"
#include "platform/package/part_name.h"
#include "platform/package/relationships.h"
#include "platform/package/zip/archive.h"
#include "platform/package/zip/limits.h"

namespace platform::package {
namespace {

using Part = QuilletFilePackage::Part;
using Relationship = QuilletFilePackage::Relationship;

// An entry that is all of a part, or one piece of it.
struct Fragment {
    std::uint64_t number;
    bool isLast;
    const zip::Archive::Entry* entry;
};

// What the archive holds under one part name.
struct Item {
    std::string name;
    std::vector<Fragment> fragments;
};

// Entry names have no slash before them, but some producers write one, or backslashes for slashes.
std::string partNameOf(const zip::Archive::Entry& entry) {
    std::string name = entry.name;
    std::replace(name.begin(), name.end(), '\\', '/');
    return name.starts_with('/') ? name : "/" + name;
}

// The fragments of `item` in their order. Throws when it has one twice or lacks one.
std::vector<Fragment> orderedFragments(const Item& item) {
    std::vector<Fragment> fragments = item.fragments;
    std::sort(fragments.begin(), fragments.end(),
              [](const Fragment& a, const Fragment& b) { return a.number < b.number; });
    const auto sameNumber = [](const Fragment& a, const Fragment& b) {
        return a.number == b.number;
    };
    if (std::adjacent_find(fragments.begin(), fragments.end(), sameNumber) != fragments.end()) {
        throw std::runtime_error("has two entries named " + quoted(item.name));
    }
    for (std::size_t i = 0; i < fragments.size(); ++i) {
        if (fragments[i].number != i || fragments[i].isLast != (i + 1 == fragments.size())) {
            throw std::runtime_error("lacks pieces of the interleaved part " + quoted(item.name));
        }
    }
    return fragments;
}

// The archive as the Open Packaging Conventions see it.
class PackageFile {
public:
    explicit PackageFile(const std::string& path) : archive_(path) {
        for (const zip::Archive::Entry& entry : archive_.entries()) {
            const std::string name = partNameOf(entry);
            if (!name.ends_with('/') && !isTrash(name)) {
                add(name, entry);
            }
        }
    }

    QuilletFilePackage read() {
        const Item* typesItem = find(contentTypesName);
        if (typesItem == nullptr) {
            throw std::runtime_error("is not a document package: it has no [Content_Types].xml");
        }
        const ContentTypes types = about("has a broken [Content_Types].xml, which", [&] {
            return ContentTypes::parse(contentOf(*typesItem, maxPackageXmlBytes));
        });
        std::vector<Part> parts;
        for (const Item& item : items_) {
            const std::string* mediaType = types.find(item.name);
            if (mediaType != nullptr && &item != typesItem && !relationshipsSource(item.name)) {
                parts.push_back(readPart(item, *mediaType));
            }
        }
        std::vector<Relationship> relationships = readRelationships(packageRoot);
        return {parts, relationships};
    }

private:
    void add(const std::string& name, const zip::Archive::Entry& entry) {
        const Piece fragment = pieceNamed(name).value_or(Piece{name, 0, true});
        const auto [place, isNew] =
            byKey_.try_emplace(partNameKey(fragment.partName), items_.size());
        if (isNew) {
            items_.push_back({std::string(fragment.partName), {}});
        }
        items_[place->second].fragments.push_back({fragment.number, fragment.isLast, &entry});
    }

    const Item* find(std::string_view name) const {
        const auto found = byKey_.find(partNameKey(name));
        return found == byKey_.end() ? nullptr : &items_[found->second];
    }

    std::vector<std::uint8_t> contentOf(const Item& item, std::uint64_t maxSize) {
        const std::vector<Fragment> fragments = orderedFragments(item);
        std::uint64_t size = 0;
        for (const Fragment& fragment : fragments) {
            size += fragment.entry->size;
        }
        if (size > maxSize) {
            throw std::runtime_error("is too large: " + std::to_string(size) + " bytes, at most " +
                                     std::to_string(maxSize) + " are accepted");
        }
        std::vector<std::uint8_t> content(size);
        std::span<std::uint8_t> rest = content;
        for (const Fragment& fragment : fragments) {
            archive_.read(*fragment.entry, rest.first(fragment.entry->size));
            rest = rest.subspan(fragment.entry->size);
        }
        return content;
    }

    Part readPart(const Item& item, const std::string& mediaType) {
        return about("has a broken part: " + quoted(item.name), [&] {
            if (const std::string_view problem = partNameProblem(item.name); !problem.empty()) {
                throw std::runtime_error("is not a valid part name: " + std::string(problem));
            }
            Part part;
            part.content = contentOf(item, zip::maxEntryBytes);
            part.contentType = i18n::to_ustring(mediaType);
            part.partUri = i18n::to_ustring(item.name);
            part.relationships = readRelationships(item.name);
            return part;
        });
    }

    // The relationships of `source`; none if it has no relationships part.
    std::vector<Relationship> readRelationships(std::string_view source) {
        const Item* item = find(relationshipsPartName(source));
        if (item == nullptr) {
            return {};
        }
        return about("has a broken relationships part: " + quoted(item->name),
                     [&] { return parseRelationships(contentOf(*item, maxPackageXmlBytes)); });
    }

    zip::Archive archive_;
    std::vector<Item> items_;  // in the archive's order
    std::unordered_map<std::string, std::size_t> byKey_;
};

}  // namespace

QuilletFileReader::QuilletFileReader(std::u16string path) : path_(std::move(path)) {}

QuilletFilePackage QuilletFileReader::read() {
    const std::string path = filesystem::make_native_access_form_with_cleanup(path_);
    return about(quoted(path), [&] { return PackageFile(path).read(); });
}

}  // namespace platform::package
