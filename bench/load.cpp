// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"
#include "plan.h"

#include "common/descriptor.h"
#include "tests/unit/internals.h"

#include <fcntl.h>
#include <memory>
#include <mxml.h>
#include <stdexcept>

namespace bench
{
namespace
{

constexpr double kLimit = 1.15;

mxml_node_t *open_load_close(int /* open_file */)
{
    const int fd = open(kPlanPath, O_RDONLY);
    mxml_node_t *tree = mxmlLoadFd(nullptr, fd, nullptr);
    close(fd);
    return tree;
}

mxml_node_t *load_alone(int open_file)
{
    return mxmlLoadFd(nullptr, open_file, nullptr);
}

// The elements alone: the white space between them is the library's to remove.
std::string names_in(mxml_node_t *tree)
{
    std::string names;
    for (mxml_node_t *node = tree; node != nullptr; node = mxmlWalkNext(node, tree, MXML_DESCEND)) {
        const char *name = mxmlElementGetAttr(node, "name");
        names += name != nullptr ? std::string(name) + "\n" : "";
    }
    return names;
}

struct Loaded {
    Descriptor file{-1};
    mxml_node_t *tree = nullptr;
    mxml_node_t *bare = nullptr;
};

Comparison load(const std::string &name, double limit, int items, mxml_node_t *(*bare_load)(int))
{
    const auto loaded = std::make_shared<Loaded>();
    return {.name = name,
            .limit = limit,
            .seconds = 0.2,
            .prepare =
                [=] {
                    internals::reset();
                    write_plan(fresh_plan(items));
                    loaded->file = Descriptor(open(kPlanPath, O_RDONLY | O_CLOEXEC));
                },
            .library = [=] { loaded->tree = internals::load_configs_file(kPlanPath); },
            .baseline = [=] { loaded->tree = loaded->bare = bare_load(loaded->file.get()); },
            .clear =
                [=] {
                    internals::reset();
                    mxmlDelete(loaded->bare);
                    loaded->tree = loaded->bare = nullptr;
                    lseek(loaded->file.get(), 0, SEEK_SET);
                },
            .outcome = [=] { return names_in(loaded->tree); }};
}

// Of each item in turn, in a plan that the library has loaded. Without a baseline:
// what the search costs is a curve of its own.
Comparison lookup(int items, void (*look_up)(mxml_node_t *tree, int index, const char *name))
{
    const auto tree = std::make_shared<mxml_node_t *>();
    return {.name = "lookup",
            .calls = items > 100 ? 8 : 64,
            .prepare =
                [=] {
                    internals::reset();
                    write_plan(fresh_plan(items));
                    *tree = internals::load_configs_file(kPlanPath);
                    if (*tree == nullptr) {
                        throw std::runtime_error(std::string(kPlanPath) +
                                                 ": the library has not loaded it");
                    }
                },
            .library =
                [=, places = Places(items)]() mutable {
                    const auto &[index, name] = places.next();
                    look_up(*tree, index, name.c_str());
                }};
}

} // namespace

Comparison first_load(int items)
{
    return load("first load, " + grouped(items) + " items", kLimit, items, open_load_close);
}

Comparison first_load_to_parser(int items)
{
    const double limit = items < 1000 ? 0 : kLimit; // of a small plan, open is most of it
    return load("  " + grouped(items) + ", mxmlLoadFd alone", limit, items, load_alone);
}

Comparison lookup_by_name(int items)
{
    return lookup(items, [](mxml_node_t * /* tree */, int /* index */, const char *name) {
        internals::get_node_index(kGroup, name, 3);
    });
}

Comparison lookup_by_position(int items)
{
    return lookup(items, [](mxml_node_t *tree, int index, const char * /* name */) {
        internals::get_node_byIndex(tree, kGroup, index);
    });
}

Comparison search(int items)
{
    return lookup(items, [](mxml_node_t *tree, int /* index */, const char *name) {
        mxmlFindElement(tree, tree, "Cmd", "name", name, MXML_DESCEND);
    });
}

} // namespace bench
