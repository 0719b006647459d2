// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What a test changes of its own process for a while.
#pragma once

#include <cstdio>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

namespace support
{

// The number of an open descriptor is free while this lives, for the next one to get.
class FreedDescriptor
{
  public:
    explicit FreedDescriptor(int descriptor) : descriptor_(descriptor), kept_(dup(descriptor))
    {
        std::fflush(stdout);
        close(descriptor_);
    }
    ~FreedDescriptor()
    {
        dup2(kept_, descriptor_);
        close(kept_);
    }
    FreedDescriptor(const FreedDescriptor &) = delete;
    FreedDescriptor &operator=(const FreedDescriptor &) = delete;

  private:
    int descriptor_;
    int kept_;
};

// A resource has this limit while this lives.
class Limit
{
  public:
    Limit(int resource, rlim_t value) : resource_(resource)
    {
        getrlimit(resource_, &before_);
        const rlimit tight{value, before_.rlim_max};
        EXPECT_EQ(setrlimit(resource_, &tight), 0);
    }
    ~Limit()
    {
        setrlimit(resource_, &before_);
    }
    Limit(const Limit &) = delete;
    Limit &operator=(const Limit &) = delete;

  private:
    int resource_;
    rlimit before_{};
};

} // namespace support
