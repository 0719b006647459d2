// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The stored plan, into which items report while it is read.
#pragma once

#include "common/descriptor.h"
#include "plan/plan.h"

#include <chrono>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <vector>

namespace fptest
{

// What is said of a plan that nobody can report into any more.
inline constexpr char kPlanLost[] = "is gone, or not whole any more";

// Its text as it is; nothing where it cannot be read, errno then says why.
std::optional<std::string> read_stored_plan();

// Its text; throws a Failure where it cannot be read. What to do where there is none is
// added to "no plan is stored in ...".
std::string require_stored_plan(const std::string &what_to_do);

// The status of its file; nullopt if there is no regular file.
std::optional<struct stat> stored_plan_status();

// Throws a Failure where something else is in its place, such as a FIFO: whoever opened
// that could wait for ever.
void require_regular_plan();

// What is made of its text. That is read again for a while where nothing can be made of
// it: somebody may just be writing it.
template <typename Make> auto made_of_stored_plan(std::string &text, const Make &make)
{
    using Clock = std::chrono::steady_clock;
    const auto begin = Clock::now();
    for (int tries = 1;; ++tries) {
        text = read_stored_plan().value_or("");
        auto made = make(text);
        // of a large one that is damaged each try takes its time
        if (made || (tries > 1 && Clock::now() - begin > std::chrono::milliseconds(500))) {
            return made;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

struct StoredPlan {
    std::string text;
    std::optional<Plan> annotated; // nothing where it is not whole
    bool is_usable = false;        // it is whole, or loads
};

// One that is not whole, and does not load, is read again for half a second.
StoredPlan whole_stored_plan();

// Makes one load again that a report has spoiled, so that the next items can
// report: a result that the library has no text for, or a null description, is left
// without a value, and control characters and bytes that are no UTF-8 are kept as
// they came. Throws a Failure where it cannot be written.
void mend_stored_plan();

// The lock that those who report take on the stored plan, so that none writes
// what another has just overwritten. Waits for it, 10 seconds at most, and goes on without
// it then. A plan that is not there needs none.
Descriptor lock_stored_plan();

// Puts another text in the stored plan's place, whole or not at all; the caller holds the
// lock. Throws a Failure if it cannot.
void replace_stored_plan(const std::string &text);

// The same, under the lock: for a plan that is longer than what a command stores.
void store_as_file(const std::string &text);

// Throws a Failure if the library has not stored the text.
void require_stored(const std::string &found, const std::string &wanted);

// Removes what these elements have reported, so that only this run counts. Returns the mark
// that they bear from now on: a report that is written back from an old copy lacks it. It
// is empty if nothing had to be removed and the plan cannot be marked: it is not
// well-formed, or the disk is full. Otherwise throws a Failure.
std::string clear_reports(const std::vector<std::size_t> &elements);

// Clears these elements and gives them their mark again; does nothing if the disk is full.
void mark_again(const std::vector<std::size_t> &elements, const std::string &mark);

// If the disk is full, the marks stay, and the next run replaces them.
void remove_marks();

} // namespace fptest
