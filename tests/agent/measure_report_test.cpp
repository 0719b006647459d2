// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What reports say of measurements and of files that items leave.
#include "reporters_test.h"

using namespace reporters_test;

namespace
{

// An item that has measured, and has left files.
RunOfItems measuring_run()
{
    ItemRun one = passed("SpiCheck");
    one.measured.kept = {
        {"vcore", 1.4, "\u00B5V", 1.1, 1.3}, {"rows", 3}, {"rows", -2e-6, "", {}, 4}};
    one.output = "one\n#measure rows 3\ntwo";
    one.directory = "out/Bringup/SpiCheck";
    one.files = {"dump.bin", "sub/a: ]]b\n\xff"};
    one.warning = "1 malformed #measure line: '#measure \x01': <x>";
    return run_of({suite("Bringup", {one, passed("Other")})});
}

TEST_F(JsonReporter, HasMeasurementsAndFiles)
{
    const auto ends = events_of(json_of(measuring_run()), "end");
    EXPECT_EQ(ends.at(0).at("measurements"), Json::parse(R"([
        {"name": "vcore", "value": 1.4, "unit": "µV", "low": 1.1, "high": 1.3},
        {"name": "rows", "value": 3.0, "unit": null, "low": null, "high": null},
        {"name": "rows", "value": -2e-6, "unit": null, "low": null, "high": 4.0}])"));
    EXPECT_EQ(ends.at(0).at("directory"), "out/Bringup/SpiCheck");
    EXPECT_EQ(ends.at(0).at("files"), Json::parse(R"(["dump.bin", "sub/a: ]]b\n\ufffd"])"));
    EXPECT_EQ(ends.at(0).at("warning"), "1 malformed #measure line: '#measure \u2401': <x>");
    EXPECT_EQ(ends.at(1).at("measurements"), Json::array());
    EXPECT_EQ(ends.at(1).at("directory"), Json());
    EXPECT_EQ(ends.at(1).at("files"), Json::array());
    EXPECT_EQ(ends.at(1).at("warning"), Json());
}

TEST_F(JunitReporter, HasMeasurementsAsPropertiesAndFilesAsAttachments)
{
    const Element test = parse_xml(junit_of(measuring_run())).children.at(0).all("testcase").at(0);
    std::vector<std::string> properties;
    const Element of_case = test.all("properties").at(0);
    for (const Element &one : of_case.children) {
        properties.push_back(one.attributes.at("name") + " = " + one.attributes.at("value"));
    }
    EXPECT_THAT(properties,
                ElementsAre("progress = 100", "result = 0", "description = chip answers",
                            "measure vcore = 1.4 \u00B5V 1.1 1.3", "measure rows = 3",
                            "measure rows = -2e-06 - - 4", "directory = out/Bringup/SpiCheck",
                            "warning = 1 malformed #measure line: '#measure \u2401': <x>"));
    EXPECT_EQ(test.all("system-out").at(0).text,
              "one\n#measure rows 3\ntwo\n[[ATTACHMENT|out/Bringup/SpiCheck/dump.bin]]\n"
              "[[ATTACHMENT|out/Bringup/SpiCheck/sub/a: ]]b\u240A\uFFFD]]\n");
}

TEST_F(TapReporter, HasMeasurementsAndFilesInItsBlock)
{
    EXPECT_THAT(tap_of(measuring_run()), HasSubstr(R"(
      duration_ms: 301
      measurements:
        - name: "vcore"
          value: 1.4
          unit: "µV"
          low: 1.1
          high: 1.3
        - name: "rows"
          value: 3
        - name: "rows"
          value: -2e-06
          high: 4
      directory: "out/Bringup/SpiCheck"
      files:
        - path: "dump.bin"
        - path: "sub/a: ]]b\n)"
                                                   "\uFFFD"
                                                   R"("
      warning: "1 malformed #measure line: '#measure )"
                                                   "\u2401"
                                                   R"(': <x>"
      ...
    ok 2 - Other
)"));
}

// Perl's reader, which prove has, reads a smaller language than YAML.
TEST_F(TapReporter, HasABlockThatPerlReads)
{
    write_file(path("tap"), tap_of(measuring_run()));
    const Ended ended =
        run({.arguments = {"/usr/bin/perl", "-MTAP::Parser::YAMLish::Reader", "-e", R"(
        open my $file, '<', shift;
        my @lines = grep { /^      ---/ .. /^      \.\.\./ } <$file>;
        chomp @lines; s/^ {6}// for @lines;
        my $block = TAP::Parser::YAMLish::Reader->new->read(sub { shift @lines });
        my @all = @{$block->{measurements}};
        print join '|', scalar @all, $all[0]{high}, $all[2]{value}, @{$block->{files}} + 0,
            $block->{files}[0]{path}, $block->{directory};)",
                           path("tap")}});
    EXPECT_EQ(ended.out, "3|1.3|-2e-06|2|dump.bin|out/Bringup/SpiCheck") << ended.err;
}

TEST_F(Reports, SayMeasurementsAndFilesBelowAnItem)
{
    EXPECT_THAT(plain_of(measuring_run()),
                HasSubstr("SpiCheck: passed, result 0, 0.3 s: chip answers\n"
                          "    measured vcore 1.4 \u00B5V (1.1 to 1.3): out of limits\n"
                          "    measured rows 3\n"
                          "    measured rows -2e-06 (at most 4)\n"
                          "    files in out/Bringup/SpiCheck: dump.bin, sub/a: ]]b\u240A\uFFFD\n"
                          "    warning: 1 malformed #measure line: '#measure \u2401': <x>\n"
                          "Bringup/Other: passed"));
}

TEST_F(Reports, SayMeasurementsOnceOfAnItemThatFailed)
{
    RunOfItems run = measuring_run();
    ItemRun &item = run.suites[0].items[0];
    item.outcome = Outcome::failed;
    const std::string text = plain_of(run);
    EXPECT_THAT(text, HasSubstr("    measured rows 3\n"));
    EXPECT_THAT(text, HasSubstr("<x>\n    | one\n    | two\n"));
}

TEST_F(Reports, SayTenMeasurementsThoseOutOfLimitsFirst)
{
    RunOfItems run = measuring_run();
    Measured &measured = run.suites[0].items[0].measured;
    measured.kept.assign(20, {"fine", 1});
    measured.kept.push_back({"bad", 9, "V", {}, 8});
    measured.left_out = 5;
    std::string nine;
    for (int count = 0; count < 9; ++count) {
        nine += "    measured fine 1\n";
    }
    EXPECT_THAT(plain_of(run), HasSubstr("    measured bad 9 V (at most 8): out of limits\n" +
                                         nine + "    (16 measurements more)\n"));
}

} // namespace
