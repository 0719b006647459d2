// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The stored plan, into which items report while it is read.
#pragma once

#include "common/descriptor.h"
#include "plan/plan.h"

#include <chrono>
#include <optional>
#include <string>
#include <thread>

namespace fptest
{

// Its text as it is; nothing where it cannot be read, errno then says why.
std::optional<std::string> read_stored_plan();

// Its text; throws a Failure where it cannot be read. What to do where there is none is
// added to "no plan is stored in ...".
std::string require_stored_plan(const std::string &what_to_do);

// Throws a Failure where the plan found is not the one that was to be stored.
void require_stored(const std::string &found, const std::string &wanted);

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

// Puts another text in the stored plan's place, whole or not at all. Throws a
// Failure where it cannot.
void replace_stored_plan(const std::string &text);

} // namespace fptest
