// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "faults.h"

#include <cstdlib>
#include <sched.h>
#include <sys/mount.h>

namespace device
{
namespace
{

Lines by(const std::string &function, Lines texts)
{
    for (std::string &text : texts) {
        text.insert(0, function + "| ");
    }
    return texts;
}

// Up to the item's lookup by name.
Lines lines_of_command(const std::string &item)
{
    return by("fptest_ParseCmdLine", {"testHead is : XMLNodePath", "testName is : P/G/" + item}) +
           by("fptest_ItemsTest", {"Input cmdline : P/G/" + item}) +
           by("get_node_level", {"level = 3", "node name = " + item}) +
           by("get_node_name", {"enter...", "root node:P", "mid node:G", "leaf node:" + item}) +
           by("get_node_index", {"enter..."});
}

Lines lines_of_lookup(const std::string &item, const std::string &args, const Lines &query)
{
    return lines_of_command(item) + by("SingleItemExecute", {"enter... !"}) +
           by("get_node_byIndex", {"enter...", "curernt leaf node name = " + item, "leave..."}) +
           by("SingleItemExecute", {"mxmlElementGetAttr name=" + item + "- args=" + args}) +
           by("ResourceReduce", {"\ncbuf=ps | grep /system/bin/SensorProbe"}) + query +
           by("SingleItemExecute", {"tpCmd:/system/bin/" + item + " " + args});
}

} // namespace

// --- plans and reports -------------------------------------------------------

std::string saved(int progress, const std::string &description)
{
    // Mini-XML wraps long lines
    return "<P>\n<CmdGroup name=\"G\">\n\t<Cmd name=\"Note\" args=\"x\" progress=\"" +
           std::to_string(progress) + "\" result=\"0\"" + (description.size() > 10 ? "\n" : " ") +
           "description=\"" + description +
           "\" />\n\t<Cmd name=\"SensorProbe\" args=\"--help\" />\n</CmdGroup>\n</P>\n";
}

void load()
{
    FPTEST_SetTransation("no such group", "", 0, 0, "");
    log_lines();
}

void report(int progress, const std::string &description)
{
    EXPECT_EQ(FPTEST_SetTransation("G", "Note", progress, 0, description.c_str()), 0);
}

// --- what is logged ----------------------------------------------------------

Lines operator+(Lines left, const Lines &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

std::string open_failure(const std::string &function, const std::string &error)
{
    return function + "| Open /data/vorlane/src1.xml file failed(" + error;
}

Lines lines_of_store(const std::string &plan, const Lines &failure)
{
    return Lines{"fptest_ParseCmdLine| testHead is : XMLFile",
                 "fptest_ParseCmdLine| testName is : " + plan} +
           failure + Lines{"FPTEST_RunTestCmd| Save source xml file success!"};
}

Lines lines_of_unloaded(const std::string &item, const Lines &failure)
{
    return lines_of_command(item) + failure +
           by("get_node_index", {"get_node_index[]:load config file failed"}) +
           by("SingleItemExecute", {"enter... !"}) +
           by("get_node_byIndex", {"enter...", "get_node_byIndex[]:load config file failed"}) +
           by("SingleItemExecute", {"get node by Index fail!"});
}

Lines lines_of_gatherer(const std::string &args, const Lines &query, const Lines &trigger)
{
    return lines_of_lookup("SensorProbe", args, query) +
           Lines{std::string("SingleItemExecute| \nrow=") + (query == kNotAsked ? "-1" : "0")} +
           trigger + Lines{"SingleItemExecute| leave... !"};
}

Lines lines_of_report(int progress, const std::string &description, const Lines &save)
{
    return by("FPTEST_SetTransation", {"enter...", "input node name = Note"}) +
           by("get_node_index", {"enter..."}) +
           by("FPTEST_SetTransation",
              {"iResult = 0", "index=0 - iResult=0 - iProgress=" + std::to_string(progress) +
                                  " - iDesc=" + description}) +
           by("updateSrcXmlFile",
              {"enter... !", "curernt node name is: Note", "start update progress!",
               "start update result!", "start update description!", "start save xml!"}) +
           by("save_XmlFile", {"enter..."}) + save +
           by("updateSrcXmlFile", {"update Src Xml File success . leave..."}) +
           by("FPTEST_SetTransation", {"leave..."});
}

Lines lines_of_unloaded_report(int progress, const std::string &description, const Lines &failure)
{
    return by("FPTEST_SetTransation", {"enter...", "input node name = Note"}) +
           by("get_node_index", {"enter..."}) + failure +
           by("get_node_index", {"get_node_index[]:load config file failed"}) +
           by("FPTEST_SetTransation",
              {"iResult = 0", "index=-1 - iResult=0 - iProgress=" + std::to_string(progress) +
                                  " - iDesc=" + description}) +
           by("updateSrcXmlFile", {"enter... !"}) + failure +
           by("updateSrcXmlFile", {"updateSrcXmlFile[]:load config file failed"}) +
           by("FPTEST_SetTransation", {"leave..."});
}

Lines lines_of_read_back(std::size_t size)
{
    const std::string count = std::to_string(size);
    return by("FPTEST_ExtractResultMsg",
              {"enter... !", "offset = 0", "offset = " + count, "offset = 0"}) +
           (size == 0 ? Lines{}
                      : by("FPTEST_ExtractResultMsg",
                           {"read file unfinish, continue... n = " + count + " "})) +
           by("FPTEST_ExtractResultMsg",
              {"reach the end of file", "read byte count = " + count, "leave..."});
}

Lines lines_of_note(const Lines &query, const std::string &args)
{
    return lines_of_lookup("Note", args, query) + Lines{"SingleItemExecute| leave... !"};
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

bool is_in_place()
{
    return std::getenv("QUILLMARK_DEVICE") == std::string("in-place");
}

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
