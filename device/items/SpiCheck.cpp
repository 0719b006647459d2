// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A sample item that passes: it reports each of its ten steps.

#include "item.h"

#include <array>

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    constexpr std::array steps = {
        "resetting the sensor", "waking the bus",     "reading the chip id",
        "reading the revision", "writing a register", "reading it back",
        "clocking at 1 MHz",    "clocking at 8 MHz",  "raising the interrupt",
    };
    const Item item(argc, argv, "Checks the sensor's SPI bus in ten steps and passes.", 300ms);
    const double share = 1.0 / (steps.size() + 1);

    int progress = 0;
    for (const char *step : steps) {
        item.report(progress += 10, Result::unfinished, step);
        item.work(share);
    }
    item.work(share);
    return item.finish(Result::passed, "chip 0x1a2b answers at 8 MHz");
}
