// SPDX-License-Identifier: Apache-2.0
#include "platform/package/quillet_file_reader.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
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

// An entry that is a whole part, or one piece of it.
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

}  // namespace

// The archive seen as a package.
class QuilletFileReader::PackageFile {
public:
    explicit PackageFile(const std::string& path) : archive_(path) {
        for (const zip::Archive::Entry& entry : archive_.entries()) {
            const std::string name = partNameOf(entry);
            if (!name.ends_with('/') && !isTrash(name)) {
                add(name, entry);
            }
        }
        const Item& typesItem = readTypes();
        relationships_ = find(relationshipsPartName(packageRoot));
        for (const Item& item : items_) {
            const std::string* mediaType = types_.find(item.name);
            if (&item == &typesItem || relationshipsSource(item.name)) {
                continue;
            }
            if (mediaType == nullptr) {
                untyped_.insert(partNameKey(item.name));
            } else {
                parts_.push_back({item, *mediaType, find(relationshipsPartName(item.name))});
            }
        }
        requireWithinLimits();
    }

    const PackageSize& size() const noexcept { return size_; }

    QuilletFilePackage read() {
        std::vector<Part> parts;
        parts.reserve(parts_.size());
        for (const TypedItem& part : parts_) {
            parts.push_back(readPart(part));
        }
        std::vector<Relationship> relationships = readRelationships(relationships_, packageRoot);
        return {parts, relationships};
    }

private:
    // An item that is a part, and the one that holds its relationships; null if it has none.
    struct TypedItem {
        const Item& item;
        const std::string& mediaType;
        const Item* relationships;
    };

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

    // Fills in types_, and returns where they stood.
    const Item& readTypes() {
        const Item* item = find(contentTypesName);
        if (item == nullptr) {
            throw std::runtime_error("is not a document package: it has no [Content_Types].xml");
        }
        archive_.requireWithinLimits(entriesOf({item}));
        types_ = about("has a broken [Content_Types].xml, which",
                       [&] { return ContentTypes::parse(contentOf(*item, maxPackageXmlBytes)); });
        return *item;
    }

    // A null item has none.
    static std::vector<const zip::Archive::Entry*> entriesOf(
        std::initializer_list<const Item*> items) {
        std::vector<const zip::Archive::Entry*> entries;
        for (const Item* item : items) {
            if (item != nullptr) {
                for (const Fragment& fragment : item->fragments) {
                    entries.push_back(fragment.entry);
                }
            }
        }
        return entries;
    }

    // Fills in size_. Throws when what will be read is too large. What has no content type is not
    // counted, for it is not read.
    void requireWithinLimits() {
        std::vector<const zip::Archive::Entry*> all = entriesOf({relationships_});
        for (const TypedItem& part : parts_) {
            const auto more = entriesOf({&part.item, part.relationships});
            all.insert(all.end(), more.begin(), more.end());
        }
        archive_.requireWithinLimits(all);
        size_.parts = parts_.size();
        for (const TypedItem& part : parts_) {
            size_.content += sizeOf(part.item);
        }
        for (const zip::Archive::Entry* entry : all) {
            size_.relationships += entry->size;
            size_.compressed = std::max(size_.compressed, entry->compressedSize);
        }
        size_.relationships -= size_.content;
    }

    // Its expanded bytes, of entries within the limits.
    static std::uint64_t sizeOf(const Item& item) {
        std::uint64_t size = 0;
        for (const Fragment& fragment : item.fragments) {
            size += fragment.entry->size;
        }
        return size;
    }

    std::vector<std::uint8_t> contentOf(const Item& item, std::uint64_t maxSize) {
        const std::vector<Fragment> fragments = orderedFragments(item);
        const std::uint64_t size = sizeOf(item);
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

    Part readPart(const TypedItem& typed) {
        const Item& item = typed.item;
        return about("has a broken part: " + quoted(item.name), [&] {
            if (const std::string_view problem = partNameProblem(item.name); !problem.empty()) {
                throw std::runtime_error("is not a valid part name: " + std::string(problem));
            }
            Part part;
            part.content = contentOf(item, zip::maxEntryBytes);
            part.contentType = i18n::to_ustring(typed.mediaType);
            part.partUri = i18n::to_ustring(item.name);
            part.relationships = readRelationships(typed.relationships, item.name);
            return part;
        });
    }

    // The relationships of `source`, which are in `item`; none if it is null.
    std::vector<Relationship> readRelationships(const Item* item, std::string_view source) {
        if (item == nullptr) {
            return {};
        }
        return about("has a broken relationships part: " + quoted(item->name), [&] {
            std::vector<Relationship> relationships =
                parseRelationships(contentOf(*item, maxPackageXmlBytes));
            requireTypedTargets(relationships, source);
            return relationships;
        });
    }

    // What has no content type is left out, and so would be gone after a save. Strays may be; what
    // the document refers to may not.
    void requireTypedTargets(const std::vector<Relationship>& relationships,
                             std::string_view source) const {
        if (untyped_.empty()) {
            return;
        }
        for (const Relationship& relationship : relationships) {
            const std::string target = i18n::to_string(relationship.target);
            const std::optional<std::string> key = targetPartKey(source, target);
            if (relationship.targetMode != 0 && key && untyped_.contains(*key)) {
                throw std::runtime_error("refers to " + quoted(target) +
                                         ", which has no content type");
            }
        }
    }

    zip::Archive archive_;
    std::vector<Item> items_;  // in the archive's order
    std::unordered_map<std::string, std::size_t> byKey_;
    ContentTypes types_;
    std::vector<TypedItem> parts_;
    std::unordered_set<std::string> untyped_;  // keys of the items that are left out
    const Item* relationships_ = nullptr;      // the package's own
    PackageSize size_;
};

QuilletFileReader::QuilletFileReader(std::u16string path) : path_(std::move(path)) {}

QuilletFileReader::~QuilletFileReader() = default;

// The result of `work` on the package's file, which is opened first unless it is open.
template <class Work>
auto QuilletFileReader::withFile(Work work) {
    const std::string path = filesystem::make_native_access_form_with_cleanup(path_);
    return about(quoted(path), [&] {
        if (!file_) {
            file_ = std::make_unique<PackageFile>(path);
        }
        return work(*file_);
    });
}

PackageSize QuilletFileReader::size() {
    return withFile([](PackageFile& file) { return file.size(); });
}

QuilletFilePackage QuilletFileReader::read() {
    QuilletFilePackage package = withFile([](PackageFile& file) { return file.read(); });
    file_.reset();
    return package;
}

}  // namespace platform::package
