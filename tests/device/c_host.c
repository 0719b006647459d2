/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* A host agent in C: pings the library twice and says what it got. */
#include "quillmark.h"

#include <stdio.h>

int main(void)
{
    char first[64] = "";
    char second[64] = "";
    fpTest_TestMsg_t message;
    int codes = FPTEST_RunTestCmd("pingtest", first, (int)sizeof first) +
                FPTEST_RunTestCmd("pingtest", second, (int)sizeof second);

    printf("%d <%s> <%s> %d %d %d %s\n", codes, first, second, (int)sizeof message.testMsgHead,
           (int)sizeof message.testMsgName, (int)sizeof message.testMsgArgs,
           g_TestCmdTree == NULL ? "no plan" : "a plan");
    return 0;
}
