// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "mini_xml.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <map>
#include <unistd.h>

namespace mini_xml
{
namespace
{

struct State {
    std::string function;
    long number = 0;
    std::map<std::string, long> calls;
    bool met = false;
    std::string met_in;
};

State &state()
{
    static State current;
    return current;
}

bool fails(const std::string &function, const std::string &what, int error)
{
    const bool now = ++state().calls[function] == state().number && function == state().function;
    if (now) {
        state().met = true;
        state().met_in = what;
        errno = error;
    }
    return now;
}

bool memory_fails(const std::string &what)
{
    return fails(kMemory, what, ENOMEM);
}

} // namespace

void plan_fault(const std::string &function, long number)
{
    state() = {function, number, {}, false, {}};
}

bool met()
{
    return state().met;
}

const std::string &met_in()
{
    return state().met_in;
}

} // namespace mini_xml

using namespace mini_xml;

extern "C" {

void *mx_malloc(size_t size)
{
    return memory_fails("malloc(" + std::to_string(size) + ")") ? nullptr : std::malloc(size);
}

void *mx_calloc(size_t count, size_t size)
{
    return memory_fails("calloc") ? nullptr : std::calloc(count, size);
}

void *mx_realloc(void *memory, size_t size)
{
    return memory_fails("realloc(" + std::to_string(size) + ")") ? nullptr
                                                                 : std::realloc(memory, size);
}

char *mx_strdup(const char *text)
{
    return memory_fails(std::string("strdup(") + text + ")") ? nullptr : ::strdup(text);
}

ssize_t mx_read(int descriptor, void *buffer, size_t size)
{
    return fails(kRead, "", EIO) ? -1 : ::read(descriptor, buffer, size);
}

ssize_t mx_write(int descriptor, const void *data, size_t size)
{
    return fails(kWrite, "", ENOSPC) ? -1 : ::write(descriptor, data, size);
}

} // extern "C"
