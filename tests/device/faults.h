// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the tests share of what the surroundings do to a host: the faults, and what is
// logged of a command whether it meets one or not.
#pragma once

#include "device_test.h"
#include "support/process.h"
#include "support/sequences.h"
#include "support/this_process.h"

#include <cstddef>
#include <optional>
#include <string>

namespace device
{

// A gatherer that is asked for help says it and ends, and connects nowhere.
inline const std::string kPlan = group_of({{"Note", "x"}, {"SensorProbe", "--help"}});

// The plan as it is saved after a report on Note.
std::string saved_plan(int progress, const std::string &description);

// Loads the plan and changes nothing.
void load_plan();

void report(int progress, const std::string &description);

// --- what is logged ----------------------------------------------------------

using namespace sequences;

// The log lines of a sequence, as log_lines has them.
Lines logged(const Lines &sequence);

// Of a store, which may fail.
Lines lines_of_store(const std::string &plan, const Lines &failure = {});

inline const Lines kNotAsked = queried(std::nullopt); // whether a gatherer runs
Lines lines_of_note(const Lines &query = queried(), const std::string &args = "x");
// Where there is no plan to be loaded.
Lines lines_of_unloaded_note(const Lines &loading = {});
// Of a gatherer that was not running.
Lines lines_of_gatherer(const std::string &args, const Lines &query, const Lines &trigger);

inline const Lines kTriggered = logged(told());

Lines lines_of_report(int progress, const std::string &description, const Lines &saving = saved());
Lines lines_of_unloaded_report(int progress, const std::string &description,
                               const Lines &loading = {});

Lines lines_of_read_back(std::size_t size);

// What is logged of it now.
Lines log_of_store(const std::string &plan);
Lines log_of_note();
Lines log_of_report(int progress, const std::string &description);

// --- faults ------------------------------------------------------------------

// A host beside the test's own process.
using OtherHost = support::Process;

using support::Limit;

// Mounts of this process alone. It needs no privilege for them, only a user
// namespace of its own.
class PrivateMounts : public DeviceTest
{
  protected:
    void SetUp() override;
    void TearDown() override;

    void mount_over(const std::string &target, const std::string &source);
    static void remount(const std::string &target, unsigned long flags);

  private:
    Lines mounted_;
};

} // namespace device
