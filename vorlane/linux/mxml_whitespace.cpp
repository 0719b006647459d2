/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

#include "mxml_whitespace.h"

/* Debian's Mini-XML has no such switch: see the header for what that means. */
void mxmlSetLoneWhitespaceOff(int /* off */)
{
}
