/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* An agent that can run anywhere: it starts nothing and writes nothing. */
#include <quillmark.h>
#include <stdio.h>

int main(void)
{
    char reply[100] = "";

    FPTEST_RunTestCmd("pingtest", reply, sizeof reply);
    puts(reply);
    return 0;
}
