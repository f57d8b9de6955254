// SPDX-License-Identifier: Apache-2.0
#include "package_round_trip.h"

#include <sys/mman.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_reader.h"
#include "platform/package/quillet_file_writer.h"
#include "tests/support/temporary_directory.h"

namespace fuzzing {
namespace {

using platform::package::QuilletFilePackage;
using platform::package::QuilletFileReader;
using platform::package::QuilletFileWriter;
using Relationships = std::vector<QuilletFilePackage::Relationship>;

// The reader takes paths; a file in memory has one too.
std::u16string fileInMemory(std::span<const char> bytes) {
    static const int file = ::memfd_create("archive", MFD_CLOEXEC);
    if (file < 0 || ::ftruncate(file, 0) != 0 ||
        ::pwrite(file, bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
        std::abort();
    }
    return platform::i18n::to_ustring("/proc/self/fd/" + std::to_string(file));
}

std::u16string fileOnDisk() {
    static const test::TemporaryDirectory folder(test::folderInMemory());
    return platform::i18n::to_ustring((folder / "a.docx").string());
}

// The modes are left out: a relationship to no part comes back as external.
bool sameRelationships(const Relationships& a, const Relationships& b) {
    if (a.size() != b.size()) {
        return false;
    }
    for (std::size_t i = 0; i < a.size(); ++i) {
        if (a[i].relationshipId != b[i].relationshipId || a[i].target != b[i].target ||
            a[i].relationshipType != b[i].relationshipType) {
            return false;
        }
    }
    return true;
}

bool same(const QuilletFilePackage& a, const QuilletFilePackage& b) {
    if (a.parts().size() != b.parts().size() ||
        !sameRelationships(a.relationships(), b.relationships())) {
        return false;
    }
    for (std::size_t i = 0; i < a.parts().size(); ++i) {
        // Content types are left out: the case of the top-level type changes.
        if (a.parts()[i].partUri != b.parts()[i].partUri ||
            a.parts()[i].content != b.parts()[i].content ||
            !sameRelationships(a.parts()[i].relationships, b.parts()[i].relationships)) {
            return false;
        }
    }
    return true;
}

}  // namespace

void readAndWriteBack(std::span<const char> archive) {
    QuilletFilePackage package;
    const std::u16string path = fileOnDisk();
    try {
        package = QuilletFileReader(fileInMemory(archive)).read();
        QuilletFileWriter writer(path, {});
        writer.write(package);
        writer.close(false);
    } catch (const std::runtime_error&) {
        return;
    }
    if (!same(QuilletFileReader(path).read(), package)) {
        std::abort();
    }
}

}  // namespace fuzzing
