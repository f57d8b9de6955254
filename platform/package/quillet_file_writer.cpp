// SPDX-License-Identifier: Apache-2.0
#include "platform/package/quillet_file_writer.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <optional>
#include <span>
#include <stdexcept>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/about.h"
#include "platform/package/content_types.h"
#include "platform/package/package_xml.h"
#include "platform/package/part_name.h"
#include "platform/package/relationships.h"
#include "platform/package/zip/reusable_entries.h"
#include "platform/package/zip/writer.h"
#include "platform/posix/atomic_file.h"
#include "platform/text/case.h"

namespace platform::package {
namespace {

using Part = QuilletFilePackage::Part;
using Relationship = QuilletFilePackage::Relationship;

constexpr std::u16string_view corePropertiesName = u"/docProps/core.xml";
constexpr std::u16string_view corePropertiesMediaType =
    u"application/vnd.openxmlformats-package.core-properties+xml";
constexpr std::u16string_view corePropertiesRelationship =
    u"http://schemas.openxmlformats.org/package/2006/relationships/metadata/core-properties";

// Media types whose content is compressed already.
constexpr std::array<std::string_view, 13> compressedTypes = {
    "image/png",  "image/jpeg",      "image/jpg",       "image/gif", "image/webp",
    "image/avif", "image/heic",      "audio/mpeg",      "audio/mp4", "audio/ogg",
    "video/mp4",  "application/zip", "application/gzip"};

bool isCompressed(std::string_view mediaType) {
    const std::string withoutParameters =
        text::toLowerAscii(mediaType.substr(0, mediaType.find(';')));
    return std::find(compressedTypes.begin(), compressedTypes.end(), withoutParameters) !=
           compressedTypes.end();
}

std::string withLowerCaseTopLevel(const std::string& mediaType) {
    const std::size_t slash = std::min(mediaType.find('/'), mediaType.size());
    return text::toLowerAscii(mediaType.substr(0, slash)).append(mediaType, slash);
}

// Why a part of this name could not be read back; empty if it could.
std::string_view nameProblem(std::string_view name) {
    if (const std::string_view problem = partNameProblem(name); !problem.empty()) {
        return problem;
    }
    if (partNameKey(name) == partNameKey(contentTypesName)) {
        return "it is reserved for the content types";
    }
    if (relationshipsSource(name)) {
        return "it is reserved for relationships";
    }
    if (pieceNamed(name) || isTrash(name)) {
        return "it is reserved for pieces of parts and for the trash";
    }
    return {};
}

Part corePropertiesPart(const std::string& creator, const std::string& title) {
    std::string xml =
        "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n"
        "<cp:coreProperties xmlns:cp=\"http://schemas.openxmlformats.org/package/2006/metadata/"
        "core-properties\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\"><dc:creator>";
    appendEscaped(xml, creator);
    xml.append("</dc:creator><dc:title>");
    appendEscaped(xml, title);
    xml.append("</dc:title></cp:coreProperties>");
    Part part;
    part.content.assign(xml.begin(), xml.end());
    part.contentType = corePropertiesMediaType;
    part.partUri = corePropertiesName;
    return part;
}

// Whether a reference has no path, as "#Sheet2!A1" has none. Some programs call it a link to their
// own part, others an external one, and each drops what the other writes.
bool hasNoPath(std::string_view target) {
    return target.empty() || target.front() == '#' || target.front() == '?';
}

using RelationshipsById = std::unordered_map<std::u16string, Relationship>;

// The external relationships of `source` in the package that is replaced; none if there is no such
// package.
RelationshipsById externalIn(zip::ReusableEntries& previous, std::string_view source) {
    RelationshipsById external;
    try {
        const std::string name = relationshipsPartName(source).substr(1);
        for (const Relationship& relationship :
             parseRelationships(previous.read(name, maxPackageXmlBytes))) {
            if (relationship.targetMode == 0) {
                external.emplace(relationship.relationshipId, relationship);
            }
        }
    } catch (const std::runtime_error&) {
        external.clear();
    }
    return external;
}

bool isAmong(const RelationshipsById& relationships, const Relationship& relationship) {
    const auto found = relationships.find(relationship.relationshipId);
    return found != relationships.end() &&
           found->second.relationshipType == relationship.relationshipType &&
           found->second.target == relationship.target;
}

// Writes one package into one archive.
class PackageWriter {
public:
    explicit PackageWriter(const QuilletFilePackage& package)
        : relationships_(package.relationships()) {
        for (const Part& part : package.parts()) {
            add(part);
        }
    }

    // Adds a part for the core properties, and the relationship that makes it that.
    void addCoreProperties(const std::string& creator, const std::string& title) {
        const auto hasId = [this](const std::u16string& id) {
            return std::any_of(relationships_.begin(), relationships_.end(),
                               [&](const Relationship& r) { return r.relationshipId == id; });
        };
        for (const Relationship& relationship : relationships_) {
            if (relationship.relationshipType == corePropertiesRelationship) {
                throw std::runtime_error("has core properties already");
            }
        }
        coreProperties_ = corePropertiesPart(creator, title);
        add(coreProperties_);
        std::u16string id = u"rIdCore";
        while (hasId(id)) {
            id += u'_';
        }
        relationships_.push_back({std::u16string(corePropertiesRelationship),
                                  std::u16string(corePropertiesName), id, 1});
    }

