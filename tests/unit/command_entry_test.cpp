// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The command entry: parsing, the three heads, storing a test plan.
#include "unit_test.h"

#include <algorithm>
#include <cerrno>
#include <cstring>

namespace
{

class CommandEntry : public LibraryTest
{
  protected:
    static constexpr std::size_t kAfter = 8; // bytes that nobody may touch

    // What a command leaves in a reply buffer of that length, which was full of
    // 'x', and in the bytes after it.
    static std::string reply_to(const std::string &command, int length)
    {
        std::string buffer = untouched(length);
        EXPECT_EQ(FPTEST_RunTestCmd(command.c_str(), buffer.data(), length), 0);
        return buffer;
    }
    static std::string untouched(int length)
    {
        return std::string(static_cast<std::size_t>(length) + kAfter, 'x');
    }
    static std::string replied(const std::string &text, int length)
    {
        return filled(text, static_cast<std::size_t>(length)) + std::string(kAfter, 'x');
    }

    // A whole buffer after ExtractString with that length.
    static std::string extracted(std::string buffer, int length)
    {
        internals::ExtractString(buffer.data(), length);
        return buffer;
    }
    static std::string zeros(std::size_t count)
    {
        return std::string(count, '\0');
    }

    // A record full of 'x', for what is written into it.
    static fpTest_TestMsg_t full_message()
    {
        fpTest_TestMsg_t message;
        std::memset(&message, 'x', sizeof message);
        return message;
    }
    static void expect_fields(const fpTest_TestMsg_t &message, const std::string &head,
                              const std::string &name, const std::string &args)
    {
        EXPECT_EQ(std::string(message.testMsgHead, 32), filled(head, 32));
        EXPECT_EQ(std::string(message.testMsgName, 2049), filled(name, 2049));
        EXPECT_EQ(std::string(message.testMsgArgs, 1024), filled(args, 1024));
    }

    static std::string opened(const std::string &descriptor)
    {
        return "open(/data/vorlane/src1.xml, O_RDWR|O_CREAT, 0666) = " + descriptor;
    }
    // The events of a store that goes well, its parsing left out.
    static Lines stored(const std::string &text, int which = 1, int removed = 0)
    {
        const std::string plan = "plan#" + std::to_string(which);
        const std::string size = std::to_string(text.size());
        return {
            "remove(/data/vorlane/src1.xml) = " + std::to_string(removed),
            opened(plan),
            "write(" + plan + ", \"" + text + "\", " + size + ") = " + size,
            kStored,
        };
    }

    static constexpr char kPing[] = "FPTEST_RunTestCmd| Get ping reply success!\n";
    static constexpr char kOnePlan[] =
        "<P><CmdGroup name='g'><Cmd name='a' args='1'/></CmdGroup></P>";
    static constexpr char kOtherPlan[] = "<P><CmdGroup name='g'/></P>";

    // Tells when the cached tree is deleted, and how the plan file looked then.
    struct Deletion {
        int count = 0;
        std::string plan_then;
    };
    static void watch_cached_tree(Deletion &deletion)
    {
        mxmlNewCustom(g_TestCmdTree, &deletion, [](void *data) {
            auto *watched = static_cast<Deletion *>(data);
            ++watched->count;
            watched->plan_then = platform::plan_exists() ? platform::plan_text() : "(none)";
        });
    }

