// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "stored_plan.h"

#include "files.h"
#include "plan.h"

#include <chrono>
#include <thread>

namespace fptest
{

std::string whole_stored_plan()
{
    std::string text;
    for (int tries = 0; tries < 20; ++tries) {
        text = read_file(kStoredPlan).value_or("");
        if (Plan::read(text) || Plan::load(text)) {
            break;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return text;
}

void mend_stored_plan()
{
    if (!mended(read_file(kStoredPlan).value_or(""))) {
        return;
    }
    const Descriptor lock = lock_stored_plan();
    if (const auto text = mended(whole_stored_plan())) {
        replace_stored_plan(*text);
    }
}

} // namespace fptest
