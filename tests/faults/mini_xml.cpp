// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "mini_xml.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <unistd.h>

namespace mini_xml
{
namespace
{

struct Fault {
    std::string function;
    long number = 0;
    std::function<void()> hook;
};

Fault &fault()
{
    static Fault current;
    return current;
}

bool fails(const char *function, int error)
{
    if (fault().function != function || --fault().number != 0) {
        return false;
    }
    fault().hook();
    errno = error;
    return true;
}

} // namespace

void plan_fault(const std::string &function, long number, std::function<void()> hook)
{
    fault() = {function, number, std::move(hook)};
}

} // namespace mini_xml

using namespace mini_xml;

extern "C" {

void *mx_malloc(size_t size)
{
    return fails(kMemory, ENOMEM) ? nullptr : std::malloc(size);
}

void *mx_calloc(size_t count, size_t size)
{
    return fails(kMemory, ENOMEM) ? nullptr : std::calloc(count, size);
}

void *mx_realloc(void *memory, size_t size)
{
    return fails(kMemory, ENOMEM) ? nullptr : std::realloc(memory, size);
}

char *mx_strdup(const char *text)
{
    return fails(kMemory, ENOMEM) ? nullptr : ::strdup(text);
}

ssize_t mx_read(int descriptor, void *buffer, size_t size)
{
    return fails(kRead, EIO) ? -1 : ::read(descriptor, buffer, size);
}

ssize_t mx_write(int descriptor, const void *data, size_t size)
{
    return fails(kWrite, ENOSPC) ? -1 : ::write(descriptor, data, size);
}

} // extern "C"
