// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The sample items and the gatherer, as they are run from a shell on the device.
#include "launcher_runner.h"

#include <algorithm>
#include <fstream>
#include <regex>

using namespace launcher;

namespace
{

// ---- the sample items -------------------------------------------------------

// A stored plan that every sample item is in, kept on the host.
class SampleItems : public Device
{
  protected:
    void SetUp() override
    {
        Device::SetUp();
        std::ofstream(kept.path() / "src1.xml")
            << "<?xml version=\"1.0\"?>\n<Plan><CmdGroup name=\"sensor\"><Cmd name=\"SpiCheck\"/>"
               "<Cmd name=\"DeadPixel\"/><Cmd name=\"FingerWait\"/><Cmd name=\"BurnIn\"/>"
               "<Cmd name=\"QuietRun\"/><Cmd name=\"SensorProbe\"/></CmdGroup></Plan>\n";
    }
    Outcome on_plan(const std::string &script) const
    {
        return shell(script, {"--data", kept.path()});
    }
    // What the plan says of an item: the attributes after its name.
    std::string report(const std::string &item) const
    {
        const std::string plan = read_file(kept.path() / "src1.xml");
        const std::string start = "<Cmd name=\"" + item + "\"";
        const auto begin = plan.find(start);
        const auto end = plan.find("/>", begin);
        if (begin == std::string::npos || end == std::string::npos) {
            return "not in the plan: " + plan;
        }
        std::string attributes = plan.substr(begin + start.size(), end - begin - start.size());
        std::ranges::replace(attributes, '\n', ' ');
        if (attributes.ends_with(' ')) {
            attributes.pop_back();
        }
        return attributes;
    }
    // The progress and the result of every report, in order, from the library's log.
    static Words reports(const Outcome &outcome)
    {
        static const std::regex line("iResult=(-?[0-9]+) - iProgress=([0-9]+) - iDesc=.+");
        Words found;
        for (const std::string &text : lines_of(outcome.err)) {
            std::smatch values;
            if (std::regex_search(text, values, line)) {
                found.push_back(values[2].str() + ":" + values[1].str());
            }
        }
        return found;
    }
    const TemporaryDirectory kept;
};

struct Sample {
    std::string item;
    int status = 0;
    Words reports;
    std::string last;
};

TEST_F(SampleItems, ReportTheirStepsAndEndAsTheyReport)
{
    const std::vector<Sample> samples = {
        {"SpiCheck",
         0,
         {"10:-2", "20:-2", "30:-2", "40:-2", "50:-2", "60:-2", "70:-2", "80:-2", "90:-2", "100:0"},
         " progress=\"100\" result=\"0\" description=\"chip 0x1a2b answers at 8 MHz\""},
        {"DeadPixel",
         1,
         {"0:-2", "100:1"},
         " progress=\"100\" result=\"1\" description=\"3 dead pixels, limit 2\""},
        {"FingerWait",
         1,
         {"0:-2", "100:-2"},
         " progress=\"100\" result=\"-2\" description=\"no finger within 0.05 s\""},
    };
    for (const Sample &sample : samples) {
        SCOPED_TRACE(sample.item);
        const Outcome outcome = on_plan(sample.item + " --group sensor --seconds 0.05");

        EXPECT_EQ(outcome.status, sample.status);
        EXPECT_EQ(reports(outcome), sample.reports);
        EXPECT_EQ(report(sample.item), sample.last);
    }
}

TEST_F(SampleItems, BurnInReportsNowAndThenAndPassesInTheEnd)
{
    const Outcome outcome = on_plan("BurnIn --group sensor --seconds 0.1");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(reports(outcome).size(), 21U);
    EXPECT_EQ(reports(outcome)[1], "5:-2");
    EXPECT_EQ(report("BurnIn"), " progress=\"100\" result=\"0\" description=\"stable for 0.1 s\"");
}

TEST_F(SampleItems, BurnInIsStillRunningAfterAWhileAndEndsBySigterm)
{
    const Outcome outcome = on_plan("BurnIn --group sensor 2>/dev/null & sleep 1; "
                                    "kill $! && wait $!; echo $?");

    EXPECT_EQ(outcome.out, "143\n");
    EXPECT_EQ(report("BurnIn"), " progress=\"0\" result=\"-2\" description=\"0 s of 60 s\"");
}

TEST_F(SampleItems, QuietRunNeverReports)
{
    const std::string before = read_file(kept.path() / "src1.xml");

    const Outcome outcome = on_plan("QuietRun --group sensor --seconds 0.05");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err.find("FPTEST_"), std::string::npos);
    EXPECT_EQ(read_file(kept.path() / "src1.xml"), before);
}

TEST_F(SampleItems, VendorVariantsReportUnderThePlansName)
{
    on_plan(
        "DeadPixel_ca --group sensor --seconds 0; FingerWait_ca_qsee --group sensor --seconds 0");

    EXPECT_NE(report("DeadPixel"), "");
    EXPECT_NE(report("FingerWait"), "");
}

TEST_F(SampleItems, ReportUnderTheNameGiven)
{
    on_plan("DeadPixel --group sensor --item QuietRun --seconds 0");

    EXPECT_EQ(report("DeadPixel"), "");
    EXPECT_NE(report("QuietRun"), "");
}

