// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What items report within moments that a run seldom meets.
#include "plan/parsed_plan.h"
#include "run/report_reader.h"

#include <gtest/gtest.h>

using namespace fptest;

namespace
{

constexpr int kGatherer = 2; // its element, after the XML declaration's and the group's

std::shared_ptr<const Plan> plan_with(const std::string &report)
{
    return ParsedPlan("<?xml version=\"1.0\"?><CmdGroup name=\"G\">"
                      "<Cmd name=\"SensorProbe\" " +
                      report + "/></CmdGroup>")
        .annotated();
}

TEST(ReportReader, KeepsAGatherersReportOfProgress100WhateverItReportsNext)
{
    fptest::Run run;
    run.suites = {{"G", std::vector<ItemRun>(1)}};
    run.suites[0].items[0].name = "SensorProbe";
    RunningJob running;
    running.items.emplace_back();
    running.items.back().element = kGatherer;
    running.items.back().gathers = true;
    running.items.back().reporting.gathering = true;
    ReportReader reader(run, {}, running);
    const ItemReport &report = run.suites[0].items[0].report;

    reader.read(plan_with("progress='50' result='1' description='half'"));
    EXPECT_EQ(report, (ItemReport{"50", "1", false, "half"}));
    reader.read(plan_with("progress='100' result='0' description='done'"));
    EXPECT_EQ(report, (ItemReport{"100", "0", false, "done"}));
    reader.read(plan_with("progress='0' result='-2' description='idle'"));
    EXPECT_EQ(report, (ItemReport{"100", "0", false, "done"}));
}

} // namespace
