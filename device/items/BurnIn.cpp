// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A sample item that takes long enough to be stopped; a stop is a plain SIGTERM.

#include "item.h"

#include <cstdio>

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    const Item item(argc, argv, "Runs the sensor warm, which takes its time.", 60s);
    constexpr int step = 5;

    for (int percent = 0; percent < 100; percent += step) {
        item.report(percent, Result::unfinished,
                    text(item.length() * percent / 100) + " of " + text(item.length()));
        item.work(step / 100.0);
    }
    std::puts("#measure drift 0.4 % - 2");
    return item.finish(Result::passed, "stable for " + text(item.length()));
}