    // Leaves other calls' bytes where the next one has its variables.
    [[gnu::noinline]] static void dirty_stack()
    {
        volatile char bytes[16384];
        for (volatile char &byte : bytes) {
            byte = 'x';
        }
    }
};

// --- cutting a text ------------------------------------------------------

TEST_F(CommandEntry, TextIsCutAtItsFirstTabOrLineFeedAndZeroFilled)
{
    struct Case {
        std::string text;
        int length;
        std::string left;
    };
    const std::string other = filled(" a b\rc\vd\fe\x08\x0e", 20);
    const std::string longest(4096, 'a'); // what the working copy holds
    for (const auto &[text, length, left] : std::initializer_list<Case>{
             {"ab\tcd\tefg", 8, "ab" + zeros(6) + "g"},
             {"ab\ncd\nefg", 8, "ab" + zeros(6) + "g"},
             {"abc\td\nef", 8, "abc" + zeros(5)},
             {"abc\nd\tef", 8, "abc" + zeros(5)},
             {"\tabcdefg", 8, zeros(8)},
             {"\nabcdefg", 8, zeros(8)},
             {other, 20, other},
             {filled("abcdefg", 10), 8, filled("abcdefg", 10)},
             {filled("abcdefgh", 10), 8, filled("abcdefg", 10)},
             {filled("abcdefghi", 10), 8, "abcdefg" + zeros(1) + "i" + zeros(1)},
             {"a", 1, zeros(1)},
             {"ab" + zeros(1) + "old bytes", 8, "ab" + zeros(6) + "ytes"},
             {zeros(1) + "old bytes", 8, zeros(8) + "es"},
             // beyond the length every one goes
             {"a\tcdef\tgh\nij", 4, "a" + zeros(3) + "ef" + zeros(1) + "gh" + zeros(1) + "ij"},
             {"abcdef\tgh\nij", 4, "abc" + zeros(1) + "ef" + zeros(1) + "gh" + zeros(1) + "ij"},
             {filled(longest, 5000), 5000, filled(longest, 5000)},
             {filled(longest + "a", 5000), 5000, filled(longest, 5000)},
         }) {
        EXPECT_EQ(extracted(text, length), left) << text;
    }
}

// --- parsing -------------------------------------------------------------

TEST_F(CommandEntry, MessageHasThreeFieldsOfTheirSizesInOrder)
{
    static_assert(offsetof(fpTest_TestMsg_t, testMsgHead) == 0);
    static_assert(offsetof(fpTest_TestMsg_t, testMsgName) == 32);
    static_assert(offsetof(fpTest_TestMsg_t, testMsgArgs) == 32 + 2049);
    static_assert(sizeof(fpTest_TestMsg_t) == 32 + 2049 + 1024);

    fpTest_TestMsg_t message = full_message();
    internals::TestMsgInit(&message);
    expect_fields(message, "", "", "");
    EXPECT_THAT(events(), IsEmpty());
}

TEST_F(CommandEntry, FieldsAreSplitLoggedAndZeroFilled)
{
    fpTest_TestMsg_t message = full_message();
    internals::ParseCmdLine("head::the name::the args", &message);

    expect_fields(message, "head", "the name", "the args");
    EXPECT_EQ(events(), parsed({"head", "the name", "the args"}));
}

TEST_F(CommandEntry, AnyRunOfColonsSeparatesTwoFields)
{
    for (const char *command : {"h:n:a", "h::n::a", "h::::n:::a", ":h:n:a", "::h::n::a",
                                "h::n::a:", ":::h:n::::a::", "h::n::a::fourth::fifth"}) {
        fpTest_TestMsg_t message = full_message();
        internals::ParseCmdLine(command, &message);
        expect_fields(message, "h", "n", "a");
        EXPECT_EQ(events(), parsed({"h", "n", "a"})) << command;
    }
}

TEST_F(CommandEntry, NothingButColonsSeparates)
{
    fpTest_TestMsg_t message = full_message();
    internals::ParseCmdLine(" h;\t/ : n,\n. : a|", &message);

    expect_fields(message, " h;\t/ ", " n,\n. ", " a|");
    EXPECT_EQ(events(), parsed({" h;\t/ ", " n,\n. ", " a|"}));

    const std::string text = every_character_but(":");
    internals::ParseCmdLine((text + ":" + text + ":" + text).c_str(), &message);
    EXPECT_EQ(events(), parsed({text, text, text}));
}

TEST_F(CommandEntry, MissingFieldsStayEmpty)
{
    fpTest_TestMsg_t message;
    internals::TestMsgInit(&message);
    internals::ParseCmdLine("h", &message);
    expect_fields(message, "h", "", "");
    EXPECT_EQ(events(), parsed({"h"}));

    internals::TestMsgInit(&message);
    internals::ParseCmdLine("h::n", &message);
    expect_fields(message, "h", "n", "");
    EXPECT_EQ(events(), parsed({"h", "n"}));
}

TEST_F(CommandEntry, CommandWithoutAFieldDoesNothing)
{
    for (const char *command : {"", ":", "::::", static_cast<const char *>(nullptr)}) {
        std::string reply = untouched(8);
        EXPECT_EQ(FPTEST_RunTestCmd(command, reply.data(), 8), 0);
        EXPECT_EQ(reply, untouched(8));
        EXPECT_THAT(events(), IsEmpty());
    }
}

TEST_F(CommandEntry, CommandThatCannotBeCopiedDoesNothing)
{
    plan_steps("strdup", {gives(0, ENOMEM)});
    EXPECT_EQ(reply_to("pingtest", 8), untouched(8));
    EXPECT_THAT(events(), IsEmpty());
    EXPECT_EQ(internals::ping_mask, 0);
}

TEST_F(CommandEntry, FieldsAreCutToTheirBoundsAndLoggedWhole)
{
    struct Sizes {
        std::size_t head, name, args;
    };
    for (const Sizes sizes : {Sizes{30, 2047, 1022}, Sizes{31, 2048, 1023}, Sizes{32, 2049, 1024},
                              Sizes{33, 2050, 1025}, Sizes{300, 5000, 4000}}) {
        const std::string first(sizes.head, 'h');
        const std::string second(sizes.name, 'n');
        const std::string third(sizes.args, 'a');
        fpTest_TestMsg_t message = full_message();
        internals::ParseCmdLine((first + "::" + second + "::" + third).c_str(), &message);

        expect_fields(message, first.substr(0, 31), second.substr(0, 2048), third.substr(0, 1023));
        EXPECT_EQ(events(), parsed({first, second, third}));
    }
}

TEST_F(CommandEntry, CommandStringIsNotModified)
{
    for (const char *text : {"pingtest::a::b", "XMLFile::<P/>::b", "XMLNodePath::r/g/i\tx::b"}) {
        const std::string command = text;
        std::string given = command;
        FPTEST_RunTestCmd(given.data(), nullptr, 0);
        EXPECT_EQ(given, command);
    }
}

// --- ping ----------------------------------------------------------------

TEST_F(CommandEntry, FirstPingIsAnswered)
{
    EXPECT_EQ(reply_to("pingtest", 64), replied("Ping Success!", 64));

    EXPECT_EQ(internals::ping_mask, 1);
    EXPECT_EQ(events(), parsed({"pingtest"}) + kPing);
    EXPECT_THAT(left_open(), IsEmpty());
}

TEST_F(CommandEntry, FirstPingWithoutAReplyBufferIsUsedUpAndLaterOnesAreNotAnswered)
{
    EXPECT_EQ(FPTEST_RunTestCmd("pingtest", nullptr, 64), 0);
    EXPECT_EQ(events(), parsed({"pingtest"}) + kPing);
    for (int again = 0; again < 3; ++again) {
        EXPECT_EQ(reply_to("pingtest", 64), untouched(64));
        EXPECT_EQ(events(), parsed({"pingtest"}));
        EXPECT_EQ(internals::ping_mask, 1);
    }
}

TEST_F(CommandEntry, PingReplyIsCutToTheBufferAndZeroFilled)
{
    const std::string text = "Ping Success!";
    for (const int length : {1, 2, 5, 12, 13, 14, 15, 100}) {
        internals::reset();
        const auto kept = std::min(text.size(), static_cast<std::size_t>(length) - 1);
        EXPECT_EQ(reply_to("pingtest", length), replied(text.substr(0, kept), length)) << length;
    }
}

TEST_F(CommandEntry, PingMayGoOnAfterItsHeadAndHaveMoreFields)
{
    EXPECT_EQ(reply_to("pingtest2 and more::XMLFile::XMLNodePath", 16),
              replied("Ping Success!", 16));
    EXPECT_EQ(events(), parsed({"pingtest2 and more", "XMLFile", "XMLNodePath"}) + kPing);
}

TEST_F(CommandEntry, PingLeavesThePlanAlone)
{
    mxml_node_t *const tree = load_plan(kOnePlan);
    reply_to("pingtest", 64);
    EXPECT_EQ(g_TestCmdTree, tree);
    EXPECT_EQ(platform::plan_text(), kOnePlan);
}

TEST_F(CommandEntry, OtherCommandsNeitherUseUpThePingNorNeedIt)
{
    reply_to("XMLFile::<P/>", 16);
    reply_to("XMLNodePath::r", 16);
    reply_to("unknown", 16);
    EXPECT_EQ(internals::ping_mask, 0);
    EXPECT_EQ(reply_to("pingtest", 16), replied("Ping Success!", 16));
    events();

    reply_to("XMLFile::<Q/>", 16);
    EXPECT_EQ(platform::plan_text(), "<Q/>");
    EXPECT_EQ(reply_to("XMLNodePath::r", 16), replied("", 16));
    EXPECT_EQ(internals::ping_mask, 1);
}

// --- unknown heads -------------------------------------------------------

TEST_F(CommandEntry, UnknownHeadDoesNothing)
{
    mxml_node_t *const tree = load_plan(kOnePlan);
    for (const char *unknown :
         {"unknown", "pingtes", "pingTest", "Pingtest", " pingtest", "xpingtest", "XMLFil",
          "XMLfile", " XMLFile", "xXMLFile", "XMLNodePat", "XMLNodepath", " XMLNodePath",
          "xXMLNodePath", "XML"}) {
        const std::string text = unknown;
        EXPECT_EQ(reply_to(text + "::name::args", 16), untouched(16)) << text;
        EXPECT_EQ(events(), parsed({text, "name", "args"}));
    }
    EXPECT_EQ(internals::ping_mask, 0);
    EXPECT_EQ(g_TestCmdTree, tree);
    EXPECT_EQ(platform::plan_text(), kOnePlan);
}

// --- storing a plan ------------------------------------------------------

TEST_F(CommandEntry, StoringRemovesCreatesAndWritesAndLeavesTheDescriptorOpen)
{
    platform::write_plan("the old plan, longer than the new one");
    EXPECT_EQ(FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0), 0);

