// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Directories that items may leave files in, below the one that the user has named.
#pragma once

#include "run/results.h"

#include <string>

namespace fptest
{

// Why no directories can be made there, as in "files: Read-only file system"; empty if they
// can. Makes the directory itself.
std::string files_obstacle(const std::string &directory);

class ItemFiles
{
  public:
    // Below that directory; empty for none at all.
    explicit ItemFiles(std::string directory);
    ItemFiles(const ItemFiles &) = delete;
    ItemFiles &operator=(const ItemFiles &) = delete;
    ~ItemFiles();

    // Makes an empty one, which no other item has; the round is 0 if there is one only. The
    // gatherer, which may stay, keeps its first one. Returns its absolute path; empty if it
    // cannot be made, which is a warning.
    std::string make(ItemRun &item, int round, bool gathers);

    // Names what the item has left in it. One that is empty is removed.
    void settle(ItemRun &item, bool gathers) const;

  private:
    void remove_empty(const std::string &directory) const;

    std::string top_;
    std::string gatherers_;
};

// Warnings of an item are one text.
void add_warning(ItemRun &item, const std::string &text);

} // namespace fptest
