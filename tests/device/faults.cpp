// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "faults.h"

#include <algorithm>
#include <iterator>
#include <sched.h>
#include <sys/mount.h>

namespace device
{
namespace
{

// A command for that item up to the item's lookup by name.
Lines begun_by(const std::string &item)
{
    const std::string path = "P/G/" + item;
    return parsed({"XMLNodePath", path}) + levelled(path, 3, item) + split({"P", "G", item});
}

Lines lookup_of(const std::string &item, const std::string &args, const Lines &query)
{
    return begun_by(item) + asked_index() + found(item, args) + query +
           command("/system/bin/" + item + " " + args);
}

} // namespace

// --- plans and reports -------------------------------------------------------

std::string saved_plan(int progress, const std::string &description)
{
    // Mini-XML wraps long lines
    return "<P>\n<CmdGroup name=\"G\">\n\t<Cmd name=\"Note\" args=\"x\" progress=\"" +
           std::to_string(progress) + "\" result=\"0\"" + (description.size() > 10 ? "\n" : " ") +
           "description=\"" + description +
           "\" />\n\t<Cmd name=\"SensorProbe\" args=\"--help\" />\n</CmdGroup>\n</P>\n";
}

void load_plan()
{
    FPTEST_SetTransation("no such group", "", 0, 0, "");
    log_lines();
}

void report(int progress, const std::string &description)
{
    EXPECT_EQ(FPTEST_SetTransation("G", "Note", progress, 0, description.c_str()), 0);
}

// --- what is logged ----------------------------------------------------------

Lines logged(const Lines &sequence)
{
    Lines lines;
    std::ranges::copy_if(sequence, std::back_inserter(lines), is_log);
    for (std::string &line : lines) {
        line.erase(line.find_last_not_of('\n') + 1);
    }
    return lines;
}

Lines lines_of_store(const std::string &plan, const Lines &failure)
{
    return logged(parsed({"XMLFile", plan}) + failure + kStored);
}

Lines lines_of_note(const Lines &query, const std::string &args)
{
    return logged(lookup_of("Note", args, query) + left());
}

Lines lines_of_unloaded_note(const Lines &loading)
{
    return logged(begun_by("Note") + asked_index(loading, kNoPlan) +
                  found_nothing(no_item(kNoPlan)));
}

Lines lines_of_gatherer(const std::string &args, const Lines &query, const Lines &trigger)
{
    const std::string row = query == kNotAsked ? "-1" : "0";
    return logged(lookup_of("SensorProbe", args, query) + ("SingleItemExecute| \nrow=" + row)) +
           trigger + logged(left());
}

Lines lines_of_report(int progress, const std::string &description, const Lines &saving)
{
    return logged(report_begun("Note") + report_told(0, progress, 0, description) +
                  updated("Note", saving));
}

Lines lines_of_unloaded_report(int progress, const std::string &description, const Lines &loading)
{
    return logged(report_begun("Note", loading, kNoPlan) +
                  report_told(-1, progress, 0, description) + loading + not_updated(kNoPlan));
}

Lines lines_of_read_back(std::size_t size)
{
    const int count = static_cast<int>(size);
    return logged(opened_to_read(count) + (count == 0 ? Lines{} : read_piece(count, count)) +
                  read_end(0, count));
}

Lines log_of_store(const std::string &plan)
{
    store(plan);
    return log_lines();
}

Lines log_of_note()
{
    run_path("P/G/Note");
    return log_lines();
}

Lines log_of_report(int progress, const std::string &description)
{
    report(progress, description);
    return log_lines();
}

// --- faults ------------------------------------------------------------------

void PrivateMounts::SetUp()
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, there are no namespaces to mount in";
    }
    DeviceTest::SetUp();
    ASSERT_EQ(unshare(CLONE_NEWUSER | CLONE_NEWNS), 0) << "no user namespace within the device";
}

void PrivateMounts::TearDown()
{
    while (!mounted_.empty()) {
        EXPECT_EQ(umount2(mounted_.back().c_str(), MNT_DETACH), 0);
        mounted_.pop_back();
    }
    DeviceTest::TearDown();
}

void PrivateMounts::mount_over(const std::string &target, const std::string &source)
{
    ASSERT_EQ(mount(source.c_str(), target.c_str(), nullptr, MS_BIND, nullptr), 0) << target;
    mounted_.push_back(target);
}

void PrivateMounts::remount(const std::string &target, unsigned long flags)
{
    ASSERT_EQ(mount(nullptr, target.c_str(), nullptr,
                    MS_BIND | MS_REMOUNT | MS_NOSUID | MS_NODEV | flags, nullptr),
              0);
}

} // namespace device