    // Reuses what it can of `previous`.
    void write(AtomicFile& file, zip::ReusableEntries& previous) {
        zip::Writer archive(file, previous);
        addXml(archive, contentTypesName, contentTypes());
        addRelationships(archive, previous, packageRoot, relationships_);
        for (const Item& item : items_) {
            about("part " + quoted(item.name), [&] {
                addEntry(archive, item.name, item.part->content, !isCompressed(item.mediaType));
                addRelationships(archive, previous, item.name, item.part->relationships);
            });
        }
        archive.finish();
    }

private:
    struct Item {
        std::string name;
        std::string mediaType;
        const Part* part;
    };

    void add(const Part& part) {
        about("part " + quoted(i18n::to_string(part.partUri, toPrintable_)), [&] {
            const std::string name = i18n::to_string(part.partUri);
            if (const std::string_view problem = nameProblem(name); !problem.empty()) {
                throw std::runtime_error("has an invalid name: " + std::string(problem));
            }
            requireXmlCharacters(name);
            if (part.contentType.empty()) {
                throw std::runtime_error("has no content type");
            }
            if (!keys_.insert(partNameKey(name)).second) {
                throw std::runtime_error("has the name of another part");
            }
            const std::string mediaType = i18n::to_string(part.contentType);
            requireXmlCharacters(mediaType);
            items_.push_back({name, withLowerCaseTopLevel(mediaType), &part});
        });
    }

    std::string contentTypes() const {
        ContentTypesBuilder builder;
        bool hasRelationships = !relationships_.empty();
        for (const Item& item : items_) {
            builder.add(item.name, item.mediaType);
            hasRelationships = hasRelationships || !item.part->relationships.empty();
        }
        if (hasRelationships) {
            builder.addRelationships();
        }
        return builder.xml();
    }

    void addRelationships(zip::Writer& archive, zip::ReusableEntries& previous,
                          std::string_view source, const std::vector<Relationship>& relationships) {
        if (relationships.empty()) {
            return;
        }
        std::optional<RelationshipsById> external;  // read where it is needed
        const auto wasExternal = [&](const Relationship& relationship) {
            if (!external) {
                external = externalIn(previous, source);
            }
            return isAmong(*external, relationship);
        };
        const auto isExternal = [&](const Relationship& relationship, std::string_view target) {
            const std::optional<std::string> key = targetPartKey(source, target);
            return relationship.targetMode == 0 || !key || !keys_.contains(*key) ||
                   (hasNoPath(target) && wasExternal(relationship));
        };
        addXml(archive, relationshipsPartName(source), relationshipsXml(relationships, isExternal));
    }

    static void addXml(zip::Writer& archive, std::string_view name, const std::string& xml) {
        if (xml.size() > maxPackageXmlBytes) {
            throw std::runtime_error("has too many parts or relationships");
        }
        addEntry(archive, name, {reinterpret_cast<const std::uint8_t*>(xml.data()), xml.size()},
                 true);
    }

    static void addEntry(zip::Writer& archive, std::string_view name,
                         std::span<const std::uint8_t> content, bool mayDeflate) {
        archive.add(name.substr(1), content, mayDeflate);
    }

    // For names that are not valid text, which an error has to show anyway.
    i18n::codecvt_ustring_to_string toPrintable_{"UTF-8", false};
    std::vector<Item> items_;
    std::unordered_set<std::string> keys_;  // of all items
    std::vector<Relationship> relationships_;
    Part coreProperties_;
};

}  // namespace

QuilletFileWriter::QuilletFileWriter(std::u16string path,
                                     std::pair<std::u16string, std::u16string> creatorAndTitle)
    : path_(std::move(path)), creatorAndTitle_(std::move(creatorAndTitle)) {}

QuilletFileWriter::~QuilletFileWriter() = default;

void QuilletFileWriter::write(const QuilletFilePackage& package) {
    file_.reset();
    const std::string path = filesystem::make_native_access_form_with_cleanup(path_);
    about(quoted(path), [&] {
        PackageWriter writer(package);
        const auto& [creator, title] = creatorAndTitle_;
        if (!creator.empty() || !title.empty()) {
            writer.addCoreProperties(i18n::to_string(creator), i18n::to_string(title));
        }
        auto file = std::make_unique<AtomicFile>(path);
        zip::ReusableEntries previous(path);
        writer.write(*file, previous);
        file_ = std::move(file);
    });
}

void QuilletFileWriter::close(bool discard) {
    const std::unique_ptr<AtomicFile> file = std::move(file_);
    if (!discard && file) {
        about(quoted(filesystem::make_native_access_form_with_cleanup(path_)),
              [&] { file->commit(); });
    }
}

}  // namespace platform::package
