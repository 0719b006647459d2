// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The suspension: the item last started is looked up in the process list and
// killed.
#include "unit_test.h"

#include <algorithm>
#include <cerrno>

namespace
{

constexpr char kHeader[] = "USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME\n";
constexpr char kProcess[] = "root     4711  1     123456 789     ffffffff 00000000 S item\n";

class Suspension : public LibraryTest
{
  protected:
    // Makes the item with that name the one last started.
    static void start_item(const std::string &name)
    {
        platform::write_plan(plan_of(cmd(name)));
        plan_steps("popen", {gives(0)}); // no presence query: the next stream is the first
        run_quietly("XMLNodePath::P/g");
    }

    static Lines popened(const std::string &name)
    {
        return {"FPTEST_SuspendItemExecute| enter... !\n", "popen(ps " + name + ", r) = stream#1"};
    }
    static std::string line_read(const std::string &line)
    {
        return "fgets(stream#1, 513) = \"" + line + "\"";
    }
    static Lines listed(const std::string &name, const std::string &process)
    {
        return popened(name) + line_read(kHeader) + line_read(process);
    }
    static Lines found(const std::string &pid)
    {
        return {"FPTEST_SuspendItemExecute| pid = " + pid + "\n"};
    }

    // What becomes of a listing in the launcher's child, which shows the command.
    static Lines child(const std::string &listing)
    {
        platform::plan_output({listing});
        plan_steps("vfork", {gives(0)});
        platform::run_child([] { FPTEST_SuspendItemExecute(); });
        return events();
    }
    // The name that reaches the process listing.
    static std::string listed_name(const std::string &item)
    {
        start_item(item);
        FPTEST_SuspendItemExecute();
        const std::string call = events()[1];
        const std::string start = "popen(ps ";
        EXPECT_EQ(call.substr(0, start.size()), start);
        return call.substr(start.size(), call.find(", r) =") - start.size());
    }
};

TEST_F(Suspension, FirstListedProcessOfTheItemIsKilledInTheBackground)
{
    start_item("item");
    platform::plan_output({std::string(kHeader) + kProcess});

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(events(), listed("item", kProcess) + found("4711") + launch());
    EXPECT_THAT(left_open(), ElementsAre("stream#1"));
}

TEST_F(Suspension, KillCommandNamesNineAndTheFirstProcessAlone)
{
    start_item("item");
    EXPECT_EQ(child(std::string(kHeader) + kProcess + "root 4712 1 item\nroot 4713 1 item\n"),
              listed("item", kProcess) + found("4711") + launched("kill 9 4711"));
}

TEST_F(Suspension, NameIsListedByItsFirstTwentyEightCharacters)
{
    const std::string name = "abcdefghijklmnopqrstuvwxyz01" + std::string(72, 'n');
    for (const std::size_t length : {1U, 27U, 28U, 29U, 64U, 100U}) {
        SetUp();
        EXPECT_EQ(listed_name(name.substr(0, length)),
                  name.substr(0, std::min<std::size_t>(length, 28)));
    }
}

TEST_F(Suspension, NameIsListedWithoutTheVendorsSuffix)
{
    platform::state().vendor = "1";
    EXPECT_EQ(listed_name("item"), "item");
    SetUp();
    platform::state().vendor = "2";
    EXPECT_EQ(listed_name("SensorProbe"), "SensorProbe");
}

TEST_F(Suspension, ListingThatCannotBeStartedIsAFailure)
{
    start_item("item");
    plan_steps("popen", {gives(0, EMFILE)});

    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(events(),
                ElementsAre("FPTEST_SuspendItemExecute| enter... !\n", "popen(ps item, r) = null",
                            "FPTEST_SuspendItemExecute| popen error!\n"));
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(Suspension, ListingWithoutAProcessIsAFailureAndStaysOpen)
{
    for (const std::string header : {"", kHeader}) {
        SetUp();
        start_item("item");
        platform::plan_output({header});

        EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
        EXPECT_EQ(events(), popened("item") +
                                (header.empty() ? Lines() : Lines{line_read(header)}) +
                                "fgets(stream#1, 513) = null" +
                                "FPTEST_SuspendItemExecute| target process not exist!\n");
        EXPECT_THAT(left_open(), ElementsAre("stream#1"));
    }
}

TEST_F(Suspension, SecondColumnBetweenBlanksIsTheProcessAndNullWhereThereIsNone)
{
    const std::string text = every_character_but(" \n");
    const std::string digits = "123456789012345678901234"; // what the command holds
    for (const auto &[process, pid] : std::initializer_list<std::pair<std::string, std::string>>{
             {"root 1 0 /init\n", "1"},
             {"root 42 1 item\n", "42"},
             {"   root      42      1 item\n", "42"},
             {"root 42", "42"},
             {"ro\tot 42\t1 item\n", "42\t1"},
             {"root 42\n", "42\n"},
             {"root,1;2:3 word item\n", "word"},
             {text + " " + text, text},
             {"u " + digits.substr(1) + " x\n", digits.substr(1)},
             {"u " + digits + " x\n", digits},
             {"u " + digits + "5 x\n", digits + "5"},
             {"     ", ""},
             {"     \n", ""},
             {"\n", ""},
             {"root", ""},
             {"root\n", ""},
             {"   root   ", ""},
         }) {
        SetUp();
        EXPECT_EQ(child(kHeader + process),
                  listed("", process) + (pid.empty() ? Lines() : found(pid)) +
                      launched("kill 9 " + (pid.empty() ? "(null)" : pid.substr(0, 24))));
    }
}

TEST_F(Suspension, ProcessLineWithoutASecondColumnIsNoFailure)
{
    platform::plan_output({std::string(kHeader) + "root\n"});
    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(events(), listed("", "root\n") + launch());
    EXPECT_THAT(left_open(), ElementsAre("stream#1"));
}

TEST_F(Suspension, LineOfTheListingIsReadUpToFiveHundredTwelveCharacters)
{
    // the header just fits; the process line is cut within its id
    const std::string header = std::string(511, 'H') + "\n";
    const std::string cut = std::string(508, 'u') + " 123";
    EXPECT_EQ(child(header + cut + "45 1 item\n"), popened("") + line_read(header) +
                                                       line_read(cut) + found("123") +
                                                       launched("kill 9 123"));

    // what a header has beyond that is taken for the process line
    platform::reset();
    const std::string longer(512, 'H');
    EXPECT_EQ(child(longer + " root 42 1\nroot 43 1 item\n"),
              popened("") + line_read(longer) + line_read(" root 42 1\n") + found("42") +
                  launched("kill 9 42"));
}

TEST_F(Suspension, FailedKillIsNoFailure)
{
    platform::plan_output({std::string(kHeader) + kProcess, std::string(kHeader) + kProcess});
    plan_steps("vfork", {gives(-1, EAGAIN)});
    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(events(), listed("", kProcess) + found("4711") + failed_launch());

    plan_steps("waitpid", {gives(-1, ECHILD)});
    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
}

TEST_F(Suspension, EachCallLeavesOneMoreListingOpen)
{
    start_item("item");
    platform::plan_output({std::string(kHeader) + kProcess, kHeader, ""});
    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(left_open(), ElementsAre("stream#1", "stream#2", "stream#3"));
}

TEST_F(Suspension, NameOfTheItemStaysForTheNextCall)
{
    start_item("item");
    const std::string before = command_name();
    platform::plan_output({std::string(kHeader) + kProcess});
    FPTEST_SuspendItemExecute();

    EXPECT_EQ(command_name(), before);
    FPTEST_SuspendItemExecute();
    EXPECT_THAT(events(), ::testing::Contains("popen(ps item, r) = stream#2"));
}

TEST_F(Suspension, ItemThatIsRunningCanBeStoppedAndTheGroupGoesOn)
{
    platform::write_plan("<?xml version=\"1.0\"?><P><CmdGroup name=\"g\"><Cmd name=\"one\"/>"
                         "<Cmd name=\"two\"/></CmdGroup></P>");
    plan_steps("popen", {gives(0), platform::pass(), gives(0), platform::pass()});
    platform::plan_output({std::string(kHeader) + kProcess, kHeader});
    std::vector<int> results;
    platform::state().system_hook = [&results](const std::string &) {
        results.push_back(FPTEST_SuspendItemExecute());
    };
    EXPECT_EQ(FPTEST_RunTestCmd("XMLNodePath::P/g", nullptr, 0), 0);

    EXPECT_THAT(results, ElementsAre(0, -1));
    auto calls = platform::calls();
    std::erase_if(calls, [](const std::string &call) {
        return !call.starts_with("system(") && !call.starts_with("popen(ps ");
    });
    const std::string query = "popen(ps | grep /system/bin/SensorProbe, r) = null";
    EXPECT_THAT(
        calls, ElementsAre(query, "system(/system/bin/one (null))", "popen(ps one, r) = stream#1",
                           query, "system(/system/bin/two (null))", "popen(ps two, r) = stream#2"));
}

} // namespace
