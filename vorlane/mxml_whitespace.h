/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The platform's addition to Mini-XML. */
#ifndef VORLANE_MXML_WHITESPACE_H
#define VORLANE_MXML_WHITESPACE_H

#ifdef __cplusplus
extern "C" {
#endif

/*
 * With off = 1, documents loaded from then on get no text node for white space
 * that stands alone between tags; with 0 they get it again.
 *
 * The stock library has no such switch. Where it is missing this call has no
 * effect, and whoever loads a document removes those nodes from the tree.
 */
void mxmlSetLoneWhitespaceOff(int off);

#ifdef __cplusplus
}
#endif

#endif
