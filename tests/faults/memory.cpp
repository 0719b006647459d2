// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The process's memory, counted to the byte: the C library counts the rounding
// of its blocks as well, and that differs with their history.
#include "memory.h"

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

extern "C" {
void *__libc_malloc(size_t size);
void __libc_free(void *block);
}

namespace
{

// In front of each block.
struct alignas(std::max_align_t) Header {
    std::size_t size;
};

long in_use;

Header *header_of(void *memory)
{
    return static_cast<Header *>(memory) - 1;
}

} // namespace

long memory_in_use()
{
    return in_use;
}

extern "C" {

void *malloc(size_t size)
{
    if (size > SIZE_MAX - sizeof(Header)) {
        errno = ENOMEM;
        return nullptr;
    }
    auto *header = static_cast<Header *>(__libc_malloc(sizeof(Header) + size));
    if (header == nullptr) {
        return nullptr;
    }
    header->size = size;
    in_use += static_cast<long>(size);
    return header + 1;
}

void free(void *memory)
{
    if (memory != nullptr) {
        in_use -= static_cast<long>(header_of(memory)->size);
        __libc_free(header_of(memory));
    }
}

void *calloc(size_t count, size_t size)
{
    size_t all = 0;
    if (__builtin_mul_overflow(count, size, &all)) {
        errno = ENOMEM;
        return nullptr;
    }
    void *memory = malloc(all);
    return memory != nullptr ? memset(memory, 0, all) : nullptr;
}

void *realloc(void *memory, size_t size)
{
    void *other = malloc(size);
    if (other != nullptr && memory != nullptr) {
        const size_t old = header_of(memory)->size;
        memcpy(other, memory, old < size ? old : size);
        free(memory);
    }
    return other;
}

} // extern "C"