    EXPECT_EQ(events(), parsed({"XMLFile", "<P/>"}) + stored("<P/>"));
    EXPECT_EQ(platform::plan_text(), "<P/>");
    EXPECT_THAT(left_open(), ElementsAre("plan#1"));
}

TEST_F(CommandEntry, StoringWithoutAnOldPlanCreatesTheFile)
{
    EXPECT_EQ(FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0), 0);
    EXPECT_EQ(events(), parsed({"XMLFile", "<P/>"}) + stored("<P/>", 1, -1));
    EXPECT_EQ(platform::plan_text(), "<P/>");
}

TEST_F(CommandEntry, HeadThatGoesOnAfterXMLFileStores)
{
    reply_to("XMLFiles and more::<P/>", 16);
    EXPECT_EQ(events(), parsed({"XMLFiles and more", "<P/>"}) + stored("<P/>", 1, -1));

    const std::string longer = "XMLFile" + std::string(50, 'x');
    reply_to(longer + "::<Q/>", 16);
    EXPECT_EQ(events(), parsed({longer, "<Q/>"}) + stored("<Q/>", 2));
    EXPECT_EQ(platform::plan_text(), "<Q/>");
    EXPECT_THAT(left_open(), ElementsAre("plan#1", "plan#2"));
}

TEST_F(CommandEntry, StoringLeavesTheReplyUntouched)
{
    EXPECT_EQ(reply_to("XMLFile::<P/>", 100), untouched(100));
    plan_steps("open", {gives(-1, EACCES)});
    EXPECT_EQ(reply_to("XMLFile::<P/>", 100), untouched(100));
}

