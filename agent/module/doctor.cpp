// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/doctor.h"

#include "module/item_shell.h"
#include "module/library_file.h"
#include "module/library_process.h"
#include "module/own_ps.h"
#include "module/preflight.h"
#include "module/ps_query.h"
#include "module/stored_plan.h"
#include "module/vendor_file.h"
#include "util/files.h"
#include "util/programs.h"
#include "util/text.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fmt/core.h>
#include <mxml.h>
#include <optional>
#include <string_view>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace fptest
{
namespace
{

std::chrono::steady_clock::time_point soon()
{
    return std::chrono::steady_clock::now() + std::chrono::seconds(2);
}

DeviceAnswer ok(const std::string &question, const std::string &text)
{
    return {question, Verdict::ok, text};
}
DeviceAnswer warning(const std::string &question, const std::string &text)
{
    return {question, Verdict::warning, text};
}
DeviceAnswer error(const std::string &question, const std::string &text)
{
    return {question, Verdict::error, text};
}

// What fptest run asks too, in its words.
template <typename Question>
DeviceAnswer required(const std::string &name, const Question &ask, const std::string &otherwise)
{
    try {
        ask();
    } catch (const std::exception &lack) {
        return error(name, lack.what());
    }
    return ok(name, otherwise);
}

// --- programs -----------------------------------------------------------------

DeviceAnswer about_shell()
{
    return required("shell", require_shell, "/system/bin/sh is there, and the C library's runs");
}

DeviceAnswer about_grep()
{
    const Said said = ask_program(
        {shell_of_c_library(), "-c", "echo /system/bin/SensorProbe | grep /system/bin/SensorProbe"},
        soon());
    if (said.output == "/system/bin/SensorProbe\n") {
        return ok("grep", "finds the gatherer's path");
    }
    const std::string &why = said.errors;
    return error("grep",
                 fmt::format("grep does not find the gatherer's path{}, so that each "
                             "trigger starts another gatherer; install it in PATH",
                             why.empty() ? "" : ": " + one_line(why.substr(0, why.find('\n')))));
}

DeviceAnswer about_ps()
{
    if (about_grep().verdict != Verdict::ok) {
        return warning("ps", "it cannot be asked for the gatherer without grep");
    }
    const PsAnswers answers = ask_ps();
    if (!answers.was_asked) {
        return warning("ps", answers.complaint);
    }
    const auto own = directory_of_own_ps();
    bool is_helped = false;
    if (own && !answers.is_enough()) {
        put_first_in_path(*own);
        is_helped = ask_ps().is_enough();
    }
    const std::string advice =
        is_helped ? fmt::format("fptest uses {}/ps instead: put that directory first in the PATH "
                                "of other agents",
                                one_line(*own))
        : own     ? fmt::format("{}/ps does not answer either: put a quillmark-ps that is built "
                                    "for this device there",
                                one_line(*own))
                  : "put quillmark-ps first in PATH";
    const auto &tell = is_helped ? warning : error;
    const std::string said = one_line(answers.complaint);
    if (answers.header.empty()) {
        return tell("ps", fmt::format("ps does not list processes{}; {}",
                                      said.empty() ? "" : ": " + said, advice));
    }
    const std::string about =
        dialect_of(answers) + (said.empty() ? "" : fmt::format(" ({})", said));
    std::vector<std::string> lacks;
    if (!answers.finds_path) {
        lacks.emplace_back("no running gatherer (each trigger starts another one)");
    }
    if (!answers.finds_name && !answers.finds_short_name) {
        lacks.emplace_back("no item to stop (it runs on)");
    }
    if (answers.finds_query) {
        lacks.emplace_back("a gatherer where none runs (none is started)");
    }
    if (!lacks.empty()) {
        return tell("ps", fmt::format("{} finds {}; {}", about, join_and(lacks), advice));
    }
    if (!answers.finds_name) {
        return warning("ps", fmt::format("{} finds an item to stop by 15 characters of its name "
                                         "at most; {}",
                                         about, advice));
    }
    return ok("ps", fmt::format("{} finds gatherers and items", about));
}

// A process that waits for a signal, and ends with this one.
class Victim
{
  public:
    Victim() : pid_(fork())
    {
        if (pid_ == 0) {
            std::signal(SIGTERM, SIG_DFL);
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            for (;;) {
                pause();
            }
        }
    }
    ~Victim()
    {
        if (pid_ > 0) {
            kill(pid_, SIGKILL);
            waitpid(pid_, nullptr, 0);
        }
    }
    Victim(const Victim &) = delete;
    Victim &operator=(const Victim &) = delete;

    pid_t pid() const
    {
        return pid_;
    }

    // Whether SIGTERM ends it in time.
    bool is_ended_by(std::chrono::steady_clock::time_point end)
    {
        int status = 0;
        do {
            if (waitpid(pid_, &status, WNOHANG) == pid_) {
                pid_ = -1;
                return WIFSIGNALED(status) && WTERMSIG(status) == SIGTERM;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        } while (std::chrono::steady_clock::now() < end);
        return false;
    }

  private:
    pid_t pid_;
};

// A stop gives kill two process ids; here the first one is not 9.
DeviceAnswer about_kill()
{
    Victim first;
    Victim second;
    if (first.pid() > 0 && second.pid() > 0) {
        const Said said = ask_program(
            {"/system/bin/sh", "-c", fmt::format("kill {} {}", first.pid(), second.pid())}, soon());
        const auto end = soon();
        if (said.is_whole && first.is_ended_by(end) && second.is_ended_by(end)) {
            return ok("kill", "ends the processes that it is given");
        }
    }
    return error("kill", "kill does not end the processes that it is given, and neither does a "
                         "stop; install a shell at /system/bin/sh that has it, or kill in PATH");
}

// --- files --------------------------------------------------------------------

DeviceAnswer about_data()
{
    const auto ask = [] {
        require_data();
        require_regular_plan();
        require_room(kPlanLimit);
    };
    return required("data", ask, "plans can be stored in /data/vorlane");
}

DeviceAnswer about_vendor()
{
    constexpr char kName[] = "vendor";
    try {
        const std::string why = why_no_vendor();
        require_regular_plan(); // the library opens it
        LibraryProcess library;
        const std::string text = fmt::format("the vendor selector is {}", ask_vendor(library));
        if (why.empty()) {
            return ok(kName, text);
        }
        return is_vendor_file_there()
                   ? warning(kName, fmt::format("{}, as {}; mend that if this device's programs "
                                                "have a vendor's suffix",
                                                text, why))
                   : ok(kName, fmt::format("{}, as {}", text, why));
    } catch (const std::exception &lack) {
        return error(kName, lack.what());
    }
}

// --- the kernel's side --------------------------------------------------------

DeviceAnswer about_port()
{
    return required("port", require_trigger_port, "34952 is free for the gatherer");
}

DeviceAnswer about_process_9()
{
    constexpr char kName[] = "process-9";
    constexpr unsigned long kKernelThread = 0x00200000; // PF_KTHREAD
    if (kill(9, 0) != 0) {
        return ok(kName, errno == EPERM ? "it is another user's, and a stop cannot signal it"
                                        : "there is none that a stop could signal");
    }
    // "9 (NAME) S parent group session terminal foreground FLAGS ..."
    const std::string stat = read_file("/proc/9/stat").value_or("");
    const std::size_t after = stat.rfind(')');
    unsigned long flags = 0;
    if (after != stat.npos &&
        std::sscanf(stat.c_str() + after, ") %*c %*d %*d %*d %*d %*d %lu", &flags) == 1 &&
        (flags & kKernelThread) != 0) {
        return ok(kName, "it is a kernel thread, which takes no signal");
    }
    const std::string what =
        after == stat.npos ? "" : stat.substr(stat.find('('), after + 1 - stat.find('('));
    return warning(kName, fmt::format("process 9 {} is alive, and each stop by the library sends "
                                      "it SIGTERM as well; stop no items while it matters",
                                      one_line(what)));
}

// The mount's option does not say for whom.
DeviceAnswer about_proc()
{
    if (read_file("/proc/1/stat")) {
        return ok("proc", "/proc shows every user's processes");
    }
    return warning("proc", "/proc hides other users' processes (hidepid): no ps finds their "
                           "gatherer or items; run agent, items and gatherer as one user, or "
                           "as root");
}

DeviceAnswer about_descriptors()
{
    constexpr rlim_t kFew = 256;
    constexpr rlim_t kTooFew = 16; // for fptest run itself
    constexpr char kName[] = "descriptors";
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    if (limit.rlim_max >= kFew) {
        return ok(kName, limit.rlim_max == RLIM_INFINITY
                             ? "a process may open any number of files"
                             : fmt::format("a process may open {} files, of which each stored "
                                           "plan, trigger and stop takes one",
                                           limit.rlim_max));
    }
    const bool is_enough = limit.rlim_max >= kTooFew;
    return {kName, is_enough ? Verdict::warning : Verdict::error,
            fmt::format("a process may open {} files only, {}; raise the limit (ulimit -n {})",
                        limit.rlim_max,
                        is_enough ? "of which each stored plan, trigger and stop takes one for ever"
                                  : "and fptest run needs more",
                        4 * kFew)};
}

// --- libraries ----------------------------------------------------------------

std::string real_name(const std::string &file)
{
    const std::string end = end_of_links(file);
    return one_line(end.empty() ? file : end);
}

DeviceAnswer about_mini_xml()
{
    constexpr char kName[] = "mini-xml";
    // it may be a part of this program
    const std::string file = provider_at(reinterpret_cast<const void *>(&mxmlLoadFd));
#ifdef MXML_MAJOR_VERSION
    const std::string built = fmt::format("{}.{}", MXML_MAJOR_VERSION, MXML_MINOR_VERSION);
#else
    const std::string built = "2.7 or earlier"; // whose header does not say
#endif
    if (provider_of("mxmlOptionsNew").empty() && !file.empty()) {
        return ok(kName, fmt::format("{}; fptest is built for {}", real_name(file), built));
    }
    return error(kName, fmt::format("{} is not Mini-XML 2.7 to 3.x; install that, fptest is built "
                                    "for {}",
                                    file.empty() ? "what is loaded" : real_name(file), built));
}

DeviceAnswer about_library()
{
    constexpr char kName[] = "library";
    std::vector<std::string> missing;
    for (const char *name : {"FPTEST_RunTestCmd", "FPTEST_SetTransation", "FPTEST_ExtractResultMsg",
                             "FPTEST_SuspendItemExecute", "g_TestCmdTree"}) {
        if (provider_of(name).empty()) {
            missing.emplace_back(name);
        }
    }
    const std::string file = provider_of("FPTEST_RunTestCmd");
    if (missing.empty()) {
        return ok(kName,
                  fmt::format("{} has the four functions and the variable", real_name(file)));
    }
    return error(kName,
                 fmt::format("{} has no {}; install a whole libquillmark",
                             file.empty() ? "what is loaded" : real_name(file), join_and(missing)));
}

} // namespace

void examine_device(const std::function<void(const DeviceAnswer &)> &tell)
{
    for (const auto ask :
         {about_descriptors, about_proc, about_shell, about_grep, about_ps, about_kill, about_data,
          about_vendor, about_port, about_process_9, about_mini_xml, about_library}) {
        tell(ask());
    }
}

} // namespace fptest
