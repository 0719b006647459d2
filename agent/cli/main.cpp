// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest: the command line. What the sub-commands do stands in files of their
// own.
#include "cli/commands.h"
#include "cli/desk_paths.h"
#include "cli/usage.h"
#include "util/files.h"
#include "util/text.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fcntl.h>
#include <functional>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

using fptest::Exit;

constexpr char kExamples[] =
    "Examples:\n"
    "  fptest check plans/demo.xml\n"
    "  fptest run --plan plans/demo.xml demo/Bringup\n"
    "  fptest show\n"
    "\n"
    "Exit status: 0 all passed; 1 some failed or did not report, or a checked plan\n"
    "has errors; 2 wrong usage or an error in the plan; 3 the device is not ready;\n"
    "130 interrupted.";

constexpr char kRunExamples[] =
    "A PATH is root/group or root/group/item; the root may be any word.\n"
    "\n"
    "Examples:\n"
    "  fptest run --plan plans/demo.xml demo/Bringup demo/Gather\n"
    "  fptest run --timeout 30 --junit results.xml demo/Bringup/SpiCheck\n"
    "  fptest run --plan plans/demo.xml --list\n"
    "  prove --exec 'fptest run --tap' demo/Bringup";

constexpr char kCheckExamples[] = "Examples:\n"
                                  "  fptest check plans/*.xml";

constexpr char kShowExamples[] = "Examples:\n"
                                 "  fptest show\n"
                                 "  fptest show results/annotated.xml";

constexpr char kReportExamples[] =
    "Lets a shell script be an item. RESULT is 0, 1 or -2: the library has a text for\n"
    "no other code.\n"
    "\n"
    "Examples:\n"
    "  fptest report Bringup SpiCheck --progress 50 --result -2\n"
    "  fptest report Bringup SpiCheck --progress 100 --result 0 \\\n"
    "      --description 'chip answers at 8 MHz'";

constexpr char kSendExamples[] =
    "Prints one line a command: the reply, empty if there is none. What the library\n"
    "and the items print goes to standard error.\n"
    "\n"
    "Examples:\n"
    "  fptest send pingtest XMLNodePath::demo/Bringup\n"
    "  printf 'XMLFile::%s\\0XMLNodePath::demo/Bringup' \"$(cat plan.xml)\" |\n"
    "      adb shell -T fptest send -0";

// What is wrong with a value, which a shell's variable may have left empty.
std::string refused(const std::string &value, const std::string &why)
{
    return value.empty() ? "its value is empty" : "'" + fptest::one_line(value) + "' " + why;
}

// A whole number or fraction in that range. CLI11's own takes an empty text for 0.
template <typename Number> CLI::Validator range(Number least, Number most)
{
    return {[least, most](std::string &text) {
                Number number{};
                const char *end = text.data() + text.size();
                const auto [stop, error] = std::from_chars(text.data(), end, number);
                const bool is_number = error == std::errc{} && stop == end;
                // said so that what is not a number at all is in no range
                if (is_number && number >= least && number <= most) {
                    return std::string();
                }
                std::ostringstream complaint;
                complaint.precision(10);
                complaint << "is no number from " << least << " to " << most;
                return refused(text, complaint.str());
            },
            ""};
}

// Seconds, or so many minutes, hours or days; put down in seconds.
CLI::Validator time_span()
{
    return {[](std::string &text) {
                constexpr double kMostDays = 1000;
                static constexpr std::pair<char, double> kUnits[] = {
                    {'s', 1}, {'m', 60}, {'h', 3600}, {'d', 86400}};
                double number = 0;
                const char *const last = text.data() + text.size();
                const auto [stop, error] = std::from_chars(text.data(), last, number);
                double seconds = error == std::errc{} && stop == last ? number : 0;
                for (const auto &[unit, size] : kUnits) {
                    if (error == std::errc{} && stop + 1 == last && *stop == unit) {
                        seconds = number * size;
                    }
                }
                if (seconds > kMostDays * 86400) {
                    return refused(text, "is longer than 1000 days");
                }
                if (!(seconds >= 0.001)) {
                    return refused(text, "is no time as 90, 90s, 10m, 2h or 1d");
                }
                std::ostringstream put_down;
                put_down.precision(17);
                put_down << seconds;
                text = put_down.str();
                return std::string();
            },
            ""};
}

// The codes that the library has a text for, spelled as it does.
CLI::Validator result_code()
{
    return {[](std::string &text) {
                return text == "0" || text == "1" || text == "-2"
                           ? std::string()
                           : refused(text, "is none of 0, 1 and -2");
            },
            ""};
}

// How a plan comes into its place.
CLI::Validator plan_use()
{
    return {[](std::string &text) {
                return text == "command" || text == "file"
                           ? std::string()
                           : refused(text, "is neither command nor file");
            },
            ""};
}

