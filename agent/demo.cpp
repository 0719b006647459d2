// The main job from end to end, as a host agent does it: a test plan is stored,
// a group and an item of it are run, the gatherer is started and triggered
// again, a long item is stopped, and the annotated plan is read back. It knows
// the module by its public header alone and is started by scripts/demo, inside
// the virtual device.
#include "quillmark.h"

#include <CLI/CLI.hpp>

#include <array>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

namespace
{

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr char kPlanFile[] = "/data/vorlane/src1.xml";
constexpr char kLogFile[] = "/tmp/quillmark-demo.log";
constexpr std::size_t kPlanRoom = 64 * 1024;

struct Item {
    std::string group;
    std::string name;
    std::optional<std::string> progress;
    std::optional<std::string> result;
    std::optional<std::string> description;
};

using Tree = std::unique_ptr<mxml_node_t, decltype(&mxmlDelete)>;

std::optional<std::string> attribute(mxml_node_t *node, const char *name)
{
    const char *value = mxmlElementGetAttr(node, name);
    return value != nullptr ? std::optional<std::string>(value) : std::nullopt;
}

// The items of a plan's text; none where it does not parse, as when it is being
// written at this moment.
std::vector<Item> items_of(const std::string &text)
{
    std::vector<Item> items;
    mxmlSetErrorCallback([](const char *) {});
    const Tree tree(mxmlLoadString(nullptr, text.c_str(), nullptr), &mxmlDelete);
    mxmlSetErrorCallback(nullptr);
    if (!tree) {
        return items;
    }
    mxml_node_t *const top = tree.get();
    for (mxml_node_t *node = mxmlFindElement(top, top, "Cmd", nullptr, nullptr, MXML_DESCEND);
         node != nullptr;
         node = mxmlFindElement(node, top, "Cmd", nullptr, nullptr, MXML_DESCEND)) {
        items.push_back({attribute(mxmlGetParent(node), "name").value_or(""),
                         attribute(node, "name").value_or(""), attribute(node, "progress"),
                         attribute(node, "result"), attribute(node, "description")});
    }
    return items;
}

Item find_item(const std::vector<Item> &items, const std::string &name)
{
    for (const Item &item : items) {
        if (item.name == name) {
            return item;
        }
    }
    return {};
}

std::string file_text(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

std::string read_back()
{
    std::vector<char> buffer(kPlanRoom + 1, '\0');
    FPTEST_ExtractResultMsg(buffer.data(), static_cast<int>(kPlanRoom));
    return buffer.data();
}

bool wait_for(const std::function<bool()> &condition, Clock::duration limit)
{
    const auto end = Clock::now() + limit;
    while (!condition()) {
        if (Clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(20ms);
    }
    return true;
}

void field(const char *name, const std::string &text)
{
    std::printf("   %-8s %s\n", name, text.c_str());
}

std::string first_line(const std::string &text, std::size_t width)
{
    std::string line = text.substr(0, text.find('\n'));
    if (line.size() > width || line.size() < text.size()) {
        line = line.substr(0, width) + " ...";
    }
    return line;
}

void print_table(const std::vector<Item> &items)
{
    std::printf("   %-10s %-12s %8s  %6s  %s\n", "GROUP", "ITEM", "PROGRESS", "RESULT",
                "DESCRIPTION");
    for (const Item &item : items) {
        std::printf("   %-10.10s %-12.12s %8.8s  %6.6s  %.36s\n", item.group.c_str(),
                    item.name.c_str(), item.progress.value_or("-").c_str(),
                    item.result.value_or("-").c_str(), item.description.value_or("-").c_str());
    }
}

// Follows the module's log, to tell what ran and, on request, everything.
class LogReader
{
  public:
    explicit LogReader(bool print_all) : print_all_(print_all)
    {
    }

    // Prints what is new since the last call; gives the number of items run.
    int show_new()
    {
        const std::vector<std::string> lines = take_lines();
        int commands = 0;
        for (std::size_t at = 0; at < lines.size(); ++at) {
            const auto command = lines[at].find(kCommand);
            if (command != std::string::npos) {
                last_command_ = lines[at].substr(command + kCommand.size());
                field(runs_already(lines, at) ? "told" : "ran", last_command_);
                ++commands;
            }
        }
        if (print_all_) {
            for (const std::string &line : lines) {
                std::printf("   | %s\n", line.c_str());
            }
        }
        return commands;
    }

    [[nodiscard]] const std::string &last_command() const
    {
        return last_command_;
    }

  private:
    static constexpr std::string_view kCommand = "=> tpCmd:";

    std::vector<std::string> take_lines()
    {
        std::ifstream log(kLogFile, std::ios::binary);
        log.seekg(position_);
        std::vector<std::string> lines;
        for (std::string line; std::getline(log, line);) {
            position_ += static_cast<std::streamoff>(line.size()) + 1;
            lines.push_back(std::move(line));
        }
        return lines;
    }

    // Whether the command at that line is the gatherer's, found running.
    static bool runs_already(const std::vector<std::string> &lines, std::size_t at)
    {
        return at + 2 < lines.size() && lines[at + 2] == "row=1";
    }

    bool print_all_;
    std::streamoff position_ = 0;
    std::string last_command_;
};

class Demo
{
  public:
    Demo(std::string plan, bool print_log) : plan_(std::move(plan)), log_(print_log)
    {
    }

    int run()
    {
        ping();
        store();
        run_group();
        run_item();
        start_gatherer();
        trigger_gatherer();
        stop_long_item();
        show_results();
        if (failures_ > 0) {
            std::printf("\nThe demo failed: see the %d line%s marked FAILED above.\n", failures_,
                        failures_ == 1 ? "" : "s");
            return EXIT_FAILURE;
        }
        std::printf("\nEverything ran as it should.\n");
        return EXIT_SUCCESS;
    }

  private:
    void step(const char *title)
    {
        std::printf("\n%d. %s\n", ++steps_, title);
    }

    void expect(bool holds, const std::string &what)
    {
        if (!holds) {
            ++failures_;
            field("FAILED", what);
        }
    }

    std::string send(const std::string &command)
    {
        std::array<char, 100> reply{};
        field("sent", first_line(command, 60));
        std::fflush(stdout); // the module writes there as well, and so may an item
        FPTEST_RunTestCmd(command.c_str(), reply.data(), static_cast<int>(reply.size()));
        std::fflush(stdout);
        return reply.data();
    }

    // Sends a node path, and says how long it took and what it started.
    void run_path(const std::string &path, int items)
    {
        const auto start = Clock::now();
        send("XMLNodePath::" + path);
        const std::chrono::duration<double> took = Clock::now() - start;
        const int started = log_.show_new();
        std::array<char, 32> text{};
        std::snprintf(text.data(), text.size(), "%.1f s", took.count());
        field("took", text.data());
        expect(started == items,
               "started " + std::to_string(started) + " items, not " + std::to_string(items));
    }

    void expect_result(const std::string &name, const char *result)
    {
        const Item item = find_item(items_of(read_back()), name);
        expect(item.result == result,
               name + " has the result " + item.result.value_or("(none)") + ", not " + result);
    }

    void ping()
    {
        step("Ping the module");
        const std::string reply = send("pingtest");
        field("reply", reply);
        expect(reply == "Ping Success!", "no reply to the first ping");
        log_.show_new();
    }

    void store()
    {
        step("Store a test plan");
        send("XMLFile::" + plan_);
        field("stored", std::to_string(plan_.size()) + " bytes in " + kPlanFile);
        expect(read_back() == plan_, "what is stored is not what was sent");
        log_.show_new();
    }

    void run_group()
    {
        step("Run a group: every item of it, in order");
        run_path("demo/Bringup", 4);
        expect_result("SpiCheck", "0");
        expect_result("DeadPixel", "1");
        expect_result("FingerWait", "-2");
        expect(!find_item(items_of(read_back()), "QuietRun").result, "QuietRun has reported");
    }

    void run_item()
    {
        step("Run a single item");
        run_path("demo/Bringup/SpiCheck", 1);
        expect_result("SpiCheck", "0");
    }

    // The gatherer reports in its own time: the command returns once it is told.
    // Under vendor 2 it is an ordinary item, which has ended by then.
    void await_gathering(std::optional<std::string> before)
    {
        if (log_.last_command().find("_ca_qsee ") != std::string::npos) {
            field("note", "under vendor 2 the gatherer is run to its end instead");
            before.reset();
        }
        Item item;
        const bool told = wait_for(
            [&] {
                item = find_item(items_of(file_text(kPlanFile)), "SensorProbe");
                return item.description && item.description != before;
            },
            10s);
        field("gathered", item.description.value_or("nothing"));
        expect(told, "the gatherer has not reported within 10 s");
        log_.show_new();
    }

    void start_gatherer()
    {
        step("Start the gatherer and trigger it");
        run_path("demo/Gather/SensorProbe", 1);
        await_gathering(std::nullopt);
    }

    void trigger_gatherer()
    {
        step("Trigger the gatherer again");
        const auto before = find_item(items_of(read_back()), "SensorProbe").description;
        run_path("demo/Gather/SensorProbe", 1);
        await_gathering(before);
    }

    void stop_long_item()
    {
        step("Stop a long item while it runs");
        std::atomic<bool> returned = false;
        const auto start = Clock::now();
        std::thread command([&] {
            send("XMLNodePath::demo/Endurance/BurnIn");
            returned = true;
        });
        // calls must not overlap: the plan is read as a file here
        wait_for(
            [&] {
                const Item item = find_item(items_of(file_text(kPlanFile)), "BurnIn");
                return returned || (item.progress && Clock::now() - start > 1s);
            },
            10s);
        expect(!returned, "BurnIn ended by itself");
        const int stopped = FPTEST_SuspendItemExecute();
        field("stopped", stopped == 0 ? "BurnIn, by FPTEST_SuspendItemExecute" : "nothing");
        expect(stopped == 0, "there was no BurnIn to stop");
        expect(wait_for([&] { return returned.load(); }, 10s), "BurnIn goes on 10 s later");
        command.join();
        const std::chrono::duration<double> took = Clock::now() - start;
        log_.show_new();
        std::array<char, 64> text{};
        std::snprintf(text.data(), text.size(), "%.1f s of the item's 60 s", took.count());
        field("took", text.data());
        field("note", "the stop names process 9 as well, which is nobody here");
    }

    void show_results()
    {
        step("Read the annotated plan back");
        const std::string text = read_back();
        field("read", std::to_string(text.size()) + " bytes");
        log_.show_new();
        std::printf("\n");
        print_table(items_of(text));
        std::printf("\n   Results, as the sample items use them: 0 passed, 1 failed,\n"
                    "   -2 not finished, - nothing reported.\n");
    }

    std::string plan_;
    LogReader log_;
    int steps_ = 0;
    int failures_ = 0;
};

int run_demo(const std::string &plan_file, bool print_log)
{
    if (std::getenv("QUILLMARK_DEVICE") == nullptr) {
        std::fprintf(stderr, "quillmark-demo: this runs on the virtual device only: "
                             "use scripts/demo\n");
        return EXIT_FAILURE;
    }
    const std::string plan = file_text(plan_file);
    if (plan.empty()) {
        std::fprintf(stderr, "quillmark-demo: %s: no test plan there\n", plan_file.c_str());
        return EXIT_FAILURE;
    }
    // a gatherer that has gone must not end its host
    std::signal(SIGPIPE, SIG_IGN);
    unlink(kLogFile);
    setenv("VR_LOG_FILE", kLogFile, 1);
    return Demo(plan, print_log).run();
}

} // namespace

int main(int argc, char **argv)
{
    CLI::App app{"Runs the demo's test plan through the module."};
    std::string plan_file = "plans/demo.xml";
    bool print_log = false;
    app.add_option("--plan", plan_file, "the demo's test plan")->check(CLI::ExistingFile);
    app.add_flag("--log", print_log, "print the module's log after each step");
    CLI11_PARSE(app, argc, argv);
    return run_demo(plan_file, print_log);
}
