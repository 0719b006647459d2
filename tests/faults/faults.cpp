// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Makes every call that the module and Mini-XML make of the platform fail, one
// at a time, over a script that uses every exported function, and compares all
// that the module shows with the model: before, at and after the fault. Each
// fault has a process of its own, so that a crash or a hang is a finding.
#include "mini_xml.h"
#include "model.h"
#include "plan.h"

#include "../unit/sequences.h"
#include "../unit/unit_test.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <execinfo.h>
#include <fcntl.h>
#include <functional>
#include <map>
#include <sys/mman.h>
#include <sys/wait.h>
#include <ucontext.h>
#include <unistd.h>

using faults::Fault;
using faults::Model;
using platform::gives;
using platform::limit;
using platform::Step;

namespace
{

constexpr unsigned kSeconds = 10; // a script takes milliseconds
constexpr std::size_t kReply = 64;
constexpr std::size_t kPlanRoom = 4096;
constexpr char kUntouched = 'Z';

// --- what a child tells its parent -------------------------------------------

struct Told {
    bool met;          // the fault
    bool damaged;      // by Mini-XML, without a word
    char step[64];     // the last one begun
    char met_in[128];  // an allocation: what was to be stored
    char damage[64];   // what Mini-XML has done
    char foretold[64]; // where Mini-XML must end the process
    char died_in[64];  // where it has
};

Told *told()
{
    static auto *const shared = static_cast<Told *>(
        mmap(nullptr, sizeof(Told), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
    return shared;
}

template <std::size_t size> void tell(char (&place)[size], const std::string &text)
{
    std::snprintf(place, size, "%s", text.c_str());
}

using Frames = std::array<void *, 32>;

// Where a signal has come, innermost first.
#ifdef __arm__
// C has no tables there to find more callers by.
std::size_t frames_of(const ucontext_t &context, Frames &frames)
{
    frames[0] = reinterpret_cast<void *>(context.uc_mcontext.arm_pc);
    frames[1] = reinterpret_cast<void *>(context.uc_mcontext.arm_lr);
    return 2;
}
#else
std::size_t frames_of(const ucontext_t & /*context*/, Frames &frames)
{
    return static_cast<std::size_t>(backtrace(frames.data(), static_cast<int>(frames.size())));
}
#endif

// Notes the function of Mini-XML that the process dies in.
void on_death(int signal, siginfo_t * /*info*/, void *context)
{
    Frames frames{};
    const std::size_t count = frames_of(*static_cast<const ucontext_t *>(context), frames);
    for (std::size_t at = 0; at < count && told()->died_in[0] == '\0'; ++at) {
        Dl_info place{};
        const bool known = dladdr(frames[at], &place) != 0 && place.dli_sname != nullptr;
        const std::string name = known ? place.dli_sname : "";
        if (name.starts_with("mxml") || name.starts_with("_mxml")) {
            tell(told()->died_in, name.substr(0, name.find('.')));
        }
    }
    std::signal(signal, SIG_DFL);
    std::raise(signal);
}

// --- the script ----------------------------------------------------------------

class Script
{
  public:
    explicit Script(const Fault &fault) : model_(fault), fault_(fault)
    {
        module::reset();
        platform::reset();
    }

    // The script, and once more without a fault in it.
    void play()
    {
        cycle("");
        EXPECT_EQ(model_.met(), met()) << "the model counts other calls";
        EXPECT_EQ(model_.met_in(), mini_xml::met_in());
        told()->met = met();
        tell(told()->met_in, model_.met_in());
        tell(told()->damage, model_.damage());
        if (met()) {
            cycle(", again");
        }
    }

  private:
    using Call = std::function<int(char *)>;

    void cycle(const std::string &when)
    {
        const auto first = faults::first_plan();
        const auto second = faults::second_plan();
        const std::string header = "USER PID NAME\n";

        step(
            "ping" + when, [&] { return model_.ping(); }, command("pingtest"));
        step(
            "null command" + when, [&] { return model_.nothing(); },
            [](char *reply) { return FPTEST_RunTestCmd(nullptr, reply, kReply); });
        store("first plan" + when, first);
        step(
            "group" + when, [&] { return model_.run_group("Bringup"); },
            command("XMLNodePath::plan/Bringup"));
        run_item("item" + when, "Image", "DeadPixels", "");
        run_item("running gatherer" + when, "Bringup", "SensorProbe",
                 "root 77 /system/bin/SensorProbe\n");
        report("report" + when, "Bringup", "PatternTest", 50, "half way");
        report("other report" + when, "Image", "DeadPixels", 100, "none");
        report("same report" + when, "Bringup", "PatternTest", 100, "passed");
        read_back("read-back" + when);
        platform::plan_output({header + "root 78 SensorProbe\n"});
        step(
            "suspension" + when, [&] { return model_.suspend(header, "root 78 SensorProbe\n"); },
            [](char *) { return FPTEST_SuspendItemExecute(); });
        store("second plan" + when, second);
        read_back("read-back of the second plan" + when);
        run_item("item of the second plan" + when, "Bringup", "SpiCheck", "");
        report("report on the second plan" + when, "Bringup", "SpiCheck", 7, "warm");
        read_back("last read-back" + when);
    }

    static Call command(const std::string &text)
    {
        return [text](char *reply) { return FPTEST_RunTestCmd(text.c_str(), reply, kReply); };
    }

    void store(const std::string &name, const faults::Node &plan)
    {
        step(
            name, [&] { return model_.store(plan); }, command("XMLFile::" + faults::source(plan)));
    }

    void run_item(const std::string &name, const std::string &group, const std::string &item,
                  const std::string &presence)
    {
        platform::plan_output({presence});
        step(
            name, [&] { return model_.run_item(group, item, presence); },
            command("XMLNodePath::plan/" + group + "/" + item));
    }

    void report(const std::string &name, const std::string &group, const std::string &item,
                int progress, const std::string &description)
    {
        step(
            name, [&] { return model_.report(group, item, progress, description); },
            [&](char *) {
                return FPTEST_SetTransation(group.c_str(), item.c_str(), progress, 0,
                                            description.c_str());
            });
    }

    void read_back(const std::string &name)
    {
        step(
            name, [&] { return model_.read_back(); },
            [](char *buffer) {
                FPTEST_ExtractResultMsg(buffer, kPlanRoom);
                return 0;
            });
    }

    void step(const std::string &name, const std::function<Model::Result()> &expected,
              const Call &call)
    {
        SCOPED_TRACE(fault_.function + ", call " + std::to_string(fault_.number) + ": " + name);
        tell(told()->step, name);
        Model::Result result;
        try {
            result = expected();
        } catch (const faults::Death &death) {
            told()->met = true;
            tell(told()->met_in, model_.met_in());
            tell(told()->foretold, death.place);
        }
        std::string buffer(kPlanRoom, kUntouched);
        EXPECT_EQ(call(buffer.data()), result.value);
        ASSERT_STREQ(told()->foretold, "") << "Mini-XML has got over it";

        std::string wanted(kPlanRoom, kUntouched);
        if (result.reply) {
            const bool raw = name.find("read-back") != std::string::npos;
            wanted.replace(0, raw ? result.reply->size() : kReply,
                           *result.reply +
                               std::string(raw ? 0 : kReply - result.reply->size(), '\0'));
        }
        EXPECT_EQ(buffer, wanted);
        EXPECT_THAT(platform::events(), ElementsAreArray(model_.events()));
        EXPECT_EQ(platform::plan_exists(), model_.file().has_value());
        if (platform::plan_exists() && model_.file()) {
            EXPECT_EQ(platform::plan_text(), *model_.file());
        }
        EXPECT_EQ(g_TestCmdTree != nullptr, model_.loaded());
        EXPECT_THAT(platform::left_open(), ElementsAreArray(model_.left_open()));
        platform::drop_output();
    }

    [[nodiscard]] bool met() const
    {
        return mini_xml::met() || (fault_.number != 0 && !fault_.function.starts_with("Mini-XML") &&
                                   !platform::steps_left(fault_.function));
    }

    Model model_;
    Fault fault_;
};

// --- one fault -------------------------------------------------------------------

struct Target {
    const char *function;
    Step step;
    // what fails along with it, as it would
    std::vector<const char *> others;
};

const Target kTargets[] = {
    {"open", gives(-1, EMFILE), {}},
    {"read", gives(-1, EIO), {}},
    {"write", gives(-1, ENOSPC), {}},
    {"write", limit(faults::kCut), {}},
    {"lseek", gives(-1, ESPIPE), {}},
    {"close", gives(-1, EIO), {}},
    {"remove", gives(-1, EROFS), {}},
    {"socket", gives(-1, EMFILE), {"listen", "Accept"}},
    {"listen", gives(-1, EADDRINUSE), {}},
    {"Accept", gives(-1, ECONNABORTED), {}},
    {"popen", gives(0, EMFILE), {}},
    {"fgets", gives(0, EIO), {}},
    {"pclose", gives(-1, ECHILD), {}},
    {"system", gives(-1, EAGAIN), {}},
    {"vfork", gives(-1, EAGAIN), {}},
    {"waitpid", gives(-1, ECHILD), {}},
    {"sigprocmask", gives(-1, EINVAL), {}},
    {"strdup", gives(0, ENOMEM), {}},
    {mini_xml::kMemory, {}, {}},
    {mini_xml::kRead, {}, {}},
    {mini_xml::kWrite, {}, {}},
};

void plan(const Target &target, long number)
{
    if (std::string(target.function).starts_with("Mini-XML")) {
        mini_xml::plan_fault(target.function, number);
        return;
    }
    std::vector<Step> steps(static_cast<std::size_t>(number - 1), platform::pass());
    steps.push_back(target.step);
    platform::plan_steps(target.function, steps);
    steps.back() = gives(-1, EBADF);
    for (const char *other : target.others) {
        platform::plan_steps(other, steps);
    }
}

[[noreturn]] void child(const Target &target, long number)
{
    alarm(kSeconds);
    void *first[1];
    backtrace(first, 1); // loads what it needs
    struct sigaction noted = {};
    noted.sa_sigaction = on_death;
    noted.sa_flags = SA_SIGINFO;
    for (const int signal : {SIGSEGV, SIGBUS, SIGABRT}) {
        sigaction(signal, &noted, nullptr);
    }
    // Mini-XML says there what it could not allocate
    const int nowhere = open("/dev/null", O_WRONLY | O_CLOEXEC);
    dup2(nowhere, STDERR_FILENO);

    const bool cut = target.step.kind == Step::Kind::Limit;
    Script script({target.function, number, cut});
    plan(target, number);
    script.play();
    std::fflush(stdout);
    _exit(testing::Test::HasFailure() ? 1 : 0);
}

// What Mini-XML does by itself when its memory is short, by name: how many
// faults have led to it. The model foretells each for its fault, and anything
// else is a finding. Mini-XML 3.3.1 does not check
//   _mxml_global       the state that it makes on first use
//   mxmlNewElement     the copy of an element's name: the tree has an element
//                      without one, on which mxml_load_data ends the process at
//                      the closing tag, or mxml_write_node when it is saved
//   mxmlNewText        the copy of a text
//   mxmlElementSetAttr nothing, but it has no result: a load or a report goes on
//                      without the attribute
//   mxml_load_data     a comment's node: it takes that for the document's end
std::map<std::string, int> &known_cases()
{
    static std::map<std::string, int> cases;
    return cases;
}

// What is wrong, told at the end: a child inherits the failures before its own.
std::vector<std::string> &findings()
{
    static std::vector<std::string> found;
    return found;
}

void judge(int status, const std::string &name)
{
    const std::string where = name + " " + told()->met_in + ": ";
    const std::string died_in = told()->died_in;
    const std::string foretold = told()->foretold;
    if (!foretold.empty()) {
        if (!WIFSIGNALED(status) || WTERMSIG(status) != SIGSEGV || died_in != foretold) {
            findings().push_back(where + "should have ended in " + foretold + ", not \"" + died_in +
                                 "\"");
        }
        ++known_cases()["ends the process in " + foretold];
    } else if (WIFSIGNALED(status)) {
        findings().push_back(where + "ended in \"" + told()->step + "\" by " +
                             strsignal(WTERMSIG(status)) + " " + died_in);
    } else if (WEXITSTATUS(status) != 0) {
        findings().push_back(where + "see above");
    } else if (told()->damage[0] != '\0') {
        ++known_cases()[std::string("says nothing: ") + told()->damage];
    }
}

// Whether the script still had such a call.
bool inject(const Target &target, long number)
{
    const std::string name = std::string(target.function) + ", call " + std::to_string(number);
    *told() = {};
    std::fflush(stdout);
    const pid_t pid = fork();
    if (pid == 0) {
        child(target, number);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    judge(status, name);
    return told()->met;
}

TEST(Faults, EachCallOfThePlatformFailsOnce)
{
    platform::reset(); // its directory is this process's, not a child's
    long all = 0;
    std::puts("Faults injected, one in each run of the script:");
    for (const Target &target : kTargets) {
        long number = 1;
        while (inject(target, number)) {
            ++number;
        }
        if (number == 1) {
            findings().push_back(std::string("the script has no ") + target.function);
        }
        const bool cut = target.step.kind == Step::Kind::Limit;
        std::printf("  %-20s %4ld\n", cut ? "write, cut short" : target.function, number - 1);
        all += number - 1;
    }
    std::printf("  %-20s %4ld\n\n", "all", all);
    std::puts("Known cases, when memory is short inside Mini-XML:");
    for (const auto &[known, count] : known_cases()) {
        std::printf("  %-48s %4d\n", known.c_str(), count);
    }
    EXPECT_THAT(findings(), IsEmpty());
}

TEST(Faults, AMaskThatCannotBePutBackInTheChildDoesNotKeepItFromTheShell)
{
    module::reset();
    platform::reset();
    platform::plan_steps("vfork", {gives(0)});
    platform::plan_steps("sigprocmask", {platform::pass(), gives(-1, EINVAL)});
    platform::run_child([] { module::mysystem("a command"); });
    EXPECT_THAT(platform::events(), ElementsAreArray(sequences::launched("a command")));
}

} // namespace
