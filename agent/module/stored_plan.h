// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The stored plan, into which items report at any time.
#pragma once

#include "common/descriptor.h"
#include "plan/parsed_plan.h"
#include "plan/plan.h"

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <vector>

namespace fptest
{

// What is said of a plan that nobody can report into any more.
inline constexpr char kPlanLost[] = "is gone or damaged";

// Its text; nullopt if it cannot be read, with the reason in errno.
std::optional<std::string> read_stored_plan();

// Its text; throws a Failure if it cannot be read. The advice is added to "no plan is stored
// in ...".
std::string require_stored_plan(const std::string &what_to_do);

// The status of its file; nullopt if there is no regular file.
std::optional<struct stat> stored_plan_status();

// Throws a Failure if something else is in its place: opening a FIFO could block for ever.
void require_regular_plan();

// Throws a Failure if the disk has no room for a stored plan of that size.
void require_room(std::size_t bytes);

// How long a text that is not whole is read again: somebody may be writing it.
inline constexpr std::chrono::milliseconds kForWholePlan{500};

// What make() returns for the text that read() does. As long as that is empty, it is read again.
template <typename Make, typename Read = decltype(&read_stored_plan)>
auto made_of_stored_plan(std::string &text, const Make &make,
                         std::chrono::milliseconds patience = kForWholePlan,
                         const Read &read = read_stored_plan)
{
    using Clock = std::chrono::steady_clock;
    const auto begin = Clock::now();
    for (int tries = 1;; ++tries) {
        text = read().value_or("");
        auto made = make(text);
        // each try takes long if the plan is large and damaged
        if (made || (tries > 1 && Clock::now() - begin > patience)) {
            return made;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

// Its text as it is now, empty if it cannot be read; parsed if it is another one than the last
// time. Good until the next call of a function of this file.
const ParsedPlan &parse_stored_plan();

struct StoredPlan {
    std::string text;
    std::shared_ptr<const Plan> annotated; // null if it is not whole
    bool is_usable = false;                // it is whole, or loads
};

// Reads it again if it is not usable.
StoredPlan whole_stored_plan(std::chrono::milliseconds patience = kForWholePlan);

// Makes it load again after a report that spoiled it, so that the next items can report: the
// library writes a result that it has no text for, and a null description, without a value,
// and keeps control characters and invalid UTF-8. Throws a Failure if it cannot be written.
void mend_stored_plan();

// Undoes a save that was cut short: puts back what was read before it. False if the plan is not
// cut but gone or another text, or cannot be written.
bool restore_stored_plan();

// The lock that fptest and the sample items take on the stored plan, so that no report of
// theirs undoes another; the library itself takes none. Goes on without it after 10 seconds, or if
// there is no plan.
Descriptor lock_stored_plan();

// Puts another text in the stored plan's place, whole or not at all; the caller holds the
// lock. Throws a Failure if it cannot.
void replace_stored_plan(const std::string &text);

// Puts in the stored plan's place what make() makes of it, under the lock, and returns that; the
// text it was made of goes to the first argument. The library takes no lock: where an item has
// saved the file that was replaced, its text is made anew. As made_of_stored_plan(); throws as
// replace_stored_plan().
using MakePlan = std::function<std::optional<std::string>(const std::string &)>;
std::optional<std::string> remake_stored_plan(std::string &text, const MakePlan &make);

// The text in its place, under the lock: for a plan that is longer than what a command stores.
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
