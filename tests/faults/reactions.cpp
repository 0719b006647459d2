// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reactions.h"

#include <algorithm>
#include <cstring>
#include <regex>

namespace faults
{
namespace
{

constexpr char kEnd[] = ""; // every event begins so: the last one is meant
constexpr char kAgain[] = "the call once more";

// The first event from there on that begins so.
std::size_t find(const Lines &events, std::size_t from, const std::string &begin)
{
    while (from + 1 < events.size() && (begin == kEnd || !events[from].starts_with(begin))) {
        ++from;
    }
    EXPECT_TRUE(events[from].starts_with(begin)) << "no event begins with " << begin;
    return from;
}

void replace(Lines &events, std::size_t first, std::size_t last, const Lines &by)
{
    const auto begin = events.begin() + static_cast<std::ptrdiff_t>(first);
    const auto end = events.begin() + static_cast<std::ptrdiff_t>(last) + 1;
    events.insert(events.erase(begin, end), by.begin(), by.end());
}

void replace(Lines &events, const char *first, const char *last, const Lines &by)
{
    replace(events, find(events, 0, first), find(events, 0, last), by);
}

Lines log(const std::string &function, Lines texts)
{
    for (std::string &text : texts) {
        text.insert(0, function + "| ");
    }
    return texts;
}

// What the library does when a call fails.
struct Reaction {
    const char *call;    // its event, as a regular expression
    const char *through; // the last event that the lines replace, by its beginning
    Lines lines;         // after the call's
};

// A failure without a row has no effect: that of a close, a pclose, an item that
// cannot be started, a mask that cannot be put back.
const std::vector<Reaction> &reactions()
{
    const auto stop = [](const char *text) { return log("FPTEST_SuspendItemExecute", {text}); };
    const auto read = [](const Lines &texts) { return log("FPTEST_ExtractResultMsg", texts); };
    const auto trigger = [](const Lines &texts) { return log("Sock_Init1", texts); };
    const auto presence = [](const char *text) { return log("ResourceReduce", {text}); };
    const std::string bind = sequences::listener()[2].substr(15);
    static const std::vector<Reaction> rows = {
        {"open.*TRUNC.*",
         "save_XmlFile| leave",
         {sequences::not_saved("-1", "(24),Too many open files").back()}},
        {"open.*0666.*", "write(", {sequences::kNotOpened}},
        {"write.plan[^]*", "write(", {sequences::kNotWritten}},
        {"remove.*", "remove(", {}},
        {"open.*RDONLY.*", kEnd, {sequences::not_opened_to_read("-1").back()}},
        {"read.*", "read(",
         joined({sequences::failed("FPTEST_ExtractResultMsg", "read file failed"), {kAgain}})},
        {"lseek.*(CUR|END).*", "FPTEST_ExtractResultMsg| offset", read({"offset = -1"})},
        // the file is then read from its end
        {"lseek.*SET.*", "FPTEST_ExtractResultMsg| read byte count",
         joined({read({"offset = -1"}),
                 {"read(plan, 4096) = 0"},
                 read({"reach the end of file\n", "read byte count = 0\n"})})},
        {"popen.*grep.*", "pclose(", presence("popen error!\n")},
        {"fgets.*129[^]*", "ResourceReduce|", presence("target process not exist!\n")},
        {"popen.*", kEnd, stop("popen error!\n")},
        {"fgets[^]*", kEnd, stop("target process not exist!\n")},
        {"sigprocmask.SIG_BLOCK.*", "signal(SIGQUIT, the host's", {}},
        {"vfork.*", "signal(SIGQUIT, the host's", {sequences::failed_launch().back()}},
        {"waitpid.*", "waitpid(", {}},
        {"socket.*", "close(listener",
         joined({{"Setsockopt(-1, 1)", "Bind(-1" + bind, "listen(-1, 5) = -1"},
                 sequences::listen_failed(9),
                 {"Accept(-1, 16) = -1"},
                 trigger({"accept error!\n", "errno=9"})})},
        {"listen.*", "listen(", sequences::listen_failed(98)},
        {"Accept.*", "close(listener", trigger({"accept error!\n", "errno=103"})},
        {"write.connection.*",
         "Sock_Init1| retWri=", trigger({"retWri=-1", "retWri error", "errno=28"})},
    };
    return rows;
}

// A gatherer that was found running, or could not be asked for, is started.
void change_presence(Lines &events, std::size_t at, const std::string &row)
{
    const std::string shown = "SingleItemExecute| \nrow=";
    at = find(events, at, "SingleItemExecute| tpCmd") + 1;
    if (!events[at].starts_with(shown)) {
        return; // no gatherer
    }
    if (events[at] == shown + "1\n") {
        replace(events, at, at, joined({{""}, sequences::launch()}));
        events.emplace_back("SingleItemExecute| leave... !\n");
    }
    events[at] = shown + row + "\n";
}

} // namespace

Lines unnumbered(Lines events)
{
    static const std::regex number("#[0-9]+");
    for (std::string &event : events) {
        if (event.find('#') != std::string::npos) {
            event = std::regex_replace(event, number, "");
        }
    }
    return events;
}

Lines without(Lines events, const Lines &sequence)
{
    for (;;) {
        const auto found =
            std::search(events.begin(), events.end(), sequence.begin(), sequence.end());
        if (found == events.end()) {
            return events;
        }
        events.erase(found, found + static_cast<std::ptrdiff_t>(sequence.size()));
    }
}

Lines without_loads(const Lines &events)
{
    static const Lines load = unnumbered(sequences::load());
    return without(events, load);
}

Lines failed(Lines events, std::size_t at, std::size_t cut)
{
    const std::string call = events[at];
    const auto row = std::find_if(reactions().begin(), reactions().end(), [&](const auto &one) {
        return std::regex_match(call, std::regex(one.call));
    });
    if (row == reactions().end() || (cut != 0 && call.starts_with("write(connection"))) {
        return events; // nor is anything cut on a connection
    }
    std::string shown = call.substr(0, call.rfind(" = "));
    if (shown != call) {
        const bool pointer = call.starts_with("popen") || call.starts_with("fgets");
        shown += " = " + (cut != 0 ? std::to_string(cut) : pointer ? "null" : "-1");
    }
    Lines lines = joined({{shown}, row->lines});
    std::replace(lines.begin(), lines.end(), std::string(kAgain), call);
    replace(events, at, find(events, at, row->through), lines);
    if (lines.back().starts_with("ResourceReduce")) {
        change_presence(events, at, call.starts_with("popen") ? "-1" : "0");
    }
    return events;
}

Lines without_path(Lines events)
{
    replace(events, "get_node_level|", kEnd, sequences::level(1, ""));
    return events;
}

Lines without_plan(Lines events, Step::Kind step, int error)
{
    const auto no_plan = [&](const std::string &function) {
        const std::string reason = "(" + std::to_string(error) + ")," + strerror(error);
        return joined({error != 0 ? sequences::failed_load("-1", reason) : Lines(),
                       sequences::failed(function, sequences::kNoPlan)});
    };
    switch (step) {
    case Step::Kind::Group:
        replace(events, "get_node_length| node length", kEnd, no_plan("get_node_length"));
        break;
    case Step::Kind::Item:
        replace(events, "get_node_index|", "get_node_index|",
                joined({sequences::asked_index(), no_plan("get_node_index")}));
        replace(events, "get_node_byIndex| curernt", kEnd,
                joined({sequences::failed("get_node_byIndex", sequences::kNoPlan),
                        {"SingleItemExecute| get node by Index fail!\n"}}));
        break;
    case Step::Kind::Report: {
        std::string &index = events[find(events, 0, "FPTEST_SetTransation| index=")];
        index = std::regex_replace(index, std::regex("index=[0-9]+"), "index=-1");
        replace(events, "get_node_index|", "get_node_index|",
                joined({sequences::asked_index(), no_plan("get_node_index")}));
        replace(events, "updateSrcXmlFile| curernt", "updateSrcXmlFile| update Src",
                no_plan("updateSrcXmlFile"));
        break;
    }
    default:
        break;
    }
    return events;
}

void check_ends(const Lines &events)
{
    static const std::pair<const char *, const char *> ends[] = {
        {"get_node_length. input level", "get_node_length. (node length|.*mxml Find Path failed)"},
        {"get_node_byIndex. enter",
         "get_node_byIndex. (leave|.*Find Element \"registers\" failed)"},
        {"SingleItemExecute. enter",
         "SingleItemExecute. (leave|get node by Index fail|current node is null|\nrow=1)"},
        {"index=-1 |get node by Index fail", "get_node_index. .*mxml Find Path failed"},
        {"name=\\w+- args=.null.\n", "tpCmd:/system/bin/\\w+ .null.\n"},
        {"updateSrcXmlFile. enter", "updateSrcXmlFile. (update Src Xml|.*mxml Find Path failed)"},
    };
    const auto count = [&](const char *line) {
        const std::regex shape(line);
        return std::count_if(events.begin(), events.end(),
                             [&](const auto &event) { return std::regex_search(event, shape); });
    };
    for (const auto &[begin, end] : ends) {
        EXPECT_EQ(count(begin), count(end)) << begin << ", " << end;
    }
}

} // namespace faults
