// SPDX-License-Identifier: Apache-2.0
#include "host/commands/document_kind.h"

#include <unistd.h>

#include <array>
#include <string_view>

#include "platform/posix/open_regular_file.h"

namespace host {

bool isDocumentPackage(const std::filesystem::path& file) {
    constexpr std::string_view localHeaderMark{"PK\3\4", 4};
    const platform::OpenedFile opened = platform::openRegularFile(file);
    std::array<char, localHeaderMark.size()> start{};
    return opened.descriptor &&
           ::read(opened.descriptor.get(), start.data(), start.size()) ==
               static_cast<ssize_t>(start.size()) &&
           std::string_view(start.data(), start.size()) == localHeaderMark;
}

}  // namespace host
