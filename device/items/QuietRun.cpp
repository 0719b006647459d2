// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A sample item that runs, passes and never reports.

#include "item.h"

int main(int argc, char **argv)
{
    using namespace std::chrono_literals;
    const Item item(argc, argv, "Runs and never reports.", 300ms);

    item.work(1);
    return 0;
}
