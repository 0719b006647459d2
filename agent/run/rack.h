// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Runs beside each other, as those of a rack's devices: a table for each plan, of runs by
// items.
#pragma once

#include "run/earlier_run.h"

#include <cstddef>
#include <string>
#include <vector>

namespace fptest
{

// An item in one round. The run must outlive it.
struct RackEntry {
    std::size_t index = 0; // in the run
    std::size_t round = 1;
    const ItemRun *item = nullptr;
};

struct RackRow {
    const EarlierRun *run = nullptr;
    std::size_t number = 0;                    // of the run, from 1
    std::string name;                          // its device, or its file
    std::vector<std::vector<RackEntry>> cells; // by item, its rounds; none if it was not asked for
};

struct RackTable {
    std::string plan;
    std::string digest;
    std::vector<EarlierRun::Name> items; // of all rows
    std::vector<RackRow> rows;
    bool is_of_devices = true; // each row another one
};

std::vector<RackTable> rack_tables(const std::vector<EarlierRun> &runs);

// Whether it runs to the last line.
bool is_unfinished(const ItemRun &item);

} // namespace fptest
