/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The agent that the README shows, word for word. */
#include <quillmark.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>

int main(void)
{
    static char plan[65536];
    char reply[100];

    signal(SIGPIPE, SIG_IGN);
    FPTEST_RunTestCmd("XMLFile::<Plan><CmdGroup name=\"Bringup\">"
                      "<Cmd name=\"SpiCheck\" args=\"--group Bringup\"/>"
                      "</CmdGroup></Plan>",
                      NULL, 0);
    FPTEST_RunTestCmd("XMLNodePath::Plan/Bringup", reply, sizeof reply);
    memset(plan, 0, sizeof plan);
    FPTEST_ExtractResultMsg(plan, sizeof plan - 1);
    puts(plan);
    return 0;
}
