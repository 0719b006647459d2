// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Makes every call that the library and Mini-XML make of the platform fail, one
// at a time, in a cycle of commands that uses every exported function. What must
// hold, beside the run without a fault:
//
// - The steps before the fault, and the events before it in its own step, are
//   those of that run.
// - The step with the fault, and each one after it, differs by what the failed
//   call and the plan's state explain, and by nothing else (reactions.h).
// - A step leaves open what it leaves open on purpose, and only a store or a
//   report changes the plan's file.
// - Only when memory is short inside Mini-XML, a plan may lack something without
//   a word. Then each function still tells how it has ended.
// - The process ends by a crash only in a function of Mini-XML that is listed.
// - A whole cycle afterwards shows the same events, replies and bytes.
//
// Each fault has a process of its own, so that a crash or a hang is a finding.
#include "cycle.h"
#include "mini_xml.h"
#include "reactions.h"

#include "../unit/unit_test.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <dlfcn.h>
#include <execinfo.h>
#include <fcntl.h>
#include <map>
#include <regex>
#include <set>
#include <sys/mman.h>
#include <sys/wait.h>
#include <thread>
#include <ucontext.h>
#include <unistd.h>

namespace
{

using faults::cycle;
using faults::Step;
using Kind = faults::Step::Kind;

constexpr unsigned kSeconds = 10; // a cycle takes milliseconds
constexpr std::size_t kCut = 5;

// A function of which one call fails.
struct Target {
    std::string function;
    platform::Step step;
    // what fails along with it, as it would
    std::vector<std::string> others;

