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

// Up to the item's lookup by name.
Lines lines_of_command(const std::string &item)
{
    return {"fptest_ParseCmdLine| testHead is : XMLNodePath",
            "fptest_ParseCmdLine| testName is : P/G/" + item,
            "fptest_ItemsTest| Input cmdline : P/G/" + item,
            "get_node_level| level = 3",
            "get_node_level| node name = " + item,
            "get_node_name| enter...",
            "get_node_name| root node:P",
            "get_node_name| mid node:G",
            "get_node_name| leaf node:" + item,
            "get_node_index| enter..."};
}

Lines lines_of_lookup(const std::string &item, const std::string &args, const Lines &query)
{
    return lines_of_command(item) +
           Lines{"SingleItemExecute| enter... !",
                 "get_node_byIndex| enter...",
                 "get_node_byIndex| curernt leaf node name = " + item,
                 "get_node_byIndex| leave...",
                 "SingleItemExecute| mxmlElementGetAttr name=" + item + "- args=" + args,
                 "ResourceReduce| \ncbuf=ps | grep /system/bin/SensorProbe"} +
           query + Lines{"SingleItemExecute| tpCmd:/system/bin/" + item + " " + args};
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
           Lines{"get_node_index| get_node_index[]:load config file failed",
                 "SingleItemExecute| enter... !", "get_node_byIndex| enter...",
                 "get_node_byIndex| get_node_byIndex[]:load config file failed",
                 "SingleItemExecute| get node by Index fail!"};
}

Lines lines_of_gatherer(const std::string &args, const Lines &query, const Lines &trigger)
{
    return lines_of_lookup("SensorProbe", args, query) +
           Lines{std::string("SingleItemExecute| \nrow=") + (query == kNotAsked ? "-1" : "0")} +
           trigger + Lines{"SingleItemExecute| leave... !"};
}

Lines lines_of_report(int progress, const std::string &description, const Lines &save)
{
    return Lines{"FPTEST_SetTransation| enter...",
                 "FPTEST_SetTransation| input node name = Note",
                 "get_node_index| enter...",
                 "FPTEST_SetTransation| iResult = 0",
                 "FPTEST_SetTransation| index=0 - iResult=0 - iProgress=" +
                     std::to_string(progress) + " - iDesc=" + description,
                 "updateSrcXmlFile| enter... !",
                 "updateSrcXmlFile| curernt node name is: Note",
                 "updateSrcXmlFile| start update progress!",
                 "updateSrcXmlFile| start update result!",
                 "updateSrcXmlFile| start update description!",
                 "updateSrcXmlFile| start save xml!",
                 "save_XmlFile| enter..."} +
           save +
           Lines{"updateSrcXmlFile| update Src Xml File success . leave...",
                 "FPTEST_SetTransation| leave..."};
}

Lines lines_of_unloaded_report(int progress, const std::string &description, const Lines &failure)
{
    return Lines{"FPTEST_SetTransation| enter...", "FPTEST_SetTransation| input node name = Note",
                 "get_node_index| enter..."} +
           failure +
           Lines{"get_node_index| get_node_index[]:load config file failed",
                 "FPTEST_SetTransation| iResult = 0",
                 "FPTEST_SetTransation| index=-1 - iResult=0 - iProgress=" +
                     std::to_string(progress) + " - iDesc=" + description,
                 "updateSrcXmlFile| enter... !"} +
           failure +
           Lines{"updateSrcXmlFile| updateSrcXmlFile[]:load config file failed",
                 "FPTEST_SetTransation| leave..."};
}

Lines lines_of_read_back(std::size_t size)
{
    const std::string count = std::to_string(size);
    return Lines{"FPTEST_ExtractResultMsg| enter... !", "FPTEST_ExtractResultMsg| offset = 0",
                 "FPTEST_ExtractResultMsg| offset = " + count,
                 "FPTEST_ExtractResultMsg| offset = 0"} +
           (size == 0 ? Lines{}
                      : Lines{"FPTEST_ExtractResultMsg| read file unfinish, continue... n = " +
                              count + " "}) +
           Lines{"FPTEST_ExtractResultMsg| reach the end of file",
                 "FPTEST_ExtractResultMsg| read byte count = " + count,
                 "FPTEST_ExtractResultMsg| leave..."};
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
