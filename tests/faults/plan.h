// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The test plans that the harness sends.
#pragma once

#include "model.h"

namespace faults
{

inline Node item(const std::string &name, const std::string &args)
{
    return {"Cmd", {{"name", name}, {"args", args}}, {}, {}};
}

// A text, a comment, lone white space, and names and values that outgrow the
// buffers in which Mini-XML gathers them.
inline Node first_plan()
{
    const std::string pattern =
        "--pattern checkerboard --rounds 16 --threshold 40 --settle 250 --keep";
    const Node text{{}, {}, {}, "morning"};
    const Node note{"Note", {}, {text}, {}};
    const Node bringup{
        "CmdGroup",
        {{"name", "Bringup"}},
        {item("SpiCheck", "--clock 8"), item("SensorProbe", ""), item("PatternTest", pattern)},
        {}};
    const Node image{"CmdGroup", {{"name", "Image"}}, {item("DeadPixels", "--limit 3")}, {}};
    const Node root{"TestPlan", {}, {note, bringup, image}, {}};
    const Node comment{
        "!-- sensor board revision B, bring-up and image quality, morning run --", {}, {}, {}};
    return {"?xml version=\"1.0\" encoding=\"UTF-8\"?", {}, {comment, root}, {}};
}

// Shorter than the first, and ends inside its root: over a file that could not
// be removed it makes a document that Mini-XML refuses.
inline Node second_plan()
{
    const Node group{"CmdGroup", {{"name", "Bringup"}}, {item("SpiCheck", "")}, {}};
    const Node root{"TestPlan", {}, {group}, {}};
    const Node comment{"!-- the same board after a repair of its supply --", {}, {}, {}};
    return {"?xml version=\"1.0\"?", {}, {comment, root}, {}};
}

} // namespace faults
