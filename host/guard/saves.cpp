// SPDX-License-Identifier: Apache-2.0
#include "host/guard/saves.h"

#include <fcntl.h>
#include <spdlog/spdlog.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <utility>

#include "host/guard/document_version.h"
#include "host/guard/file_content.h"
#include "host/guard/in_place_file.h"
#include "json/parser.h"
#include "platform/i18n/codecvt.h"
#include "platform/posix/atomic_file.h"
#include "platform/posix/file_in_memory.h"
#include "platform/posix/open_regular_file.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

using platform::AtomicFile;
using platform::FileDescriptor;
using platform::FileInMemory;

// Whether a save in place may succeed after this failure: the disk is neither full nor broken.
bool isForbidden(const std::error_code& error) {
    return error == std::errc::permission_denied || error == std::errc::operation_not_permitted ||
           error == std::errc::read_only_file_system ||
           error == std::errc::device_or_resource_busy || error == std::errc::cross_device_link;
}

// Whether a failure means that there can be no file, or that links form a circle. The bundle then
// finds the same.
bool isNowhere(const std::error_code& error) {
    return error == std::errc::no_such_file_or_directory || error == std::errc::not_a_directory ||
           error == std::errc::filename_too_long ||
           error == std::errc::too_many_symbolic_link_levels;
}

// The regular file at `path`, opened for reading; none where there is none.
FileDescriptor openRegular(const std::string& path) {
    return platform::openRegularFile(path).descriptor;
}

void sync(int file) {
    // Some file systems cannot sync folders, and say so.
    if (::fsync(file) != 0 && errno != EINVAL) {
        platform::throwSystemError("may not be safe on disk");
    }
}

