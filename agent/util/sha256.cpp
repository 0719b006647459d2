// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "util/sha256.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <fmt/core.h>

namespace fptest
{
namespace
{

using Word = std::uint32_t;

constexpr std::size_t kBlock = 64;

// The first bits of the fractions of the first primes' cube roots.
constexpr std::array<Word, 64> kRoots{
    0x428a2f98, 0x71374491, 0xb5c0fbcf, 0xe9b5dba5, 0x3956c25b, 0x59f111f1, 0x923f82a4, 0xab1c5ed5,
    0xd807aa98, 0x12835b01, 0x243185be, 0x550c7dc3, 0x72be5d74, 0x80deb1fe, 0x9bdc06a7, 0xc19bf174,
    0xe49b69c1, 0xefbe4786, 0x0fc19dc6, 0x240ca1cc, 0x2de92c6f, 0x4a7484aa, 0x5cb0a9dc, 0x76f988da,
    0x983e5152, 0xa831c66d, 0xb00327c8, 0xbf597fc7, 0xc6e00bf3, 0xd5a79147, 0x06ca6351, 0x14292967,
    0x27b70a85, 0x2e1b2138, 0x4d2c6dfc, 0x53380d13, 0x650a7354, 0x766a0abb, 0x81c2c92e, 0x92722c85,
    0xa2bfe8a1, 0xa81a664b, 0xc24b8b70, 0xc76c51a3, 0xd192e819, 0xd6990624, 0xf40e3585, 0x106aa070,
    0x19a4c116, 0x1e376c08, 0x2748774c, 0x34b0bcb5, 0x391c0cb3, 0x4ed8aa4a, 0x5b9cca4f, 0x682e6ff3,
    0x748f82ee, 0x78a5636f, 0x84c87814, 0x8cc70208, 0x90befffa, 0xa4506ceb, 0xbef9a3f7, 0xc67178f2};

using Digest = std::array<Word, 8>;

// C++ libraries do not agree on the type of std::rotr()'s count.
Word rotated(Word word, unsigned count)
{
    return word >> count | word << (32U - count);
}

Word spread(Word word, unsigned one, unsigned two, unsigned three)
{
    return rotated(word, one) ^ rotated(word, two) ^ rotated(word, three);
}

void add_block(Digest &state, std::string_view block)
{
    std::array<Word, 64> words{};
    for (std::size_t at = 0; at < kBlock; ++at) {
        words[at / 4] = words[at / 4] << 8U | static_cast<unsigned char>(block[at]);
    }
    for (std::size_t at = 16; at < words.size(); ++at) {
        const Word early = words[at - 15];
        const Word late = words[at - 2];
        words[at] = words[at - 16] + words[at - 7] +
                    (rotated(early, 7) ^ rotated(early, 18) ^ early >> 3U) +
                    (rotated(late, 17) ^ rotated(late, 19) ^ late >> 10U);
    }
    auto [a, b, c, d, e, f, g, h] = state;
    for (std::size_t at = 0; at < words.size(); ++at) {
        const Word one = h + spread(e, 6, 11, 25) + ((e & f) ^ (~e & g)) + kRoots[at] + words[at];
        const Word two = spread(a, 2, 13, 22) + ((a & b) ^ (a & c) ^ (b & c));
        h = g;
        g = f;
        f = e;
        e = d + one;
        d = c;
        c = b;
        b = a;
        a = one + two;
    }
    const Digest more{a, b, c, d, e, f, g, h};
    for (std::size_t at = 0; at < state.size(); ++at) {
        state[at] += more[at];
    }
}

} // namespace

std::string sha256(std::string_view bytes)
{
    Digest state{0x6a09e667, 0xbb67ae85, 0x3c6ef372, 0xa54ff53a,
                 0x510e527f, 0x9b05688c, 0x1f83d9ab, 0x5be0cd19};
    const std::uint64_t bits = std::uint64_t{bytes.size()} * 8;
    std::size_t at = 0;
    for (; bytes.size() - at >= kBlock; at += kBlock) {
        add_block(state, bytes.substr(at, kBlock));
    }
    // a bit, zeros, and the number of bits in the last eight bytes
    std::string rest(bytes.substr(at));
    rest += '\x80';
    rest.resize((rest.size() + 8 + kBlock - 1) / kBlock * kBlock - 8);
    for (int shift = 56; shift >= 0; shift -= 8) {
        rest += static_cast<char>(bits >> shift);
    }
    for (at = 0; at < rest.size(); at += kBlock) {
        add_block(state, std::string_view(rest).substr(at, kBlock));
    }
    std::string text;
    for (const Word word : state) {
        text += fmt::format("{:08x}", word);
    }
    return text;
}

} // namespace fptest
