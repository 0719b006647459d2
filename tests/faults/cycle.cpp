// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cycle.h"

#include "quillmark.h"

namespace faults
{
namespace
{

using Kind = Step::Kind;

constexpr std::size_t kReply = 64;

// A text, a comment, lone white space, and names and values that outgrow the
// buffers in which Mini-XML gathers them.
constexpr char kFirstPlan[] = R"(<?xml version="1.0" encoding="UTF-8"?>
<!-- sensor board revision B, bring-up and image quality, morning run -->
<TestPlan>
<Note>morning</Note>
<CmdGroup name="Bringup">
<Cmd name="SpiCheck" args="--clock 8"/>
<Cmd name="SensorProbe" args=""/>
<Cmd name="PatternTest" args="--pattern checkerboard --rounds 16 --threshold 40 --settle 250 --keep"/>
</CmdGroup>
<CmdGroup name="Image">
<Cmd name="DeadPixels" args="--limit 3"/>
</CmdGroup>
</TestPlan>)";

// Shorter than the first, and ends inside its root: over a file that could not
// be removed it makes a document that Mini-XML refuses. The item is the first
// plan's, so that it runs in the same way if this plan could not be stored.
constexpr char kSecondPlan[] = R"(<?xml version="1.0"?>
<!-- the same board after a repair of its supply -->
<TestPlan>
<CmdGroup name="Bringup">
<Cmd name="SpiCheck" args="--clock 8"/>
</CmdGroup>
</TestPlan>)";

Step store(const std::string &name, const std::string &plan)
{
    Step step = command(Kind::Store, name, "XMLFile::" + plan);
    step.text = plan;
    return step;
}

Step item(const std::string &path, const std::string &listed = "")
{
    Step step = command(Kind::Item, path, "XMLNodePath::plan/" + path);
    step.output = listed;
    return step;
}

Step report(const std::string &group, const std::string &item, int progress,
            const std::string &description)
{
    return {Kind::Report, "report on " + item, description, "", [=](char *) {
                return FPTEST_SetTransation(group.c_str(), item.c_str(), progress, 0,
                                            description.c_str());
            }};
}

Step read_back()
{
    return {Kind::ReadBack, "read-back", "", "", [](char *buffer) {
                FPTEST_ExtractResultMsg(buffer, kBuffer);
                return 0;
            }};
}

} // namespace

Step command(Kind kind, const std::string &name, const std::string &text)
{
    return {kind, name, "", "",
            [text](char *buffer) { return FPTEST_RunTestCmd(text.c_str(), buffer, kReply); }};
}

const std::vector<Step> &cycle()
{
    static const std::vector<Step> steps = {
        command(Kind::Ping, "ping", "pingtest"),
        {Kind::Nothing, "null command", "", "",
         [](char *buffer) { return FPTEST_RunTestCmd(nullptr, buffer, kReply); }},
        store("first plan", kFirstPlan),
        command(Kind::Group, "group", "XMLNodePath::plan/Bringup"),
        item("Image/DeadPixels"),
        item("Bringup/SensorProbe", "root 77 /system/bin/SensorProbe\n"),
        report("Bringup", "PatternTest", 50, "half way"),
        report("Image", "DeadPixels", 100, "none"),
        report("Bringup", "PatternTest", 100, "passed"),
        read_back(),
        {Kind::Stop, "stop", "", "USER PID NAME\nroot 78 SensorProbe\n",
         [](char *) { return FPTEST_SuspendItemExecute(); }},
        store("second plan", kSecondPlan),
        read_back(),
        item("Bringup/SpiCheck"),
        report("Bringup", "SpiCheck", 7, "warm"),
        read_back(),
    };
    return steps;
}

std::string replied(const std::optional<std::string> &reply)
{
    std::string buffer(kBuffer, kUntouched);
    if (reply) {
        buffer.replace(0, kReply, *reply + std::string(kReply - reply->size(), '\0'));
    }
    return buffer;
}

std::string read_back(const std::string &text)
{
    return text + std::string(kBuffer - text.size(), kUntouched);
}

} // namespace faults