TEST_F(CommandEntry, PlanIsStoredByteForByte)
{
    const std::string plan =
        "<?xml version=\"1.0\"?>\r\n<P>\n\t<A b='c' />\n\n</P> \xc3\xa9\x01/\n";
    run_quietly("XMLFile::" + plan);
    EXPECT_EQ(platform::plan_text(), plan);
}

TEST_F(CommandEntry, PlanIsCutToItsFirst2048Characters)
{
    std::string plan;
    while (plan.size() < 3000) {
        plan += std::to_string(plan.size()) + " ";
    }
    for (const std::size_t size : {2047U, 2048U, 2049U, 3000U}) {
        const std::string sent = plan.substr(0, size);
        const std::string kept = plan.substr(0, std::min<std::size_t>(size, 2048));
        EXPECT_EQ(FPTEST_RunTestCmd(("XMLFile::" + sent).c_str(), nullptr, 0), 0);
        EXPECT_EQ(platform::plan_text(), kept);
        const Lines seen = events();
        ASSERT_EQ(seen.size(), 6U);
        EXPECT_EQ(seen[1], parsed({"", sent})[1]);
        EXPECT_EQ(seen[4].substr(seen[4].rfind('"')),
                  "\", " + std::to_string(kept.size()) + ") = " + std::to_string(kept.size()));
    }
}