// Makes the document `file` and its name in its folder safe on disk. A folder that may not be
// listed cannot be synced.
void syncWithFolder(int file, const std::filesystem::path& document) {
    sync(file);
    const FileDescriptor folder(
        ::open(document.parent_path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (folder) {
        sync(folder.get());
    } else if (errno != EACCES) {
        platform::throwSystemError("may not be safe on disk");
    }
}

// Whether the file holds the text that `request` asks for. The text is nearly always stored as it
// is in the request; but some charsets can write the same text in several ways.
bool holdsTextOf(const WriteRequest& request, int file) {
    if (hasContentOf(file, request.text)) {
        return true;
    }
    json::Input input{request.text.data(), request.text.data() + request.text.size()};
    std::string bytes;
    if (json::parseString(input, bytes) != json::Status::success) {
        return false;
    }
    try {
        platform::i18n::codecvt_string_to_ustring decoder(request.encoding, true);
        platform::i18n::codecvt_ustring_to_string encoder(request.encoding, true);
        const std::u16string text = platform::i18n::to_ustring(bytes, decoder);
        return hasContent(file, platform::i18n::to_string(text, encoder));
    } catch (const std::runtime_error&) {
        return false;
    }
}

// Replaces the target by `file`, and calls `keep` for the old one: even when the new one is there
// but may not be safe on disk, which throws.
template <typename Keep>
void commit(AtomicFile& file, Keep keep) {
    try {
        file.commit();
    } catch (const std::system_error&) {
        if (file.isCommitted()) {
            keep();
        }
        throw;
    }
    keep();
}

bool areOneFile(const FileDescriptor& one, const FileDescriptor& other) {
    struct stat status {};
    struct stat otherStatus {};
    return ::fstat(one.get(), &status) == 0 && ::fstat(other.get(), &otherStatus) == 0 &&
           status.st_dev == otherStatus.st_dev && status.st_ino == otherStatus.st_ino;
}

// One save. The document's lock is held while the new file takes its place.
class Save {
public:
    Save(const WriteRequest& request, const std::string& document, const AskBundle& askBundle,
         const AwaitMemory& awaitMemory, SaveLocks& locks, History* history)
        : request_(request),
          document_(document),
          askBundle_(askBundle),
          awaitMemory_(awaitMemory),
          locks_(locks),
          history_(history) {}

    SaveResult make() {
        std::error_code ignored;
        existed_ = std::filesystem::exists(request_.filePath, ignored);
        try {
            if (!request_.baseVersion.is<json::Undefined>() &&
                !request_.baseVersion.is<std::string>()) {
                throw std::runtime_error("\"baseVersion\" is not a string");
            }
            const bool isSaved = request_.isPackage ? savePackage() : saveText();
            return {isSaved, existed_, isSaved ? version_ : std::string(), std::move(replaced_)};
        } catch (const std::exception& error) {
            spdlog::error("{}: {}", request_.filePath, error.what());
            return {false, existed_, {}, {}};
        }
    }

private:
    bool saveText() {
        std::optional<AtomicFile> file;
        try {
            file.emplace(request_.filePath);
        } catch (const std::system_error& error) {
            if (isForbidden(error.code())) {
                return saveTextInPlace();
            }
            if (isNowhere(error.code())) {
                return saveUnguarded();
            }
            throw;
        } catch (const std::runtime_error&) {
            return saveUnguarded();  // a folder, or a device
        }
        if (!file->canStandForTarget()) {
            file.reset();
            return saveTextInPlace();
        }
        try {
            return saveTextBeside(*file);
        } catch (const std::system_error& error) {
            if (file->isCommitted() || !isForbidden(error.code())) {
                throw;
            }
        }
        file.reset();
        return saveTextInPlace();
    }

    bool saveTextBeside(AtomicFile& file) {
        existed_ = file.hasTarget();
        if (!askBundle_(file.contentPath()).isWritten) {
            throw std::runtime_error("the text is not valid in the charset");
        }
        file.startSync();
        if (!holdsTextOf(request_, file.content())) {
            throw std::runtime_error("not all of the text could be written");
        }
        const SaveLocks::Held lock = locks_.hold(document_);
        FileDescriptor old = file.openTarget();
        const bool isSame = old && haveSameContent(old.get(), file.content());
        if (isSame || !isBasedOn(old, file.hasTarget())) {
            return isThereAlready(old.get(), isSame);
        }
        noteVersion(file.content());
        commit(file, [&] { keep(std::move(old)); });
        return true;
    }

    bool saveTextInPlace() {
        std::error_code ignored;
        const std::uintmax_t oldSize = std::filesystem::file_size(request_.filePath, ignored);
        awaitMemory_((ignored ? 0 : oldSize) + request_.text.size());
        const SaveLocks::Held lock = locks_.hold(document_);
        std::optional<InPlaceFile> opened;
        try {
            opened.emplace(request_.filePath);
        } catch (const std::system_error& error) {
            if (isForbidden(error.code()) || isNowhere(error.code())) {
                return saveUnguarded();
            }
            throw;
        }
        return saveTextOver(*opened);
    }

    bool saveTextOver(const InPlaceFile& file) {
        if (!isBasedOn(file.copy(), true)) {
            return isThereAlready(file.descriptor(), holdsTextOf(request_, file.copy().get()));
        }
        FileInMemory text("new content");
        text.reserve(request_.text.size());
        if (!askBundle_(text.path()).isWritten || !holdsTextOf(request_, text.descriptor().get())) {
            throw std::runtime_error("the text is not valid in the charset");
        }
        if (haveSameContent(file.copy().get(), text.descriptor().get())) {
            return isThereAlready(file.descriptor(), true);
        }
        // A process that is killed while it writes leaves a mixture, so the old text is kept first.
        if (history_ != nullptr) {
            history_->keepNow(file.copy(), document_);
        }
        file.replaceContent(text.descriptor().get());
        noteVersion(text.descriptor().get());
        return true;
    }

    // For paths at which there is no document that could be lost.
    bool saveUnguarded() {
        if (request_.baseVersion.is<std::string>() && existed_) {
            throw std::runtime_error("has no version");
        }
        const BundleAnswer answer = askBundle_({});
        existed_ = answer.existed;
        return answer.isWritten;
    }

    // The bundle saves packages whole or not at all.
    bool savePackage() {
        const SaveLocks::Held lock = locks_.hold(document_);
        FileDescriptor old = openRegular(request_.filePath);
        if (!isBasedOn(old, existed_)) {
            return isThereAlready(old.get(), old && packageComesOutAs(old));
        }
        const BundleAnswer answer = askBundle_({});
        existed_ = answer.existed;
        const FileDescriptor current = openRegular(request_.filePath);
        if (answer.isWritten) {
            noteVersion(current.get());
        }
        if (!areOneFile(old, current) && !haveSameContent(old.get(), current.get())) {
            keep(std::move(old));
        }
        return answer.isWritten;
    }

    // Whether the bundle leaves a copy of `current` unchanged when it writes the package over it.
    bool packageComesOutAs(const FileDescriptor& current) {
        AtomicFile copy(request_.filePath);
        copyContent(current.get(), copy.content());
        // It writes by renaming another file, so the copy must be opened again by its name.
        const std::string path = copy.temporaryPath();
        if (!askBundle_(path).isWritten) {
            return false;
        }
        const FileDescriptor written = openRegular(path);
        return written && haveSameContent(written.get(), current.get());
    }

    // Whether the document has the version that the client knows, if it named one. The lock must be
    // held.
    bool isBasedOn(const FileDescriptor& current, bool exists) const {
        if (request_.baseVersion.is<json::Undefined>()) {
            return true;
        }
        if (exists && !current) {
            throw std::runtime_error("cannot be read, and so not be compared with a version");
        }
        const auto& expected = request_.baseVersion.get<std::string>();
        return expected == (current ? versionOf(current.get()) : std::string());
    }

    // Whether the document holds already what is to be saved. Then nothing is written, and no
    // earlier version is kept: saves that change nothing would soon drive out all others. Nor is it
    // a conflict: the save was made before, by a client that got no answer and asks again. That one
    // may have failed at its last step, so the document is synced.
    bool isThereAlready(int current, bool isSame) {
        if (isSame) {
            syncWithFolder(current, document_);
            noteVersion(current);
        } else {
            spdlog::warn("{}: not saved, since it has changed meanwhile", request_.filePath);
        }
        return isSame;
    }

    // Called with the lock held. A save that is made has not failed because its version is not
    // known.
    void noteVersion(int file) noexcept {
        try {
            if (request_.baseVersion.is<std::string>()) {
                version_ = versionOf(file);
            }
        } catch (const std::exception&) {
            version_.clear();
        }
    }

    // Nor has a save that is made failed because what it replaced cannot be kept.
    void keep(FileDescriptor old) noexcept {
        if (history_ == nullptr || !old) {
            replaced_ = std::move(old);
            return;
        }
        try {
            history_->keep(std::move(old), document_);
        } catch (const std::exception& error) {
            spdlog::warn("{}: no earlier version is kept: {}", document_, error.what());
        }
    }

    const WriteRequest& request_;
    const std::string& document_;
    const AskBundle& askBundle_;
    const AwaitMemory& awaitMemory_;
    SaveLocks& locks_;
    History* const history_;
    bool existed_ = false;
    std::string version_;
    FileDescriptor replaced_;
};

}  // namespace

Saves::Saves(const std::filesystem::path& lockFile, std::shared_ptr<History> history)
    : locks_(lockFile), history_(std::move(history)) {}

SaveResult Saves::save(const WriteRequest& request, const AskBundle& askBundle,
                       const AwaitMemory& awaitMemory) {
    const std::string document = History::nameOf(request.filePath);
    SaveResult result =
        Save(request, document, askBundle, awaitMemory, locks_, history_.get()).make();
    leftovers_.removeBeside(document);
    return result;
}

void Saves::restore(const std::string& path, int version) {
    const std::string document = History::nameOf(path);
    const SaveLocks::Held lock = locks_.hold(document);
    std::optional<AtomicFile> file;
    try {
        file.emplace(path);
    } catch (const std::system_error& error) {
        if (!isForbidden(error.code())) {
            throw;
        }
    }
    if (file && file->canStandForTarget()) {
        FileDescriptor old = file->openTarget();
        copyContent(version, file->content());
        commit(*file, [&] {
            if (history_ && old && !haveSameContent(old.get(), version)) {
                history_->keep(std::move(old), document);
            }
        });
        return;
    }
    const InPlaceFile inPlace(path);
    if (history_ && !haveSameContent(inPlace.copy().get(), version)) {
        history_->keepNow(inPlace.copy(), document);
    }
    inPlace.replaceContent(version);
}

}  // namespace host
