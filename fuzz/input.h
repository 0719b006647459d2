// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the targets read their input: texts, each ended by a zero byte, so that
// seeds stay readable.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

// The first N - 1 texts, and all that is after them.
template <std::size_t N>
std::array<std::string, N> texts(const std::uint8_t *data, std::size_t size)
{
    std::string_view rest(reinterpret_cast<const char *>(data), size);
    std::array<std::string, N> found;
    for (std::size_t at = 0; at + 1 < N; ++at) {
        const std::size_t length = std::min(rest.find('\0'), rest.size());
        found[at] = rest.substr(0, length);
        rest.remove_prefix(std::min(length + 1, rest.size()));
    }
    found[N - 1] = rest;
    return found;
}

// What an array of that capacity holds after a text was put there.
inline std::string filled(std::string_view text, std::size_t capacity)
{
    std::string array(text.substr(0, capacity - 1));
    array.resize(capacity, '\0');
    return array;
}

// A block of its own, exactly as long as it has to be: AddressSanitizer stops
// whoever touches the byte before or after it.
class Block
{
  public:
    Block(std::size_t size, char fill) : size_(size), bytes_(new char[size])
    {
        std::fill_n(bytes_.get(), size, fill);
    }
    // With the text's terminating zero.
    explicit Block(std::string_view text) : Block(text.size() + 1, '\0')
    {
        text.copy(bytes_.get(), text.size());
    }

    [[nodiscard]] char *data() const
    {
        return bytes_.get();
    }
    [[nodiscard]] std::string_view all() const
    {
        return {bytes_.get(), size_};
    }

  private:
    std::size_t size_;
    std::unique_ptr<char[]> bytes_;
};
