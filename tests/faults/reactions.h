// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How the events of a step with a fault, or after one, differ from those of the
// same step in the run without a fault.
//
// This says again what the library does when a call fails, because no rule that holds for
// every fault tells a wrong answer to one from the right one. Without it nothing here would
// notice a launch that leaves signals blocked, a read-back that gives up at the first
// failure, an item that is started twice, or any failure that is told wrongly or not at all.
#pragma once

#include "cycle.h"

#include "../unit/unit_test.h"

namespace faults
{

// The events without the numbers of descriptors.
Lines unnumbered(Lines events);
// The events without a sequence, wherever it is.
Lines without(Lines events, const Lines &sequence);
// The events but those of loads that could open the plan.
Lines without_loads(const Lines &events);

// The call at that place fails; a write that is cut stores that many bytes.
Lines failed(Lines events, std::size_t at, std::size_t cut);
// The copy of a node path fails.
Lines without_path(Lines events);
// The plan cannot be loaded wherever the step needs it: it cannot be opened, with
// that errno, or is refused if there is none.
Lines without_plan(Lines events, Step::Kind step, int error);
// Expects that each function that has begun tells how it has ended, when Mini-XML
// has lost part of the plan.
void check_ends(const Lines &events);

} // namespace faults