TEST_F(CommandEntry, PlanIsCutAtItsFirstColon)
{
    FPTEST_RunTestCmd(":::XMLFile::::<P>a:b::c:d</P>", nullptr, 0);
    EXPECT_EQ(events(), parsed({"XMLFile", "<P>a", "b"}) + stored("<P>a", 1, -1));
    EXPECT_EQ(platform::plan_text(), "<P>a");
}

TEST_F(CommandEntry, StoringWithoutANameFieldLeavesAnEmptyFileAndNoCache)
{
    load_plan(kOnePlan);
    dirty_stack();
    EXPECT_EQ(FPTEST_RunTestCmd("XMLFile", nullptr, 0), 0);

    EXPECT_EQ(events(), parsed({"XMLFile"}) + stored("", 2));
    EXPECT_EQ(platform::plan_text(), "");
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_THAT(left_open(), ElementsAre("plan#2"));
}

TEST_F(CommandEntry, StoringDeletesTheCachedTreeOnceBetweenOpenAndWrite)
{
    load_plan(kOnePlan);
    Deletion deletion;
    watch_cached_tree(deletion);
    run_quietly(std::string("XMLFile::") + kOtherPlan);

    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_EQ(deletion.count, 1);
    EXPECT_EQ(deletion.plan_then, "");
}

TEST_F(CommandEntry, LookupAfterAStoreSeesTheNewPlan)
{
    load_plan(kOnePlan);
    EXPECT_EQ(internals::get_node_length("g", 2), 1);
    run_quietly(std::string("XMLFile::") + kOtherPlan);
    EXPECT_EQ(internals::get_node_length("g", 2), 0);
}

TEST_F(CommandEntry, StoringTakesDescriptorZero)
{
    load_plan(kOnePlan);
    platform::free_descriptor_zero();
    EXPECT_EQ(FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0), 0);

    EXPECT_EQ(events(), parsed({"XMLFile", "<P/>"}) + stored("<P/>", 2));
    EXPECT_EQ(platform::plan_text(), "<P/>");
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_THAT(left_open(), ElementsAre("plan#2"));
}

TEST_F(CommandEntry, StoringThatCannotOpenLosesTheFileAndKeepsTheCache)
{
    mxml_node_t *const tree = load_plan(kOnePlan);
    Deletion deletion;
    watch_cached_tree(deletion);
    plan_steps("open", {gives(-1, EACCES)});
    EXPECT_EQ(FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0), 0);

    EXPECT_EQ(events(), parsed({"XMLFile", "<P/>"}) + "remove(/data/vorlane/src1.xml) = 0" +
                            opened("-1") + kNotOpened + kStored);
    EXPECT_FALSE(platform::plan_exists());
    EXPECT_EQ(deletion.count, 0);
    ASSERT_EQ(g_TestCmdTree, tree);
    EXPECT_EQ(internals::get_node_index("g", "a", 3), 0);
    EXPECT_THAT(left_open(), IsEmpty());
    run_quietly("XMLFile::<P/>");
    EXPECT_EQ(g_TestCmdTree, nullptr);
}

TEST_F(CommandEntry, AnyOtherWrittenCountIsLoggedAndNotRetriedAfterTheCacheIsDropped)
{
    for (const auto &[step, count, text] : {std::tuple{limit(3), "3", "<P/"},
                                            {gives(-1, ENOSPC), "-1", ""},
                                            {gives(0), "0", ""},
                                            {gives(5), "5", ""}}) {
        SetUp();
        load_plan(kOnePlan);
        plan_steps("write", {step});
        EXPECT_EQ(FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0), 0);

        EXPECT_EQ(events(), (parsed({"XMLFile", "<P/>"}) +
                             Lines{"remove(/data/vorlane/src1.xml) = 0", opened("plan#2"),
                                   std::string("write(plan#2, \"<P/>\", 4) = ") + count,
                                   kNotWritten, kStored}));
        EXPECT_EQ(platform::plan_text(), text);
        EXPECT_EQ(g_TestCmdTree, nullptr);
        EXPECT_THAT(left_open(), ElementsAre("plan#2"));
    }
}

