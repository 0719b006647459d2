// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the save puts around a node that is not an element.
#include "unit_test.h"

#include <memory>

namespace
{

class LayoutTest : public LibraryTest
{
};

TEST_F(LayoutTest, TextIsLaidOutAsAnElementInItsPlace)
{
    const std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)> top(mxmlNewElement(nullptr, "Plan"),
                                                                  mxmlDelete);
    mxml_node_t *group = mxmlNewElement(top.get(), "CmdGroup");
    mxml_node_t *text = mxmlNewText(group, 0, "?xml");
    ASSERT_EQ(mxmlGetElement(text), nullptr);

    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_BEFORE_OPEN), "\t");
    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_AFTER_OPEN), "\n");
    EXPECT_EQ(internals::whitespace_cb(text, MXML_WS_BEFORE_CLOSE), nullptr);
    EXPECT_STREQ(internals::whitespace_cb(text, MXML_WS_AFTER_CLOSE), "\n");
}

} // namespace
