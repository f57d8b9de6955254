// SPDX-License-Identifier: Apache-2.0
#include "host/guard/document_version.h"

#include <openssl/evp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <memory>
#include <new>
#include <stdexcept>
#include <vector>

#include "platform/posix/system_error.h"

namespace host {

namespace {

// As long as a package may be, with room for names. To compute the version of what is longer would
// hold up everybody's saves for minutes.
constexpr off_t longestDocument = off_t{2200} << 20U;

class Sha256 {
public:
    Sha256() : context_(::EVP_MD_CTX_new(), &::EVP_MD_CTX_free) {
        if (!context_ || ::EVP_DigestInit_ex(context_.get(), ::EVP_sha256(), nullptr) != 1) {
            throw std::bad_alloc();
        }
    }

    void add(const void* bytes, std::size_t size) {
        if (::EVP_DigestUpdate(context_.get(), bytes, size) != 1) {
            throw std::runtime_error("a version cannot be computed");
        }
    }

    std::string firstHalf() {
        std::array<unsigned char, EVP_MAX_MD_SIZE> sum{};
        if (::EVP_DigestFinal_ex(context_.get(), sum.data(), nullptr) != 1) {
            throw std::runtime_error("a version cannot be computed");
        }
        constexpr std::string_view digits = "0123456789abcdef";
        std::string text;
        for (std::size_t i = 0; i < 16; ++i) {
            text += digits[sum.at(i) >> 4U];
            text += digits[sum.at(i) & 15U];
        }
        return text;
    }

private:
    std::unique_ptr<EVP_MD_CTX, void (*)(EVP_MD_CTX*)> context_;
};

void requireLength(off_t length) {
    if (length > longestDocument) {
        throw std::runtime_error("is too large for a document: " + std::to_string(length) +
                                 " bytes");
    }
}

}  // namespace

std::string versionOf(int file) {
    struct stat status {};
    if (::fstat(file, &status) == 0) {
        requireLength(status.st_size);
    }
    constexpr std::size_t blockSize = std::size_t{256} * 1024;
    std::vector<char> block(blockSize);
    Sha256 sum;
    for (off_t offset = 0;;) {
        const ssize_t count = ::pread(file, block.data(), block.size(), offset);
        if (count == 0) {
            return sum.firstHalf();
        }
        if (count > 0) {
            sum.add(block.data(), static_cast<std::size_t>(count));
            offset += count;
            requireLength(offset);  // The file may grow.
        } else if (errno != EINTR) {
            platform::throwSystemError("cannot be read");
        }
    }
}

std::string digestOf(std::string_view bytes) {
    Sha256 sum;
    sum.add(bytes.data(), bytes.size());
    return sum.firstHalf();
}

}  // namespace host