TEST_F(CommandEntry, FailedRemovalIsIgnoredAndTheFileIsNotTruncated)
{
    platform::write_plan("the old plan");
    plan_steps("remove", {gives(-1, EPERM)});
    FPTEST_RunTestCmd("XMLFile::<P/>", nullptr, 0);

    EXPECT_EQ(events(), parsed({"XMLFile", "<P/>"}) + stored("<P/>", 1, -1));
    EXPECT_EQ(platform::plan_text(), "<P/>old plan");
}

TEST_F(CommandEntry, StoringReportsItsFailuresToItsCaller)
{
    plan_steps("open", {gives(-1, EACCES)});
    EXPECT_EQ(internals::saveRecvFile("/data/vorlane/other.xml", "<P/>", 4), -1);
    EXPECT_EQ(events(),
              (Lines{"remove(/data/vorlane/other.xml) = -1",
                     "open(/data/vorlane/other.xml, O_RDWR|O_CREAT, 0666) = -1", kNotOpened}));

    plan_steps("write", {gives(-1, EIO)});
    EXPECT_EQ(internals::saveRecvFile("/data/vorlane/other.xml", "<P/>", 2), -1);
    EXPECT_EQ(events(), (Lines{"remove(/data/vorlane/other.xml) = -1",
                               "open(/data/vorlane/other.xml, O_RDWR|O_CREAT, 0666) = plan#1",
                               "write(plan#1, \"<P\", 2) = -1", kNotWritten}));
}

// --- node paths ----------------------------------------------------------

TEST_F(CommandEntry, RunOfAGroupRepliesWithZerosAfterTheItems)
{
    platform::write_plan(kOnePlan);
    std::string reply = untouched(100);
    int runs = 0;
    platform::state().system_hook = [&](const std::string & /*command*/) {
        ++runs;
        EXPECT_EQ(reply, untouched(100));
    };
    EXPECT_EQ(FPTEST_RunTestCmd("XMLNodePath::P/g", reply.data(), 100), 0);

    EXPECT_EQ(runs, 1);
    EXPECT_EQ(reply, replied("", 100));
    reply = untouched(100);
    EXPECT_EQ(FPTEST_RunTestCmd("XMLNodePath::P/g", nullptr, 100), 0); // needs none
    EXPECT_EQ(runs, 2);
}

TEST_F(CommandEntry, RunRepliesWithZerosWhateverItFinds)
{
    for (const char *path : {"P", "P/g", "P/g/a", "/", ""}) {
        for (const int length : {1, 2, 1025, 3000}) {
            dirty_stack();
            EXPECT_EQ(reply_to(std::string("XMLNodePath::") + path, length), replied("", length))
                << path << " " << length;
        }
    }
}

TEST_F(CommandEntry, HeadThatGoesOnAfterXMLNodePathRuns)
{
    EXPECT_EQ(reply_to("XMLNodePaths and more::r", 16), replied("", 16));
    EXPECT_EQ(events(), parsed({"XMLNodePaths and more", "r"}) + levelled("r", 1, ""));
}

TEST_F(CommandEntry, NodePathIsCutAtATabALineFeedAColonAndItsLimit)
{
    const std::string limit(2047, 'r');
    for (const auto &[fields, path] : std::initializer_list<std::pair<Lines, std::string>>{
             {{"root\t/g/a"}, "root"},
             {{"root\n/g/a"}, "root"},
             {{"root\n/g\t/a"}, "root"},
             {{"root\t/g\n/a"}, "root"},
             {{"r", "g/a"}, "r"}, // and the arguments are not used
             {{limit.substr(1)}, limit.substr(1)},
             {{limit}, limit},
             {{limit + "r"}, limit},
             {{limit + "rr"}, limit},
             {{limit + limit}, limit},
             {{}, ""},
         }) {
        dirty_stack();
        std::string command = "XMLNodePath";
        for (const std::string &field : fields) {
            command += "::" + field;
        }
        EXPECT_EQ(FPTEST_RunTestCmd(command.c_str(), nullptr, 0), 0);
        EXPECT_EQ(events(), parsed(Lines{"XMLNodePath"} + fields) + levelled(path, 1, ""));
    }
}

} // namespace
