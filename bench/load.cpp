// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "figures.h"
#include "plan.h"
#include "unit.h"

#include "common/descriptor.h"

#include <fcntl.h>
#include <mxml.h>
#include <stdexcept>

namespace bench
{
namespace
{

constexpr double kLimit = 1.15;

// Which floor: what a load needs, or Mini-XML's part of it.
enum class Floor { open_load_close, load_alone };

class FirstLoad : public Contest
{
  public:
    FirstLoad(std::string name, double limit, int items, Floor floor)
        : Contest(std::move(name), limit, 1, 0.2), items_(items), floor_(floor)
    {
    }
    void prepare() override
    {
        write_plan(fresh_plan(items_));
        file_ = Descriptor(open(kPlanPath, O_RDONLY | O_CLOEXEC));
    }
    void module(int /* calls */) override
    {
        tree_ = unit::load_configs_file(kPlanPath);
    }
    void floor(int /* calls */) override
    {
        if (floor_ == Floor::load_alone) {
            bare_ = mxmlLoadFd(nullptr, file_.get(), nullptr);
        } else {
            const int fd = open(kPlanPath, O_RDONLY);
            bare_ = mxmlLoadFd(nullptr, fd, nullptr);
            close(fd);
        }
        tree_ = bare_;
    }
    void clear() override
    {
        unit::drop();
        mxmlDelete(bare_);
        tree_ = bare_ = nullptr;
        lseek(file_.get(), 0, SEEK_SET);
    }
    // The elements alone: the white space between them is the library's to remove.
    std::string outcome() override
    {
        std::string names;
        for (mxml_node_t *node = tree_; node != nullptr;
             node = mxmlWalkNext(node, tree_, MXML_DESCEND)) {
            const char *name = mxmlElementGetAttr(node, "name");
            names += name != nullptr ? std::string(name) + "\n" : "";
        }
        return names;
    }

  private:
    int items_;
    Floor floor_;
    Descriptor file_{-1};
    mxml_node_t *tree_ = nullptr;
    mxml_node_t *bare_ = nullptr;
};

// Lookups in a plan that the library has loaded, of each item in turn.
class Lookup : public Contest
{
  public:
    Lookup(const std::string &name, int items)
        : Contest(name + ", " + grouped(items) + " items", 0, items > 100 ? 8 : 64, 0.05),
          places_(items), items_(items)
    {
    }
    ~Lookup() override
    {
        unit::drop();
    }
    void prepare() override
    {
        write_plan(fresh_plan(items_));
        tree_ = unit::load_configs_file(kPlanPath);
        if (tree_ == nullptr) {
            throw std::runtime_error(std::string(kPlanPath) + ": the library has not loaded it");
        }
        for (int index = 0; index < items_; ++index) {
            names_.push_back(item_name(index));
        }
    }
    // None: what the search costs is a curve of its own.
    void floor(int /* calls */) override
    {
    }

  protected:
    [[nodiscard]] mxml_node_t *tree() const
    {
        return tree_;
    }
    int next()
    {
        return places_.next();
    }
    [[nodiscard]] const char *name(int index) const
    {
        return names_.at(static_cast<std::size_t>(index)).c_str();
    }

  private:
    Places places_;
    int items_;
    mxml_node_t *tree_ = nullptr;
    std::vector<std::string> names_;
};

class LookupByName : public Lookup
{
  public:
    explicit LookupByName(int items) : Lookup("lookup by name", items)
    {
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            unit::get_node_index(kGroup, name(next()));
        }
    }
};

class LookupByPosition : public Lookup
{
  public:
    explicit LookupByPosition(int items) : Lookup("lookup by position", items)
    {
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            unit::get_node_byIndex(tree(), kGroup, next());
        }
    }
};

class Search : public Lookup
{
  public:
    explicit Search(int items) : Lookup("document search", items)
    {
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            mxmlFindElement(tree(), tree(), "Cmd", "name", name(next()), MXML_DESCEND);
        }
    }
};

} // namespace

std::unique_ptr<Contest> first_load(int items)
{
    return std::make_unique<FirstLoad>("first load, " + grouped(items) + " items", kLimit, items,
                                       Floor::open_load_close);
}

std::unique_ptr<Contest> first_load_to_parser(int items)
{
    const double limit = items < 1000 ? 0 : kLimit; // of a small plan, open is most of it
    return std::make_unique<FirstLoad>("  " + grouped(items) + ", mxmlLoadFd alone", limit, items,
                                       Floor::load_alone);
}

std::unique_ptr<Contest> lookup_by_name(int items)
{
    return std::make_unique<LookupByName>(items);
}

std::unique_ptr<Contest> lookup_by_position(int items)
{
    return std::make_unique<LookupByPosition>(items);
}

std::unique_ptr<Contest> search(int items)
{
    return std::make_unique<Search>(items);
}

} // namespace bench
