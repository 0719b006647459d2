// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whose results a run's are: labels, versions and the plan's digest in every result file.
#include "run_test.h"

#include <array>
#include <string>
#include <unistd.h>

namespace
{

class Labelled : public RunCommand
{
  protected:
    static Json first_line()
    {
        return events("run").at(0);
    }
    static std::string host()
    {
        std::array<char, 256> name{};
        EXPECT_EQ(gethostname(name.data(), name.size() - 1), 0);
        return name.data();
    }
};

TEST_F(Labelled, LabelsAreInEveryResultFile)
{
    const Ended ended = run_group({{"Item", kPasses}},
                                  {"--label", "job=1=2", "--label", "note=a \"<&\n# b", "--label",
                                   "device=A\xFF 7", "--junit", work("junit"), "--tap"});
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(first_line().at("labels"),
              Json({{"job", "1=2"}, {"note", "a \"<&\n# b"}, {"device", "A\uFFFD 7"}}));
    const Element suite = parse_xml(junit()).children.at(0);
    EXPECT_EQ(suite.properties()["job"], "1=2");
    EXPECT_EQ(suite.properties()["note"], "a \"<&\n# b");
    EXPECT_EQ(suite.properties()["device"], "A\uFFFD 7");
    EXPECT_EQ(suite.attributes.at("hostname"), "A\uFFFD 7");
    EXPECT_THAT(parse_tap(ended.out).comments,
                IsSupersetOf({"job: 1=2", "note: a \"<&\u240A# b", "device: A\uFFFD 7"}));
}

TEST_F(Labelled, DeviceIsTheHostWhereNoSerialNumberIsKnown)
{
    run_group({{"Item", kPasses}}, {"--label", "job=1", "--junit", work("junit")});
    EXPECT_EQ(first_line().at("labels"), Json({{"device", host()}, {"job", "1"}}));
    EXPECT_EQ(parse_xml(junit()).children.at(0).attributes.at("hostname"), host());
}

TEST_F(Labelled, VersionsAndDigestAreInEveryResultFile)
{
    const std::string version = run_fptest({"--version"}).out.substr(7, 5);
    const Ended ended = run_group({{"Item", kPasses}}, {"--junit", work("junit"), "--tap"});
    const std::string digest = first_line().at("plan_digest");
    EXPECT_THAT(digest, MatchesRegex("[0-9a-f]{64}"));
    EXPECT_EQ(first_line().at("version"), version);
    EXPECT_EQ(first_line().at("library_version"), version); // they are of one build
    auto properties = parse_xml(junit()).children.at(0).properties();
    EXPECT_EQ(properties["fptest_version"], version);
    EXPECT_EQ(properties["library_version"], version);
    EXPECT_EQ(properties["plan_digest"], digest);
    EXPECT_THAT(parse_tap(ended.out).comments,
                IsSupersetOf({"fptest_version: " + version, "library_version: " + version,
                              "plan_digest: " + digest}));
}

TEST_F(Labelled, DigestOfTheStoredPlanIsTheFiles)
{
    const Items items = {{"Item", "report G 100 1 bad"}, {"Other", "report G 100 0 'a &quot;'"}};
    run_group(items);
    const std::string digest = first_line().at("plan_digest");
    run({"P/G/Other"}); // of a plan that the library has written anew
    EXPECT_EQ(first_line().at("plan_digest"), digest);
    run_group({items.front()});
    EXPECT_NE(first_line().at("plan_digest"), digest);
}

} // namespace
