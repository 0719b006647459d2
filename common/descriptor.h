// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Owns a file descriptor.
#pragma once

#include <unistd.h>
#include <utility>

class Descriptor
{
  public:
    explicit Descriptor(int descriptor) : descriptor_(descriptor)
    {
    }
    Descriptor(Descriptor &&other) noexcept : descriptor_(std::exchange(other.descriptor_, -1))
    {
    }
    Descriptor &operator=(Descriptor &&other) noexcept
    {
        std::swap(descriptor_, other.descriptor_);
        return *this;
    }
    ~Descriptor()
    {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }

    bool is_open() const
    {
        return descriptor_ >= 0;
    }
    int get() const
    {
        return descriptor_;
    }

  private:
    int descriptor_;
};
