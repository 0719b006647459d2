// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/rack.h"

#include <algorithm>
#include <map>
#include <set>
#include <utility>

namespace fptest
{
namespace
{

// The same item may be asked for several times.
using Column = std::pair<EarlierRun::Name, std::size_t>;

std::vector<Column> columns_of(const EarlierRun &run)
{
    std::map<EarlierRun::Name, std::size_t> times;
    std::vector<Column> columns;
    for (const EarlierRun::Name &name : run.items) {
        columns.emplace_back(name, times[name]++);
    }
    return columns;
}

const ItemRun *item_told(const EarlierRun &run, std::size_t index)
{
    const auto attempt = run.attempts.find(index);
    const auto unended = run.unended.find(index);
    const bool is_begun_again = unended != run.unended.end() && !run.ended.contains(index);
    return is_begun_again                  ? &unended->second
           : attempt != run.attempts.end() ? &attempt->second
                                           : nullptr;
}

// In each round that the lines tell of. Every round but the last one has all items.
std::vector<std::vector<RackEntry>> entries_of(const EarlierRun &run)
{
    static const ItemRun not_told;
    const std::size_t count = run.items.size();
    std::vector<std::vector<RackEntry>> entries(count);
    std::set<std::size_t> indices;
    for (const auto *items : {&run.attempts, &run.unended}) {
        for (const auto &[index, item] : *items) {
            indices.insert(index);
        }
    }
    for (const std::size_t index : indices) {
        entries[index % count].push_back({index, index / count + 1, item_told(run, index)});
    }
    const std::size_t last = indices.empty() ? 1 : *indices.rbegin() / count + 1;
    for (std::size_t item = 0; item < count; ++item) {
        std::vector<RackEntry> &rounds = entries[item];
        if (rounds.empty() || rounds.back().round < last) {
            rounds.push_back({(last - 1) * count + item, last, &not_told});
        }
    }
    return entries;
}

std::string device_of(const EarlierRun &run)
{
    for (const auto &[key, value] : run.run.identity.labels) {
        if (key == "device" && !value.empty()) {
            return value;
        }
    }
    return run.file;
}

std::string name_of(const EarlierRun &run, int detail)
{
    const std::string file = run.file.substr(detail > 1 ? 0 : run.file.rfind('/') + 1);
    return device_of(run) + (detail > 0 ? " (" + file + ")" : "");
}

// By their devices; those of one device by their files too, by whole paths if need be.
void name_rows(RackTable &table)
{
    for (RackRow &row : table.rows) {
        row.name = name_of(*row.run, 0);
    }
    for (const int detail : {1, 2}) {
        std::map<std::string, std::size_t> times;
        for (const RackRow &row : table.rows) {
            ++times[row.name];
        }
        for (RackRow &row : table.rows) {
            if (times[row.name] > 1) {
                row.name = name_of(*row.run, detail);
                table.is_of_devices = false;
            }
        }
    }
}

void place_cells(RackTable &table)
{
    std::map<Column, std::size_t> places;
    for (RackRow &row : table.rows) {
        std::vector<std::vector<RackEntry>> entries = entries_of(*row.run);
        const std::vector<Column> columns = columns_of(*row.run);
        for (std::size_t at = 0; at < columns.size(); ++at) {
            const std::size_t place = places.try_emplace(columns[at], places.size()).first->second;
            if (place == table.items.size()) {
                table.items.push_back(columns[at].first);
            }
            row.cells.resize(std::max(row.cells.size(), place + 1));
            row.cells[place] = std::move(entries[at]);
        }
    }
    for (RackRow &row : table.rows) {
        row.cells.resize(table.items.size());
    }
}

} // namespace

std::vector<RackTable> rack_tables(const std::vector<EarlierRun> &runs)
{
    std::vector<RackTable> tables;
    std::map<std::string, std::size_t> places;
    for (std::size_t at = 0; at < runs.size(); ++at) {
        const Run &run = runs[at].run;
        const std::string &digest = run.identity.plan_digest;
        const std::string plan = digest.empty() ? "file " + run.plan : digest;
        const std::size_t place = places.try_emplace(plan, tables.size()).first->second;
        if (place == tables.size()) {
            tables.push_back({run.plan, digest, {}, {}});
        }
        tables[place].rows.push_back({&runs[at], at + 1, "", {}});
    }
    for (RackTable &table : tables) {
        name_rows(table);
        place_cells(table);
    }
    return tables;
}

bool is_unfinished(const ItemRun &item)
{
    return item.outcome == Outcome::not_run && item.start;
}

} // namespace fptest
