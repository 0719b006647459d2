// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/log_option.h"
#include "cli/options.h"
#include "module/device_lock.h"
#include "module/library_process.h"
#include "module/log_file.h"
#include "module/own_ps.h"
#include "module/preflight.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "run/signals.h"
#include "util/files.h"
#include "util/write.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <memory>
#include <string>
#include <string_view>
#include <unistd.h>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kSendExamples[] =
    "Prints one line a command: the reply, empty if there is none. What the library\n"
    "and the items print goes to standard error.\n"
    "\n"
    "Examples:\n"
    "  fptest send pingtest XMLNodePath::demo/Bringup\n"
    "  printf 'XMLFile::%s\\0XMLNodePath::demo/Bringup' \"$(cat plan.xml)\" |\n"
    "      adb shell -T fptest send -0";

struct SendOptions {
    std::vector<std::string> commands;
    bool from_input = false; // separated by zero bytes, and the replies as well
    std::string log;
};

using namespace std::chrono_literals;

// Commands separated by zero bytes, with or without one after the last.
std::vector<std::string> read_commands()
{
    std::vector<std::string> commands;
    const auto input = read_file("-");
    if (!input || input->empty()) {
        throw Failure(Cause::input, "no command can be read from standard input{}",
                      input ? "" : ": " + why_unread());
    }
    const std::string &text = *input;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t end = std::min(text.find('\0', at), text.size());
        commands.push_back(text.substr(at, end - at));
        at = end + 1;
    }
    return commands;
}

// What the library takes for the command's head: colons in front of it are passed
// over.
std::string_view head_of(std::string_view command)
{
    command.remove_prefix(std::min(command.find_first_not_of(':'), command.size()));
    return command.substr(0, command.find(':'));
}

// The plan that a command stores; nullopt if it stores none.
std::optional<std::string> plan_of(std::string_view command)
{
    const std::string_view head = head_of(command);
    if (!head.starts_with("XMLFile")) {
        return std::nullopt;
    }
    return as_stored(
        command.substr(static_cast<std::size_t>(head.data() + head.size() - command.data())));
}

// The names of the items that a command may run, so that they can be stopped.
std::vector<std::string> items_of(const std::string &command)
{
    std::vector<std::string> names;
    if (!head_of(command).starts_with("XMLNodePath")) {
        return names;
    }
    if (const auto plan = Plan::load_as_library(read_stored_plan().value_or(""))) {
        for (const Plan::Group &group : plan->groups()) {
            for (const Plan::Element &item : group.items) {
                names.push_back(item.name.value_or(""));
            }
        }
    }
    return names;
}

class Sender
{
  public:
    explicit Sender(const DeviceLock &lock) : signals_([&lock] { return lock.is_asked_to_stop(); })
    {
    }

    // The reply; nullopt if the command was interrupted.
    std::optional<std::string> send(const std::string &command)
    {
        // nobody may be writing the plan while the library loads it
        Descriptor plan =
            head_of(command).starts_with("XMLNodePath") ? lock_stored_plan() : Descriptor(-1);
        const auto pass = [](std::string_view text) {
            std::fwrite(text.data(), 1, text.size(), stderr);
        };
        const auto items = items_of(command);
        library_.command(command, items);
        for (;;) {
            const auto event = library_.wait(100ms, {signals_.descriptor()});
            if (event) {
                plan = Descriptor(-1); // the library loads it before it names the first item
                library_.output().take(event->output, pass);
            }
            if (event && event->kind == LibraryProcess::Event::Kind::item) {
                print_to(stderr, "vendor = {}\n", event->value);
            }
            if (const auto size = library_.output_size()) {
                library_.output().take(*size, pass);
            }
            if (event && event->kind == LibraryProcess::Event::Kind::gone) {
                throw Failure(Cause::device, "{}", gone_text(*event));
            }
            if (event && event->kind == LibraryProcess::Event::Kind::returned) {
                return interrupted_ ? std::nullopt : std::optional(event->text);
            }
            interrupted_ = interrupted_ || signals_.take() != 0;
            if (interrupted_) {
                return std::nullopt; // the item ends with the library's process
            }
        }
    }

  private:
    Signals signals_;
    LibraryProcess library_;
    bool interrupted_ = false;
};

Exit send(const SendOptions &options)
{
    require_standard_output("fptest send");
    if (options.commands.empty() != options.from_input) {
        throw Failure(Cause::input, "give COMMANDs as arguments, or with -0 on standard input");
    }
    require_log_of_its_own(options.log, StdoutUse::results);
    require_device();
    choose_log(options.log);
    const std::vector<std::string> commands =
        options.from_input ? read_commands() : options.commands;
    // lock the device as a run does, if a command stores a plan or runs items
    DeviceLock lock;
    if (std::ranges::any_of(commands, [](const std::string &command) {
            return plan_of(command) || head_of(command).starts_with("XMLNodePath");
        })) {
        RunNote note;
        note.plan = "commands";
        lock = DeviceLock(note);
        if (const std::string said = choose_ps(); !said.empty()) {
            say("{}", said);
        }
    }
    Sender sender(lock);
    for (const std::string &command : commands) {
        const auto reply = sender.send(command);
        if (!reply) {
            return Exit::interrupted;
        }
        std::fwrite(reply->data(), 1, reply->size(), stdout);
        std::fputc(options.from_input ? '\0' : '\n', stdout);
        if (std::fflush(stdout) != 0) {
            throw Failure(Cause::device, "replies cannot be written to standard output");
        }
        if (const auto plan = plan_of(command)) {
            require_stored(read_stored_plan().value_or(""), *plan);
        }
    }
    return Exit::success;
}

} // namespace

void add_send(CLI::App &app, Action &chosen)
{
    const auto options = std::make_shared<SendOptions>();
    CLI::App &command = add_subcommand(app, "send", "Hand raw command strings to the library",
                                       kSendExamples, chosen, [options] { return send(*options); });
    command.add_option("COMMAND", options->commands, "HEAD::NAME::ARGUMENTS")->type_name("");
    command.add_flag("-0", options->from_input,
                     "read them from standard input instead, a\n"
                     "zero byte after each, as after the replies");
    add_log(command, options->log);
}

} // namespace fptest