TEST_F(SampleItems, DoNotUndoEachOthersReports)
{
    on_plan("SpiCheck --group sensor --seconds 0.3 & sleep 0.1; "
            "DeadPixel --group sensor --seconds 0; wait");

    EXPECT_TRUE(report("SpiCheck").starts_with(" progress=\"100\""));
    EXPECT_TRUE(report("DeadPixel").starts_with(" progress=\"100\""));
}

TEST_F(SampleItems, WaitForWhoeverHasThePlanLocked)
{
    const Outcome outcome =
        on_plan("sh -c 'flock 9; sleep 1; echo unlocked' 9</data/vorlane/src1.xml & sleep 0.5; "
                "DeadPixel --group sensor --seconds 0; echo reported; wait");

    EXPECT_EQ(outcome.out, "unlocked\nreported\n");
}

TEST_F(SampleItems, LeaveAWholePlanWhenStopped)
{
    // thousandths of a second apart, so that some stops fall into a report
    on_plan("for i in 0 1 2 3 4 5 6 7 8 9; do BurnIn --group sensor --seconds 0.01 & "
            "sleep 0.00$i; kill $!; done; sleep 1");

    EXPECT_TRUE(read_file(kept.path() / "src1.xml").ends_with("</Plan>\n"));
}

TEST_F(SampleItems, SayInOneLineWhatIsWrongWithTheirOptions)
{
    const std::map<std::string, std::string> complaints = {
        {"SpiCheck", "SpiCheck: --group is required; see SpiCheck --help\n"},
        {"BurnIn_ca --group g --seconds -1",
         "BurnIn_ca: --seconds: wants a number from 0 to 86400; see BurnIn_ca --help\n"},
        {"SensorProbe --group g --seconds nan",
         "SensorProbe: --seconds: wants a number from 0 to 86400; see SensorProbe --help\n"},
        {"QuietRun --group g --speed 9",
         "QuietRun: The following arguments were not expected: 9 --speed; see QuietRun --help\n"},
    };
    for (const auto &[command, complaint] : complaints) {
        const Outcome outcome = on_plan(command);
        EXPECT_EQ(outcome.status, 1) << command;
        EXPECT_TRUE(outcome.err.ends_with(complaint)) << outcome.err;
        EXPECT_EQ(outcome.out, "");
    }
}

// Listens once on the library's port and says that.
std::string say(const std::string &text)
{
    return "printf '" + text + "' | timeout 5 netcat -l -p 34952 >/dev/null; ";
}

class Gatherer : public SampleItems
{
  protected:
    // Starts a gatherer, speaks to it, and gives it time to come to a gathering.
    Outcome after(const std::string &saying, const std::string &gathering) const
    {
        return on_plan("/system/bin/SensorProbe --group sensor --seconds 0.02 & " + saying +
                       "for i in 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17 18 19 20; do sleep 0.1; "
                       "grep -q '" +
                       gathering +
                       "' /data/vorlane/src1.xml && break; done; "
                       "ps | grep -c /system/bin/SensorProbe");
    }
    std::string complaint(const Outcome &outcome) const
    {
        std::string found;
        for (const std::string &line : lines_of(outcome.err)) {
            found += line.starts_with("SensorProbe: ") ? line + "\n" : "";
        }
        return found;
    }
};

TEST_F(Gatherer, GathersEachTimeItIsTold)
{
    const Outcome outcome = after(say("gather again!") + say("gather again!"), "gathering 2");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 2, 64 samples\"");
    EXPECT_TRUE(read_file(kept.path() / "readings.txt").starts_with("gatherings 2\n"));
}

TEST_F(Gatherer, DoesNothingUntilItIsTold)
{
    const Outcome outcome = after("", "no gathering at all");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(report("SensorProbe"), "");
    EXPECT_FALSE(fs::exists(kept.path() / "readings.txt"));
}

TEST_F(Gatherer, OutlivesATriggerThatIsCutShort)
{
    const Outcome outcome = after(say("gather") + say("gather again!"), "gathering 1");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "SensorProbe: the trigger ended after 6 of 13 bytes\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, OutlivesAWrongTrigger)
{
    const Outcome outcome = after(say("hello") + say("gather again!"), "gathering 1");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "SensorProbe: the trigger is not \"gather again!\"\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, PutsATriggerTogetherThatComesInPieces)
{
    EXPECT_EQ(after("(printf gather; sleep 0.1; printf ' again!') | "
                    "timeout 5 netcat -l -p 34952 >/dev/null; ",
                    "gathering 1")
                  .out,
              "1\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, OfVendorTwoGathersOnceAndEnds)
{
    EXPECT_EQ(on_plan("SensorProbe_ca_qsee --group sensor --seconds 0").status, 0);
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, ReportsThatItCannotWriteItsReadings)
{
    const Outcome outcome = on_plan("mkdir /data/vorlane/readings.txt; "
                                    "SensorProbe_ca_qsee --group sensor --seconds 0");

    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"1\" "
              "description=\"/data/vorlane/readings.txt cannot be written\"");
}

} // namespace