    [[nodiscard]] bool cuts() const
    {
        return step.kind == platform::Step::Kind::Limit;
    }
    [[nodiscard]] bool in_mini_xml() const
    {
        return function.starts_with("Mini-XML");
    }
    // The call has an event of its own.
    [[nodiscard]] bool is_recorded() const
    {
        return function != "strdup" && !in_mini_xml();
    }
};

// --- what a child tells its parent -------------------------------------------

struct ChildReport {
    bool met;         // the fault
    bool lacking;     // Mini-XML has lost something without a word
    char step[64];    // the last one begun
    char died_in[64]; // the function of Mini-XML
};

ChildReport *child_report()
{
    static auto *const shared = static_cast<ChildReport *>(mmap(
        nullptr, sizeof(ChildReport), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
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
    for (std::size_t at = 0; at < count && child_report()->died_in[0] == '\0'; ++at) {
        Dl_info place{};
        const bool known = dladdr(frames[at], &place) != 0 && place.dli_sname != nullptr;
        const std::string name = known ? place.dli_sname : "";
        if (name.starts_with("mxml") || name.starts_with("_mxml")) {
            tell(child_report()->died_in, name.substr(0, name.find('.')));
        }
    }
    std::signal(signal, SIG_DFL);
    std::raise(signal);
}

// --- one step ----------------------------------------------------------------

// What later steps go by.
struct State {
    std::optional<std::string> file; // the plan's
    bool loaded = false;
    std::string item; // the last one started

    bool operator==(const State &) const = default;
};

State state_now()
{
    return {platform::plan_exists() ? std::optional(platform::plan_text()) : std::nullopt,
            g_TestCmdTree != nullptr, internals::command_name};
}

struct Shown {
    Lines events;
    State state; // after it
};

void expect(const Lines &shown, const Lines &wanted)
{
    if (shown != wanted) { // the matcher takes its time
        EXPECT_THAT(shown, ElementsAreArray(wanted));
    }
}

void expect(const Shown &shown, const Shown &wanted)
{
    expect(shown.events, wanted.events);
    EXPECT_EQ(shown.state.file, wanted.state.file);
    EXPECT_EQ(shown.state.loaded, wanted.state.loaded);
    EXPECT_EQ(shown.state.item, wanted.state.item);
}

bool has(const Lines &events, const std::string &part)
{
    return std::any_of(events.begin(), events.end(), [&](const std::string &event) {
        return event.find(part) != std::string::npos;
    });
}

bool has(const Lines &events, const Lines &sequence)
{
    const Lines part = faults::unnumbered(sequence);
    return std::search(events.begin(), events.end(), part.begin(), part.end()) != events.end();
}

// What these events leave open on purpose: a stored plan, the listing of a stop,
// a connection to a gatherer, a listener whose accept has failed.
Lines left_on_purpose(const Lines &events)
{
    Lines names;
    for (const std::string &event : events) {
        const std::string result = event.substr(event.rfind(' ') + 1);
        if (event.starts_with("Accept(listener") && result == "-1") {
            names.push_back(event.substr(7, event.find(',') - 7));
        } else if (event.starts_with("Accept(") ||
                   event.starts_with("open(/data/vorlane/src1.xml, O_RDWR|O_CREAT, 0666)") ||
                   (event.starts_with("popen(ps ") && event.find("grep") == std::string::npos)) {
            names.push_back(result);
        }
    }
    std::erase_if(names,
                  [](const std::string &name) { return name.find('#') == std::string::npos; });
    return names;
}

// What the step has to answer after these events.
std::string answer(const Step &step, const Lines &events, const State &state)
{
    switch (step.kind) {
    case Kind::Ping:
        return has(events, "Get ping reply") ? faults::replied("Ping Success!")
                                             : faults::replied({});
    case Kind::Group:
    case Kind::Item:
        return events.empty() ? faults::replied({}) : faults::replied("");
    case Kind::ReadBack:
        return has(events, "byte count") && !has(events, "byte count = 0\n")
                   ? faults::read_back(*state.file)
                   : faults::replied({});
    default:
        return faults::replied({});
    }
}

// Plays the step, and checks what holds with and without a fault.
Shown play(const Step &step, Lines &before_fault)
{
    tell(child_report()->step, step.name);
    const State before = state_now();
    Lines left = platform::left_open();
    platform::plan_output({step.output});
    std::string buffer = faults::replied({});
    const int value = step.call(buffer.data());
    platform::state().outputs.clear();
    const Lines events = joined({std::exchange(before_fault, {}), platform::events()});
    const State state = state_now();

    const bool no_stop =
        step.kind == Kind::Stop && (has(events, "error!") || has(events, "not exist!"));
    EXPECT_EQ(value, no_stop ? -1 : 0);
    EXPECT_EQ(buffer, answer(step, events, state));
    left = joined({left, left_on_purpose(events)});
    std::sort(left.begin(), left.end());
    expect(platform::left_open(), left);
    if (step.kind == Kind::Store) {
        EXPECT_EQ(state.loaded, before.loaded && !has(events, "0666) = plan"));
    } else if (!has(events, "save_XmlFile| leave")) {
        EXPECT_EQ(state.file, before.file);
    }
    return {faults::unnumbered(events), state};
}

// The run without a fault: the first cycle and one after it.
const std::array<std::vector<Shown>, 2> &reference()
{
    static const auto cycles = [] {
        std::array<std::vector<Shown>, 2> played;
        platform::reset();
        // Mini-XML makes its state on first use in each thread: the children's
        // is still to be made
        std::thread([&] {
            Lines none;
            for (auto &one : played) {
                for (const Step &step : cycle()) {
                    one.push_back(play(step, none));
                }
            }
            internals::reset();
        }).join();
        platform::reset();
        return played;
    }();
    return cycles;
}

TEST(Cycle, LoadsLaunchesTriggersStoresAndRecords)
{
    const auto &shown = reference()[0];
    for (std::size_t at = 0; at < shown.size(); ++at) {
        const Step &step = cycle()[at];
        const auto &[events, state] = shown[at];
        SCOPED_TRACE(step.name);
        const bool group = step.kind == Kind::Group;
        EXPECT_EQ(has(events, sequences::launch()), group || step.kind == Kind::Stop);
        EXPECT_EQ(has(events, sequences::trigger()),
                  group || (step.kind == Kind::Item && !step.output.empty()));
        EXPECT_THAT(state.file.value_or(""), testing::HasSubstr(step.text));
    }
    EXPECT_TRUE(has(shown[3].events, sequences::load()));
}

// --- the run with a fault --------------------------------------------------------

// The events without what depends on the plan: sizes, positions, the item last
// started, and whether there is a text to read.
Lines without_contents(Lines events)
{
    static const std::regex contents("-?[0-9]+|ps \\w*,");
    for (std::string &event : events) {
        event = std::regex_replace(event, contents, "N");
    }
    return faults::without(
        events,
        {"read(plan, N) = N", "FPTEST_ExtractResultMsg| read file unfinish, continue... n = N \n"});
}

class Run
{
  public:
    Run(const Target &target, long number) : target_(target), number_(number)
    {
    }

    // Called when Mini-XML's call fails.
    void meet()
    {
        child_report()->met = true;
        before_fault_ = platform::events();
        place_ = before_fault_.size();
    }

    // The cycle, and once more without a fault in it.
    void play()
    {
        const bool in_memory = target_.function == mini_xml::kMemory;
        bool same = true; // is the state
        for (std::size_t at = 0; at < cycle().size(); ++at) {
            const Shown &clean = reference()[0][at];
            SCOPED_TRACE(cycle()[at].name);
            const bool met = child_report()->met;
            find_fault(clean.events);
            const Shown shown = play_step(at);
            if (child_report()->met && !met) {
                at_fault(cycle()[at], clean, shown);
            } else if (same && !(met && in_memory)) {
                expect(shown, clean);
            } else if (shown.events != clean.events) {
                after_fault(cycle()[at], clean, shown);
            }
            same = shown.state == clean.state;
        }
        for (std::size_t at = 0; child_report()->met && at < cycle().size(); ++at) {
            play_again(at);
        }
    }

  private:
    // Notes where the fault comes, if it is among these events.
    void find_fault(const Lines &events)
    {
        for (std::size_t at = 0; target_.is_recorded() && at < events.size(); ++at) {
            if (events[at].starts_with(target_.function + "(") && ++calls_ == number_) {
                place_ = at;
            }
        }
    }

    Shown play_step(std::size_t at)
    {
        Shown shown = ::play(cycle()[at], before_fault_);
        if (!target_.in_mini_xml() && !platform::steps_left(target_.function)) {
            child_report()->met = true;
        }
        return shown;
    }

    void at_fault(const Step &step, const Shown &clean, const Shown &shown) const
    {
        ASSERT_LE(place_, std::min(clean.events.size(), shown.events.size()));
        const auto place = static_cast<std::ptrdiff_t>(place_);
        EXPECT_TRUE(
            std::equal(shown.events.begin(), shown.events.begin() + place, clean.events.begin()));
        Lines wanted = clean.events;
        if (target_.function == "strdup") { // for the command or for its path
            wanted = shown.events.empty() ? Lines() : faults::without_path(wanted);
            expect(shown.events, wanted);
            return;
        }
        const bool opens = target_.function == "open";
        const bool loads = opens && clean.state.loaded && !shown.state.loaded;
        if (!target_.in_mini_xml() && !loads) {
            wanted = faults::failed(wanted, place_, target_.cuts() ? kCut : 0);
            EXPECT_TRUE(opens || shown.state.loaded == clean.state.loaded);
        }
        compare(step, faults::without_loads(wanted), shown, loads ? EMFILE : 0, true);
        if (!target_.in_mini_xml() && shown.events == clean.events) {
            expect(shown, clean);
        }
    }

    void after_fault(const Step &step, const Shown &clean, const Shown &shown) const
    {
        Lines wanted = faults::without_loads(clean.events);
        if (step.kind == Kind::ReadBack && !shown.state.file) {
            wanted = faults::failed(wanted, 1, 0); // its open
        }
        compare(step, wanted, shown, shown.state.file ? 0 : ENOENT, false);
    }

    // The errno is that of a plan that could not be opened.
    void compare(const Step &step, Lines wanted, const Shown &shown, int error, bool exactly) const
    {
        const bool uses_plan =
            step.kind == Kind::Group || step.kind == Kind::Item || step.kind == Kind::Report;
        if (uses_plan && !shown.state.loaded) {
            wanted = faults::without_plan(wanted, step.kind, error);
        }
        Lines events = faults::without_loads(shown.events);
        if (!exactly) {
            wanted = without_contents(wanted);
            events = without_contents(events);
        }
        if (uses_plan && shown.state.loaded && target_.function == mini_xml::kMemory &&
            events != wanted) {
            child_report()->lacking = true;
            faults::check_ends(shown.events);
        } else {
            expect(events, wanted);
        }
    }

    // All as without the fault, but for what it has left up to the first store.
    void play_again(std::size_t at)
    {
        SCOPED_TRACE(cycle()[at].name + ", again");
        const Shown shown = play_step(at);
        const Shown &clean = reference()[1][at];
        const Lines &first = reference()[0][at].events;
        expect(shown.events, shown.events == first ? first : clean.events);
        if (at >= 2) {
            EXPECT_EQ(shown.state.file, clean.state.file);
            EXPECT_EQ(shown.state.loaded, clean.state.loaded);
        }
    }

    const Target &target_;
    const long number_;
    long calls_ = 0;        // of the function without a fault, up to here
    Lines before_fault_;    // the events of its step
    std::size_t place_ = 0; // of the fault among them
};

// --- one fault -------------------------------------------------------------------

const std::vector<Target> &targets()
{
    static const std::vector<Target> all = {
        {"open", gives(-1, EMFILE), {}},
        {"read", gives(-1, EIO), {}},
        {"write", gives(-1, ENOSPC), {}},
        {"write", limit(kCut), {}},
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
    return all;
}

void plan(const Target &target, long number, Run &run)
{
    if (target.in_mini_xml()) {
        mini_xml::plan_fault(target.function, number, [&run] { run.meet(); });
        return;
    }
    std::vector<platform::Step> steps(static_cast<std::size_t>(number - 1), platform::pass());
    steps.push_back(target.step);
    platform::plan_steps(target.function, steps);
    steps.back() = gives(-1, EBADF);
    for (const std::string &other : target.others) {
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

    SCOPED_TRACE(target.function + ", call " + std::to_string(number));
    platform::reset();
    Run run(target, number);
    plan(target, number, run);
    run.play();
    std::fflush(stdout);
    _exit(testing::Test::HasFailure() ? 1 : 0);
}

// Mini-XML 3.3.1 does not check whether there was memory for
//   _mxml_global       the state that it makes on first use: it ends the process
//   mxmlNewElement     an element's name: mxml_load_data ends the process at the
//                      closing tag; at any other element the library refuses the plan
//   mxmlNewText        a text: the library refuses the plan
//   mxmlElementSetAttr an attribute, and has no result: the load or the report
//                      goes on without it
//   mxml_load_data     a comment's node: it takes that for the document's end
const std::set<std::string> kCrashes = {"_mxml_global", "mxml_load_data"};

struct Outcome {
    std::map<std::string, int> known; // how many faults have led to each known case
    Lines findings; // told at the end: a child inherits the failures before its own
};

void judge(int status, const Target &target, const std::string &name, Outcome &outcome)
{
    const std::string died_in = child_report()->died_in;
    const bool in_memory = target.function == mini_xml::kMemory;
    if (WIFSIGNALED(status)) {
        if (in_memory && WTERMSIG(status) == SIGSEGV && kCrashes.contains(died_in)) {
            ++outcome.known["ends the process in " + died_in];
        } else {
            outcome.findings.push_back(name + ": ended in \"" + child_report()->step + "\" by " +
                                       strsignal(WTERMSIG(status)) + " " + died_in);
        }
    } else if (WEXITSTATUS(status) != 0) {
        outcome.findings.push_back(name + ": see above");
    } else if (child_report()->lacking) {
        ++outcome.known["loses something without a word"];
    }
}

// Whether the cycle still had such a call.
bool inject(const Target &target, long number, Outcome &outcome)
{
    *child_report() = {};
    std::fflush(stdout);
    const pid_t pid = fork();
    if (pid == 0) {
        child(target, number);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    judge(status, target, target.function + ", call " + std::to_string(number), outcome);
    return child_report()->met;
}

TEST(Faults, EachCallOfThePlatformFailsOnce)
{
    reference(); // and the platform's directory are this process's, not a child's
    Outcome outcome;
    long all = 0;
    std::puts("Faults injected, one in each run of the cycle:");
    for (const Target &target : targets()) {
        long number = 1;
        while (inject(target, number, outcome)) {
            ++number;
        }
        if (number == 1) {
            outcome.findings.push_back("the cycle has no " + target.function);
        }
        const std::string name = target.cuts() ? "write, cut short" : target.function;
        std::printf("  %-20s %4ld\n", name.c_str(), number - 1);
        all += number - 1;
    }
    std::printf("  %-20s %4ld\n\n", "all", all);
    std::puts("Known cases, when memory is short inside Mini-XML:");
    for (const auto &[known, count] : outcome.known) {
        std::printf("  %-48s %4d\n", known.c_str(), count);
    }
    EXPECT_THAT(outcome.findings, IsEmpty());
}

} // namespace
