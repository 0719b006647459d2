// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0
// What a run leaves in files, read back by other programs' parsers: the runs, with
// texts that nothing may take for its own.
#pragma once

#include "playback.h"
#include "reporters/reporters.h"
#include "support/process.h"
#include "support/reports.h"
#include "support/temporary_directory.h"
#include "support/this_process.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace reporters_test
{

using namespace fptest;
using namespace playback;
using namespace support;
using namespace testing;
using Json = nlohmann::json;
using support::Process;
using Attributes = std::map<std::string, std::string>;

// --- hostile texts -----------------------------------------------------------

struct Text {
    std::string reported;
    std::string read; // what a reader gets
};

// The picture of a control character.
inline std::string picture(int code)
{
    return {'\xE2', '\x90', static_cast<char>(0x80 + code)};
}

inline std::vector<Text> hostile_texts()
{
    std::vector<Text> texts = {
        {"", ""},
        {" a  b ", " a  b "},
        {"\ta\nb\r\nc\r", "\ta\nb\r\nc\r"},
        {"<a href='x'>&amp;\"</a>", "<a href='x'>&amp;\"</a>"},
        {"]]>", "]]>"},
        {"<![CDATA[x]]>]]>]]", "<![CDATA[x]]>]]>]]"},
        {"&#0; &#x1b; %s %n", "&#0; &#x1b; %s %n"},
        {"#1 # SKIP \\# \\\\ \\", "#1 # SKIP \\# \\\\ \\"},
        {"\nok 1 - no\nBail out!  no\n...\n---\n", "\nok 1 - no\nBail out!  no\n...\n---\n"},
        {"{\"event\":\"finish\"}\n", "{\"event\":\"finish\"}\n"},
        {": - ? | > ! % @ ` ~ null", ": - ? | > ! % @ ` ~ null"},
        {"\u65E5\u672C\u8A9E \U0001F600 e\u0301", "\u65E5\u672C\u8A9E \U0001F600 e\u0301"},
        {"\u2028\u2029\uFEFF\U0001FFFE", "\u2028\u2029\uFEFF\U0001FFFE"},
        {"\x7F", "\u2421"},
        {"\xC2\x85\xC2\x9B", "\uFFFD\uFFFD"},
        {"a\xC3", "a\uFFFD"},
        {"\xED\xA0\x80", "\uFFFD\uFFFD\uFFFD"},
        {"\xF4\x90\x80\x80", "\uFFFD\uFFFD\uFFFD\uFFFD"},
        {std::string(10000, '&'), std::string(10000, '&')},
        {std::string(10000, '\n') + "x", std::string(10000, '\n') + "x"},
    };
    for (int code = 0; code < 0x20; ++code) {
        const std::string byte(1, static_cast<char>(code));
        const bool kept = code == '\t' || code == '\n' || code == '\r';
        texts.push_back({"<" + byte + ">", "<" + (kept ? byte : picture(code)) + ">"});
    }
    for (int code = 0x80; code < 0x100; ++code) {
        texts.push_back({std::string(1, static_cast<char>(code)), "\uFFFD"});
    }
    return texts;
}

// XML has no place for two characters that others have.
inline std::vector<Text> hostile_texts_for_xml()
{
    std::vector<Text> texts = hostile_texts();
    texts.push_back({"a\uFFFEb\uFFFF\uFFFDc", "a\uFFFDb\uFFFD\uFFFDc"});
    return texts;
}

inline std::vector<Text> hostile_texts_for_json()
{
    std::vector<Text> texts = hostile_texts();
    texts.push_back({"a\uFFFEb\uFFFF", "a\uFFFEb\uFFFF"});
    return texts;
}

// A failed item with that text wherever one can be.
inline RunOfItems run_with(const std::string &text)
{
    ItemRun one = item(text, Outcome::failed, text);
    one.report = {text, text, false, text};
    one.output = text;
    RunOfItems run = run_of({suite(text, {one, item("b", Outcome::not_run)})});
    run.plan = text;
    run.finished = false;
    run.why_unfinished = text;
    return run;
}

// --- reading -----------------------------------------------------------------

inline ino_t inode(const std::string &path)
{
    struct stat status {
    };
    EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
    return status.st_ino;
}

class Reports : public ::testing::Test
{
  protected:
    // As the agent does.
    void SetUp() override
    {
        std::signal(SIGPIPE, SIG_IGN);
        std::signal(SIGXFSZ, SIG_IGN);
        unsetenv("HARNESS_ACTIVE");
    }

    std::string path(const std::string &name) const
    {
        return directory_.path(name);
    }

    // What each writes of a run that happens so.
    using How = std::function<void(Playback &)>;
    std::string json_of(const RunOfItems &run, const How &how = play_all) const
    {
        return left_by(*make_json_reporter(path("json")), "json", run, how);
    }
    std::string junit_of(const RunOfItems &run, const How &how = play_all) const
    {
        return left_by(*make_junit_reporter(path("xml")), "xml", run, how);
    }
    std::string tap_of(const RunOfItems &run, const How &how = play_all) const
    {
        const Stream stream = open_stream("tap");
        return left_by(*make_tap_reporter(stream.get()), "tap", run, how);
    }
    std::string plain_of(const RunOfItems &run, const How &how = play_all, bool quiet = false) const
    {
        const Stream stream = open_stream("plain");
        return left_by(*make_plain_view(stream.get(), quiet), "plain", run, how);
    }

    static void play_all(Playback &playback)
    {
        playback.play();
    }

    using Stream = std::unique_ptr<std::FILE, decltype(&std::fclose)>;
    Stream open_stream(const std::string &name) const
    {
        return {std::fopen(path(name).c_str(), "w"), &std::fclose};
    }

    TemporaryDirectory directory_;

  private:
    std::string left_by(Reporter &report, const std::string &name, const RunOfItems &run,
                        const How &how) const
    {
        Playback playback(report, run);
        how(playback);
        EXPECT_EQ(report.failure(), "");
        return read_file(path(name));
    }
};

using JsonReporter = Reports;
using JunitReporter = Reports;
using TapReporter = Reports;
using RoundReports = Reports;

// Its exit status, or minus the signal.
inline int in_a_child(const std::function<void()> &what)
{
    return Process(what).wait().status;
}

} // namespace reporters_test
