// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// fptest: the command line, up to the subcommand that it names.
#include "cli/subcommands.h"
#include "cli/usage.h"
#include "module/log_file.h"
#include "util/files.h"
#include "util/spelling.h"
#include "util/text.h"
#include "util/write.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <exception>
#include <fmt/core.h>
#include <string>
#include <vector>

namespace
{

using fptest::Cause;
using fptest::Exit;

constexpr char kExamples[] =
    "Examples:\n"
    "  fptest check plans/demo.xml\n"
    "  fptest run --plan plans/demo.xml demo/Bringup\n"
    "  fptest show\n"
    "\n"
    "Exit status: 0 all passed; 1 some failed or did not report, or a checked plan\n"
    "has errors; 2 wrong usage or an error in the plan; 3 the device is not ready;\n"
    "4 another fptest is running; 130 interrupted.";

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
        fptest::add_run(app_, chosen_);
        fptest::add_check(app_, chosen_);
        fptest::add_show(app_, chosen_);
        fptest::add_html(app_, chosen_);
        fptest::add_report(app_, chosen_);
        fptest::add_measure(app_, chosen_);
        fptest::add_send(app_, chosen_);
        fptest::add_doctor(app_, chosen_);
        fptest::add_status(app_, chosen_);
        fptest::add_stop(app_, chosen_);
    }

    Exit run(int argc, char **argv)
    {
        require_known_command(argc, argv);
        std::vector<std::string> words(argv + std::min(argc, 1), argv + argc);
        if (const CLI::App *command = words.empty() ? nullptr : find(words.front())) {
            words = fptest::split_empty_values(*command, fptest::join_seed(std::move(words)));
            words = fptest::mark_numbers(*command, std::move(words));
        }
        std::ranges::reverse(words); // as the parser wants them
        try {
            app_.parse(std::move(words));
        } catch (const CLI::ParseError &error) {
            if (error.get_exit_code() != 0 && app_.got_subcommand("measure")) {
                fptest::print_refused_measurement("its arguments are no measurement");
            }
            return app_.exit(error) == 0 ? Exit::success : Exit::usage;
        }
        return chosen_();
    }

  private:
    const CLI::App *find(const std::string &name) const
    {
        const auto commands = app_.get_subcommands(nullptr);
        const auto found = std::ranges::find(commands, name, &CLI::App::get_name);
        return found == commands.end() ? nullptr : *found;
    }

    // CLI11 would only say that there is no command.
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
            throw fptest::Failure(Cause::input, "{}", fptest::unknown_option(word, app_));
        }
        throw fptest::Failure(Cause::input, "there is no command {}{}", fptest::in_quotes(word),
                              fptest::known_names(word, names, "the commands are"));
    }

    CLI::App app_{"Runs test plans of a fingerprint-sensor stack through the Quillmark library.",
                  "fptest"};
    fptest::Action chosen_;
};

Exit status_of(Cause cause)
{
    return cause == Cause::input  ? Exit::usage
           : cause == Cause::busy ? Exit::busy
                                  : Exit::environment;
}

Exit complain(Exit status, const std::string &text)
{
    std::fflush(stdout);
    fptest::say("{}", text);
    return status;
}

} // namespace

int main(int argc, char **argv)
{
    fptest::fill_standard_descriptors();
    std::signal(SIGPIPE, SIG_IGN); // report a closed pipe as a write error instead of dying
    std::signal(SIGXFSZ, SIG_IGN); // the same for a file at its size limit
    std::signal(SIGCHLD, SIG_DFL); // the caller may ignore it, and then no child can be waited for
    Exit status = Exit::success;
    try {
        status = CommandLine().run(argc, argv);
    } catch (const fptest::Failure &failure) {
        status = complain(status_of(failure.cause()), failure.what());
    } catch (const std::exception &error) {
        status = complain(Exit::environment, error.what());
    }
    // failed items and errors in a plan are results, not failures of fptest
    const auto has_worked = [&status] {
        return status == Exit::success || status == Exit::items_failed;
    };
    const bool is_unwritten = std::fflush(stdout) != 0 || std::ferror(stdout) != 0;
    if (is_unwritten && has_worked()) {
        status = complain(Exit::environment, "standard output cannot be written");
    }
    const std::string loss = fptest::log_loss();
    if (!loss.empty()) {
        status = complain(has_worked() ? Exit::environment : status, loss);
    }
    return static_cast<int>(status);
}
