// SPDX-License-Identifier: Apache-2.0
// DataBuffer: a byte buffer with malloc storage, the form in which message bodies and base64 text
// cross library boundaries.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string_view>
#include <utility>

namespace platform {

/// Owns `capacity()` bytes from malloc, of which the first `length()` are in use. Move-only: bytes
/// are copied only where a caller says so with `copyOf`.
class DataBuffer {
public:
    /// An empty buffer without storage.
    DataBuffer() noexcept = default;

    /// A buffer with room for `capacity` bytes, none of them in use yet; zero requests no storage.
    /// Throws std::runtime_error "Out of memory!" when malloc fails.
    explicit DataBuffer(std::size_t capacity) : capacity_(capacity) {
        if (capacity == 0) {
            return;
        }
        data_.reset(static_cast<char*>(std::malloc(capacity)));
        if (!data_) {
            throw std::runtime_error("Out of memory!");
        }
    }

    /// A buffer of exactly `bytes.size()` bytes, without a terminating zero. Throws as the
    /// constructor does. Linear in the number of bytes.
    static DataBuffer copyOf(std::string_view bytes) {
        DataBuffer buffer(bytes.size());
        if (!bytes.empty()) {
            std::memcpy(buffer.data(), bytes.data(), bytes.size());
            buffer.setLength(bytes.size());
        }
        return buffer;
    }

    DataBuffer(DataBuffer&& other) noexcept
        : data_(std::move(other.data_)),
          capacity_(std::exchange(other.capacity_, 0)),
          length_(std::exchange(other.length_, 0)) {}

    DataBuffer& operator=(DataBuffer&& other) noexcept {
        data_ = std::move(other.data_);
        capacity_ = std::exchange(other.capacity_, 0);
        length_ = std::exchange(other.length_, 0);
        return *this;
    }

    DataBuffer(const DataBuffer&) = delete;
    DataBuffer& operator=(const DataBuffer&) = delete;
    ~DataBuffer() = default;

    /// The storage; null when the capacity is zero. Valid until the buffer is moved from or
    /// destroyed.
    char* data() noexcept { return data_.get(); }
    const char* data() const noexcept { return data_.get(); }

    std::size_t capacity() const noexcept { return capacity_; }
    std::size_t length() const noexcept { return length_; }
    bool empty() const noexcept { return length_ == 0; }

    /// Declares the first `length` bytes to be in use. `length` is at most `capacity()`.
    void setLength(std::size_t length) noexcept { length_ = length; }

    /// Makes storage for exactly `size` bytes and declares all of them to be in use: first those
    /// that were, then any. Throws as the constructor does, and leaves the buffer as it was.
    void resize(std::size_t size) {
        if (size == 0) {
            *this = {};
            return;
        }
        void* const storage = std::realloc(data_.get(), size);
        if (storage == nullptr) {
            throw std::runtime_error("Out of memory!");
        }
        static_cast<void>(data_.release());  // freed, or the same as `storage`
        data_.reset(static_cast<char*>(storage));
        capacity_ = size;
        length_ = size;
    }

    /// The bytes in use. Valid as long as `data()` is.
    std::string_view view() const noexcept { return {data_.get(), length_}; }

private:
    struct Free {
        void operator()(char* storage) const noexcept { std::free(storage); }
    };

    std::unique_ptr<char, Free> data_;
    std::size_t capacity_ = 0;
    std::size_t length_ = 0;
};

}  // namespace platform