CLI::Validator not_empty()
{
    return {[](std::string &text) { return text.empty() ? refused(text, "") : ""; }, ""};
}

// A plan that device/run has taken the working directory away from.
CLI::Validator desk_file()
{
    return {[](std::string &text) {
                text = fptest::found_on_desk(text);
                return std::string();
            },
            ""};
}

class CommandLine
{
  public:
    CommandLine()
    {
        app_.set_version_flag("--version", "fptest " FPTEST_VERSION, "Print the version and exit");
        app_.set_help_flag("-h,--help", "Print this help and exit");
        app_.failure_message(fptest::usage_line);
        app_.require_subcommand(1);
        app_.option_defaults()->disable_flag_override();
        app_.footer(kExamples);
        app_.get_formatter()->column_width(24);
        add_run();
        add_check();
        add_show();
        add_report();
        add_send();
    }

    Exit run(int argc, char **argv)
    {
        require_known_command(argc, argv);
        std::vector<std::string> words(argv + std::min(argc, 1), argv + argc);
        if (const CLI::App *command = words.empty() ? nullptr : find(words.front())) {
            words = fptest::readable(*command, std::move(words));
        }
        std::ranges::reverse(words); // as the parser wants them
        try {
            app_.parse(std::move(words));
        } catch (const CLI::ParseError &error) {
            return app_.exit(error) == 0 ? Exit::success : Exit::usage;
        }
        return action_();
    }

  private:
    const CLI::App *find(const std::string &name) const
    {
        const auto commands = app_.get_subcommands(nullptr);
        const auto found = std::ranges::find(commands, name, &CLI::App::get_name);
        return found == commands.end() ? nullptr : *found;
    }

    // CLI11 would only say that there is none.
    void require_known_command(int argc, char **argv) const
    {
        const std::string word = argc > 1 ? argv[1] : "";
        std::vector<std::string> names;
        for (const CLI::App *command : app_.get_subcommands(nullptr)) {
            names.push_back(command->get_name());
        }
        if (word.empty() || find(word) != nullptr || word == "--help" || word == "-h" ||
            word == "--version") {
            return;
        }
        if (word.starts_with('-')) {
            throw fptest::Failure(Exit::usage, fptest::unknown_option(word, app_));
        }
        const std::string near = fptest::nearest(word, names);
        throw fptest::Failure(Exit::usage,
                              "there is no command '" + fptest::one_line(word) + "'" +
                                  (near.empty() ? "; the" : "; did you mean '" + near + "'? The") +
                                  " commands are " + fptest::listing(names));
    }

    CLI::App *add(const char *name, const char *purpose, const char *examples,
                  std::function<Exit()> action)
    {
        CLI::App *command = app_.add_subcommand(name, purpose);
        command->footer(examples);
        command->failure_message(fptest::usage_line);
        command->callback([this, action = std::move(action)] { action_ = action; });
        return command;
    }

    static void add_log(CLI::App *command, std::string &log)
    {
        command
            ->add_option("--log", log,
                         "append the library's log to FILE; without, it\n"
                         "goes where VR_LOG_FILE says, or nowhere")
            ->type_name("FILE")
            ->check(not_empty());
    }

    void add_run()
    {
        CLI::App *command = add("run", "Store a plan and run groups or items of it", kRunExamples,
                                [this] { return fptest::run(run_); });
        command->add_option("PATH", run_.paths, "what to run")->type_name("");
        command
            ->add_option("--plan", run_.plan,
                         "store this plan first ('-': standard input);\n"
                         "without, the stored plan is run")
            ->type_name("FILE")
            ->transform(desk_file())
            ->check(not_empty());
        command->add_flag("--as-sent", run_.as_sent,
                          "store it by a command, which cuts it after\n"
                          "2048 bytes, and never as a file");
        command->add_flag("--as-group", run_.as_group,
                          "one command for each group, not for each\n"
                          "item");
        command->add_option("--timeout", run_.timeout, "stop an item that takes longer")
            ->type_name("SECONDS")
            ->check(range(0.001, 1000000.0));
        command->add_option("--grace", run_.grace, "then kill it after so long")
            ->type_name("SECONDS")
            ->capture_default_str()
            ->check(range(0.0, 1000000.0));
        command->add_flag("--exit-status", run_.exit_status,
                          "an item that ends with a status other than\n"
                          "0 has failed");
        command->add_option("--repeat", run_.repeat, "run everything N times")
            ->type_name("N")
            ->check(range(1, 1000000));
        command
            ->add_option("--for", run_.time_limit,
                         "begin another round of everything for so\n"
                         "long: 90, 90s, 10m, 2h, 1d")
            ->type_name("TIME")
            ->transform(time_span());
        command->add_flag("--until-fail", run_.until_fail,
                          "end with the first item that does not pass;\n"
                          "begin another round until then");
        command->add_flag("--list", run_.list,
                          "print what would be run and start nothing;\n"
                          "without PATH, all that can be run");
        command
            ->add_option("--junit", run_.junit,
                         "write the results as JUnit XML ('-': standard\n"
                         "output)")
            ->type_name("FILE")
            ->check(not_empty());
        command
            ->add_option("--json", run_.json,
                         "write them as JSON lines, as they come\n"
                         "('-': standard output)")
            ->type_name("FILE")
            ->check(not_empty());
        command->add_flag("--tap", run_.tap,
                          "write them as TAP to standard output, in\n"
                          "place of the view");
        command->add_option("--pass-code", run_.pass_code, "the result that means passed")
            ->type_name("N")
            ->capture_default_str()
            ->check(result_code());
        command->add_flag("--force", run_.force,
                          "run in spite of errors in the plan and of\n"
                          "missing programs");
        command->add_flag("--quiet", run_.quiet, "print only what did not pass");
        add_log(command, run_.log);
    }

