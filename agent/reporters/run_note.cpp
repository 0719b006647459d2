// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "module/device_lock.h"
#include "reporters/wording.h"

#include <fmt/core.h>
#include <utility>

namespace fptest
{
namespace
{

class NoteReporter : public Reporter
{
  public:
    NoteReporter(const DeviceLock &lock, RunNote note) : lock_(lock), note_(std::move(note))
    {
    }

    void begin(const Run &run) override
    {
        for (const auto &[key, value] : run.identity.labels) {
            note_.labels += fmt::format("{}{}={}", note_.labels.empty() ? "" : " ", key, value);
        }
        tell(run, "");
    }

    void started(const Run &run, Place place) override
    {
        const ItemRun &item = item_at(run, place);
        note_.item_begun = std::chrono::steady_clock::now();
        tell(run,
             title(run, item) + (item.earlier.empty() ? "" : " (" + attempt_of(run, item) + ")"));
    }

    void ended(const Run &run, Place /* place */) override
    {
        tell(run, "");
    }

    void retried(const Run &run, Place place) override
    {
        ended(run, place);
    }

    void paused(const Run &run) override
    {
        note_.suspended = std::chrono::steady_clock::now();
        tell(run, note_.item);
    }

    void resumed(const Run &run) override
    {
        const auto away = std::chrono::steady_clock::now() - *note_.suspended;
        note_.begun += away;
        note_.item_begun += away;
        note_.suspended.reset();
        tell(run, note_.item);
    }

    void finish(const Run &run) override
    {
        tell(run, "");
    }

  private:
    void tell(const Run &run, const std::string &item)
    {
        const auto [passed, failed] = tally(count(run));
        note_.tally = passed + ", " + failed + tally_of_others(run);
        note_.item = item;
        lock_.tell(note_);
    }

    const DeviceLock &lock_;
    RunNote note_;
};

} // namespace

std::unique_ptr<Reporter> make_note_reporter(const DeviceLock &lock, RunNote note)
{
    return std::make_unique<NoteReporter>(lock, std::move(note));
}

} // namespace fptest
