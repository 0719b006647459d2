// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the library's functions log and call, in their order: the words that the
// expected events of all tests are made of.
#pragma once

#include "files.h"

#include <bit>
#include <initializer_list>
#include <optional>
#include <string>
#include <utility>

namespace sequences
{

using support::Lines;

inline Lines joined(std::initializer_list<Lines> parts)
{
    Lines all;
    for (const Lines &part : parts) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}
inline Lines operator+(const Lines &first, const Lines &then)
{
    return joined({first, then});
}
inline Lines operator+(const Lines &first, const std::string &then)
{
    return joined({first, {then}});
}

// Whether it is a log line: a call has a bracket after its name, a line on standard
// output a colon.
inline bool is_log(const std::string &event)
{
    return event.find('|') < event.find_first_of("(: ");
}

// --- commands and node paths ---------------------------------------------

// A command's fields, head first.
inline Lines parsed(const Lines &fields)
{
    const char *const names[] = {"Head", "Name", "Args"};
    Lines lines;
    for (const std::string &field : fields) {
        lines.push_back(std::string("fptest_ParseCmdLine| test") + names[lines.size()] +
                        " is : " + field + "\n");
    }
    return lines;
}
inline Lines level(int count, const std::string &last)
{
    return {"get_node_level| level = " + std::to_string(count) + "\n",
            "get_node_level| node name = " + last + "\n"};
}
// What is logged of a path before its components are looked at.
inline Lines levelled(const std::string &path, int count, const std::string &last)
{
    return Lines{"fptest_ItemsTest| Input cmdline : " + path + "\n"} + level(count, last);
}
// A path's components: the root, the group, the item.
inline Lines split(const Lines &components)
{
    const char *const names[] = {"root", "mid", "leaf"};
    Lines lines{"get_node_name| enter...\n"};
    for (const std::string &component : components) {
        lines.push_back(std::string("get_node_name| ") + names[lines.size() - 1] +
                        " node:" + component + "\n");
    }
    return lines;
}

// A store, whatever has become of it.
constexpr char kStored[] = "FPTEST_RunTestCmd| Save source xml file success!\n";
constexpr char kNotOpened[] = "saveRecvFile| OPEN FILE FAIL!\n";
constexpr char kNotWritten[] = "saveRecvFile| WRITE DATA FAIL!\n";

// --- the plan ------------------------------------------------------------

// Why a lookup fails, as they log it.
constexpr char kNoPlan[] = "load config file failed";
constexpr char kNotFound[] = "mxml Find Path failed";
constexpr char kNoGroup[] = " Find Element \"registers\" failed";

inline Lines failed(const std::string &function, const std::string &reason)
{
    return {function + "| " + function + "[]:" + reason + "\n"};
}

// A load of the plan that succeeds, and the first lines of one that does not.
inline Lines load(const std::string &plan = "plan#1")
{
    return {"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/src1.xml, O_RDONLY) = " + plan,
            "close(" + plan + ")"};
}
inline Lines failed_load(const std::string &descriptor = "-1",
                         const std::string &reason = "(2),No such file or directory")
{
    return {"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/src1.xml, O_RDONLY) = " + descriptor,
            "load_configs_file| Open /data/vorlane/src1.xml file failed" + reason + "\n"};
}

// The lookups; they load the plan after their first lines, unless it is loaded.
inline Lines asked_index(const Lines &loading = {}, const std::string &failure = "")
{
    return Lines{"get_node_index| enter...\n"} + loading +
           (failure.empty() ? Lines() : failed("get_node_index", failure));
}
inline Lines asked_length(const Lines &loading, const Lines &outcome)
{
    return Lines{"get_node_length| Enter node length calculate!\n",
                 "get_node_length| input level = 2\n"} +
           loading + outcome;
}
inline Lines asked_length(const Lines &loading, int count)
{
    return asked_length(loading,
                        {"get_node_length| node length = " + std::to_string(count) + "!\n"});
}
inline Lines no_length(const Lines &loading, const std::string &failure)
{
    return asked_length(loading, failed("get_node_length", failure));
}
inline Lines asked_item(const std::string &name)
{
    return {"get_node_byIndex| enter...\n",
            "get_node_byIndex| curernt leaf node name = " + name + "\n",
            "get_node_byIndex| leave...\n"};
}
inline Lines no_item(const std::string &failure)
{
    return Lines{"get_node_byIndex| enter...\n"} + failed("get_node_byIndex", failure);
}

inline Lines opened_to_save(const std::string &descriptor)
{
    return {"save_XmlFile| enter...\n",
            "open(/data/vorlane/src1.xml, O_RDWR|O_CREAT|O_TRUNC|O_SYNC, 0666) = " + descriptor};
}
inline Lines saved(const std::string &plan = "plan#2")
{
    return opened_to_save(plan) + ("close(" + plan + ")") + "save_XmlFile| leave...\n";
}
inline Lines not_saved(const std::string &descriptor, const std::string &reason)
{
    return opened_to_save(descriptor) +
           ("save_XmlFile| Open /data/vorlane/src1.xml file failed" + reason + "\n");
}

// --- reading back --------------------------------------------------------

inline Lines not_opened_to_read(const std::string &descriptor)
{
    return {"FPTEST_ExtractResultMsg| enter... !\n",
            "open(/data/vorlane/src1.xml, O_RDONLY) = " + descriptor,
            "FPTEST_ExtractResultMsg| Open /data/vorlane/src1.xml file failed!\n"};
}
// From the call to the last offset, with what the seeks give; the end is the file's size.
inline Lines opened_to_read(int end, int current = 0, int start = 0)
{
    Lines lines{"FPTEST_ExtractResultMsg| enter... !\n",
                "open(/data/vorlane/src1.xml, O_RDONLY) = plan#1"};
    for (const auto &[from, offset] :
         {std::pair{"CUR", current}, std::pair{"END", end}, std::pair{"SET", start}}) {
        const std::string given = std::to_string(offset);
        lines.push_back(std::string("lseek(plan#1, 0, SEEK_") + from + ") = " + given);
        lines.push_back("FPTEST_ExtractResultMsg| offset = " + given);
    }
    return lines;
}
inline Lines read_call(int asked, int result)
{
    return {"read(plan#1, " + std::to_string(asked) + ") = " + std::to_string(result)};
}
inline Lines read_piece(int asked, int got)
{
    return read_call(asked, got) +
           ("FPTEST_ExtractResultMsg| read file unfinish, continue... n = " + std::to_string(got) +
            " \n");
}
inline Lines read_failure(int asked)
{
    return read_call(asked, -1) + failed("FPTEST_ExtractResultMsg", "read file failed");
}
inline Lines read_end(int asked, int total)
{
    return read_call(asked, 0) +
           Lines{"FPTEST_ExtractResultMsg| reach the end of file\n",
                 "FPTEST_ExtractResultMsg| read byte count = " + std::to_string(total) + "\n",
                 "close(plan#1)", "FPTEST_ExtractResultMsg| leave...\n"};
}

// --- reports -------------------------------------------------------------

inline Lines report_begun(const std::string &name, const Lines &loading = {},
                          const std::string &failure = "")
{
    return Lines{"FPTEST_SetTransation| enter...\n",
                 "FPTEST_SetTransation| input node name = " + name + "\n"} +
           asked_index(loading, failure);
}
inline Lines report_told(int index, int progress, int result, const std::string &description)
{
    const std::string code = std::to_string(result);
    return {"FPTEST_SetTransation| iResult = " + code + "\n",
            "FPTEST_SetTransation| index=" + std::to_string(index) + " - iResult=" + code +
                " - iProgress=" + std::to_string(progress) + " - iDesc=" + description + "\n",
            "updateSrcXmlFile| enter... !\n"};
}
inline Lines updated(const std::string &name, const Lines &saving = saved())
{
    return Lines{"updateSrcXmlFile| curernt node name is: " + name + "\n",
                 "updateSrcXmlFile| start update progress!\n",
                 "updateSrcXmlFile| start update result!\n",
                 "updateSrcXmlFile| start update description!\n",
                 "updateSrcXmlFile| start save xml!\n"} +
           saving + "updateSrcXmlFile| update Src Xml File success . leave...\n" +
           "FPTEST_SetTransation| leave...\n";
}
inline Lines not_updated(const std::string &reason)
{
    return failed("updateSrcXmlFile", reason) + "FPTEST_SetTransation| leave...\n";
}

// --- the run of an item --------------------------------------------------

inline Lines begun(const std::string &vendor = "0")
{
    return {"SingleItemExecute| enter... !\n",
            "get_node_value(/etc/vorlane/sysparms/vr_common_cfg.xml, "
            "device/SysParam/Quillmark/vendor, 64)",
            "stdout: vendor = " + vendor + "\n"};
}
// A run that finds no node, for whatever reason the lookup logs.
inline Lines found_nothing(const Lines &lookup = asked_item("(null)"),
                           const std::string &vendor = "0")
{
    return begun(vendor) + lookup + "SingleItemExecute| get node by Index fail!\n";
}
inline Lines found(const std::string &name, const std::string &args = "-t 5",
                   const std::string &vendor = "0")
{
    return begun(vendor) + asked_item(name) +
           ("SingleItemExecute| mxmlElementGetAttr name=" + name + "- args=" + args + "\n");
}
inline Lines nameless(const std::string &name = "(null)", const std::string &args = "(null)")
{
    return found(name, args) + "SingleItemExecute| current node is null !\n";
}

// The query for a gatherer: nothing if it cannot be started, else what it prints.
inline Lines queried(const std::optional<std::string> &output = "", int count = 1)
{
    const std::string stream = "stream#" + std::to_string(count);
    const std::string query = "ps | grep /system/bin/SensorProbe";
    const Lines asked{"ResourceReduce| \ncbuf=" + query + "\n",
                      "popen(" + query + ", r) = " + (output ? stream : "null")};
    if (!output) {
        return asked + "ResourceReduce| popen error!\n";
    }
    const Lines read = output->empty() ? Lines{"fgets(" + stream + ", 129) = null",
                                               "ResourceReduce| target process not exist!\n"}
                                       : Lines{"fgets(" + stream + ", 129) = \"" + *output + "\"",
                                               "ResourceReduce| \ntbuf=" + *output + "\n"};
    return asked + read + ("pclose(" + stream + ")");
}
inline Lines command(const std::string &line)
{
    return {"SingleItemExecute| tpCmd:" + line + "\n"};
}
inline Lines left()
{
    return {"SingleItemExecute| leave... !\n"};
}
inline Lines executed(const std::string &line)
{
    return command(line) + ("system(" + line + ")") + left();
}
// The whole run of an ordinary item without a vendor, after that many others.
inline Lines ran(const std::string &name, const std::string &args = "-t 5", int others = 0)
{
    return found(name, args) + queried("", others + 1) +
           executed("/system/bin/" + name + " " + args);
}

// --- the launcher --------------------------------------------------------

inline Lines blocked_signals()
{
    return {"sigemptyset()", "sigaddset(SIGCHLD)", "sigprocmask(SIG_BLOCK, {SIGCHLD}, old mask)"};
}
// As the host sees it, with the result of its one look at the child.
inline Lines launch(int waited = 0)
{
    return blocked_signals() + Lines{"vfork() = 100",
                                     "signal(SIGINT, ignored)",
                                     "signal(SIGQUIT, ignored)",
                                     "waitpid(100, WNOHANG) = " + std::to_string(waited),
                                     "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)",
                                     "signal(SIGINT, the host's for SIGINT)",
                                     "signal(SIGQUIT, the host's for SIGQUIT)"};
}
inline Lines failed_launch()
{
    return blocked_signals() + "vfork() = -1" + "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)";
}
// As its child sees it, when there is no shell.
inline Lines launched(const std::string &command)
{
    return blocked_signals() + Lines{"vfork() = 0", "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)",
                                     "execve(/system/bin/sh, sh|-c|" + command + ", environ)",
                                     "_exit(127)"};
}

// --- the trigger ---------------------------------------------------------

// From the socket to the accept.
inline Lines listener(int count = 1, const std::string &listened = "0")
{
    const std::string name = "listener#" + std::to_string(count);
    const bool little = std::endian::native == std::endian::little;
    return {"socket(AF_INET, SOCK_STREAM, 0) = " + name, "Setsockopt(" + name + ", 1)",
            "Bind(" + name + ", " + (little ? "0200" : "0002") + "8888" + std::string(24, '0') +
                ", 16)",
            "listen(" + name + ", 5) = " + listened};
}
inline Lines listen_failed(int error)
{
    return {"Sock_Init1| listen error", "Sock_Init1| errno=" + std::to_string(error)};
}
inline Lines accepted(int count = 1)
{
    const std::string number = std::to_string(count);
    return {"Accept(listener#" + number + ", 16) = connection#" + number};
}
inline Lines accept_failed(int error, int result = -1)
{
    return {"Accept(listener#1, 16) = " + std::to_string(result), "Sock_Init1| accept error!\n",
            "Sock_Init1| errno=" + std::to_string(error)};
}
// The message is written, with that result, to a connection of that name.
inline Lines told(const std::string &connection = "connection#1", int written = 13, int error = 0,
                  int count = 1)
{
    const std::string result = std::to_string(written);
    return Lines{"write(" + connection + ", \"gather again!\", 13) = " + result,
                 "Sock_Init1| retWri=" + result} +
           (written < 0
                ? Lines{"Sock_Init1| retWri error", "Sock_Init1| errno=" + std::to_string(error)}
                : Lines()) +
           "Sock_Init1| retWri success\n" + ("close(listener#" + std::to_string(count) + ")");
}
inline Lines trigger(int count = 1)
{
    return listener(count) + accepted(count) +
           told("connection#" + std::to_string(count), 13, 0, count);
}

} // namespace sequences
