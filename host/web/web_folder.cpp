// SPDX-License-Identifier: Apache-2.0
#include "host/web/web_folder.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <stdexcept>
#include <system_error>
#include <utility>

namespace host {

namespace {

// Follows no link, and does not wait for a writer when it is a pipe.
constexpr int openFlags = O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;

constexpr std::array<std::pair<std::string_view, std::string_view>, 17> typesByEnding{{
    {".html", "text/html; charset=utf-8"},
    {".js", "text/javascript; charset=utf-8"},
    {".mjs", "text/javascript; charset=utf-8"},
    {".css", "text/css; charset=utf-8"},
    {".json", "application/json"},
    {".map", "application/json"},
    {".txt", "text/plain; charset=utf-8"},
    {".wasm", "application/wasm"},
    {".svg", "image/svg+xml"},
    {".png", "image/png"},
    {".jpg", "image/jpeg"},
    {".jpeg", "image/jpeg"},
    {".gif", "image/gif"},
    {".webp", "image/webp"},
    {".ico", "image/x-icon"},
    {".woff", "font/woff"},
    {".woff2", "font/woff2"},
}};

std::string typeOf(std::string_view name) {
    for (const auto& [ending, type] : typesByEnding) {
        if (name.ends_with(ending)) {
            return std::string(type);
        }
    }
    return "application/octet-stream";
}

bool mayBeServed(std::string_view name) {
    return !name.empty() && name.front() != '.' && name.find('\0') == std::string_view::npos;
}

bool isRegularFile(const platform::FileDescriptor& file) {
    struct stat status {};
    return ::fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode);
}

}  // namespace

WebFolder::WebFolder(const std::filesystem::path& folder)
    : folder_(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    if (!folder_) {
        throw std::runtime_error("cannot serve the web folder " + folder.string() + ": " +
                                 std::generic_category().message(errno));
    }
}

std::optional<WebFolder::File> WebFolder::open(std::string_view path) const {
    if (!path.starts_with('/')) {
        return std::nullopt;
    }
    std::string rest(path.substr(1));
    if (rest.empty() || rest.ends_with('/')) {
        rest += "index.html";
    }
    // Name by name, so that no name can stand for several.
    platform::FileDescriptor opened;
    int folder = folder_.get();
    for (std::size_t begin = 0; begin <= rest.size();) {
        const std::size_t end = std::min(rest.find('/', begin), rest.size());
        const std::string name = rest.substr(begin, end - begin);
        if (!mayBeServed(name)) {
            return std::nullopt;
        }
        platform::FileDescriptor next(
            ::openat(folder, name.c_str(), openFlags | (end < rest.size() ? O_DIRECTORY : 0)));
        if (!next) {
            return std::nullopt;
        }
        opened = std::move(next);
        folder = opened.get();
        begin = end + 1;
    }
    if (!isRegularFile(opened)) {
        return std::nullopt;
    }
    return File{std::move(opened), typeOf(rest)};
}

}  // namespace host