    void add_check()
    {
        CLI::App *command = add("check", "Say what the library would make of a plan",
                                kCheckExamples, [this] { return fptest::check_files(check_); });
        command->add_option("FILE", check_.files, "test plans ('-': standard input)")
            ->type_name("")
            ->transform(desk_file())
            ->check(not_empty())
            ->required();
        command
            ->add_option("--for", check_for_,
                         "how it is to be stored: by a command, which\n"
                         "cuts it, or as a file")
            ->type_name("command|file")
            ->check(plan_use())
            ->each([this](const std::string &use) {
                check_.use = use == "file" ? fptest::PlanUse::stored : fptest::PlanUse::to_send;
            });
    }

    void add_show()
    {
        CLI::App *command = add("show", "Print an annotated plan as a table", kShowExamples,
                                [this] { return fptest::show(shown_); });
        command
            ->add_option("FILE", shown_,
                         "the plan ('-': standard input); without, the\n"
                         "stored one")
            ->type_name("")
            ->transform(desk_file())
            ->check(not_empty());
    }

    void add_report()
    {
        CLI::App *command =
            add("report", "Write an item's progress and result into the stored plan",
                kReportExamples, [this] { return fptest::report(report_); });
        command->add_option("GROUP", report_.group, "the item's group")->type_name("")->required();
        command->add_option("ITEM", report_.item, "the item's name")->type_name("")->required();
        command->add_option("--progress", report_.progress, "a number, 100 for the end")
            ->type_name("N")
            ->required()
            ->check(range(-99999999, 999999999));
        command->add_option("--result", report_.result, "0, 1 or -2")
            ->type_name("R")
            ->required()
            ->check(result_code());
        command->add_option("--description", report_.description, "free text")->type_name("TEXT");
        add_log(command, report_.log);
    }

    void add_send()
    {
        CLI::App *command = add("send", "Hand raw command strings to the library", kSendExamples,
                                [this] { return fptest::send(send_); });
        command->add_option("COMMAND", send_.commands, "HEAD::NAME::ARGUMENTS")->type_name("");
        command->add_flag("-0", send_.from_input,
                          "read them from standard input instead, a\n"
                          "zero byte after each, as after the replies");
        add_log(command, send_.log);
    }

    CLI::App app_{"Runs test plans of a fingerprint-sensor stack through the Quillmark library.",
                  "fptest"};
    std::function<Exit()> action_;
    fptest::RunOptions run_;
    fptest::CheckOptions check_;
    std::string check_for_;
    std::string shown_;
    fptest::ReportOptions report_;
    fptest::SendOptions send_;
};

Exit complain(Exit status, const std::string &text)
{
    std::fflush(stdout);
    std::fprintf(stderr, "fptest: %s\n", text.c_str());
    return status;
}

} // namespace

int main(int argc, char **argv)
{
    fptest::fill_standard_descriptors();
    // a reader that has left is met as an error where it is written to
    std::signal(SIGPIPE, SIG_IGN);
    Exit status = Exit::success;
    try {
        status = CommandLine().run(argc, argv);
    } catch (const fptest::Failure &failure) {
        status = complain(failure.status(), failure.what());
    } catch (const std::exception &error) {
        status = complain(Exit::environment, error.what());
    }
    // items that did not pass are told by run's own views; errors in a plan are told here
    const bool is_untold = std::fflush(stdout) != 0 || std::ferror(stdout) != 0;
    if (is_untold && (status == Exit::success || status == Exit::items_failed)) {
        status = complain(Exit::environment, "standard output cannot be written");
    }
    return static_cast<int>(status);
}
