// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A sample item that comes to no verdict: the finger it waits for never comes.

#include "item.h"

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    const Item item(argc, argv, "Waits for a finger, which never comes.", 300ms);

    item.report(0, Result::unfinished, "put a finger on the sensor");
    item.work(1);
    return item.finish(Result::unfinished, "no finger within " + text(item.length()));
}
