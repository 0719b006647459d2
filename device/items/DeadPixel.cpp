// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A sample item that fails, with a description of what is wrong.

#include "item.h"

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    const Item item(argc, argv, "Counts the sensor's dead pixels, and finds too many.", 300ms);

    item.report(0, Result::unfinished, "counting");
    item.work(1);
    return item.finish(Result::failed, "3 dead pixels, limit 2");
}
