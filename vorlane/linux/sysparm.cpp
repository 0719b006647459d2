/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/*
 * Parameter files on Linux: XML, a value being the text of the element that the
 * path leads to.
 */
#include "sysparm.h"

#include <mxml.h>
#include <stdio.h>
#include <string.h>

/* The first element of that name among a node and the siblings after it. */
static mxml_node_t *find_sibling(mxml_node_t *node, const char *name, size_t length)
{
    for (; node != nullptr; node = mxmlGetNextSibling(node)) {
        const char *element = mxmlGetElement(node);
        if (element != nullptr && strlen(element) == length &&
            strncmp(element, name, length) == 0) {
            return node;
        }
    }
    return nullptr;
}

static mxml_node_t *find_path(mxml_node_t *tree, const char *path)
{
    const char *top = mxmlGetElement(tree);
    mxml_node_t *node = tree;

    if (top != nullptr && strncmp(top, "?xml", 4) == 0) {
        node = mxmlGetFirstChild(tree);
    }
    for (;;) {
        const size_t length = strcspn(path, "/");
        node = find_sibling(node, path, length);
        path += length;
        if (node == nullptr || *path == '\0') {
            return node;
        }
        ++path;
        node = mxmlGetFirstChild(node);
    }
}

static const char *find_text(mxml_node_t *tree, const char *path)
{
    mxml_node_t *element = find_path(tree, path);

    return element != nullptr ? mxmlGetOpaque(element) : nullptr;
}

int get_node_value(const char *file, const char *path, char *buffer, size_t length)
{
    FILE *stream = fopen(file, "re");
    if (stream == nullptr) {
        return -1;
    }
    mxml_node_t *tree = mxmlLoadFile(nullptr, stream, MXML_OPAQUE_CALLBACK);
    fclose(stream);
    if (tree == nullptr) {
        return -1;
    }
    const char *text = find_text(tree, path);
    const int found = text != nullptr && length > 0;
    if (found) {
        snprintf(buffer, length, "%s", text);
    }
    mxmlDelete(tree);
    return found ? 0 : -1;
}
