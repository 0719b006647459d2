// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/preflight.h"

#include "common/descriptor.h"
#include "module/item_shell.h"
#include "module/processes.h"
#include "module/stored_plan.h"
#include "plan/library_rules.h"
#include "util/files.h"
#include "util/text.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fmt/core.h>
#include <iterator>
#include <netinet/in.h>
#include <sstream>
#include <sys/socket.h>
#include <unistd.h>

namespace fptest
{
namespace
{

std::vector<std::string> words_of(const std::string &text)
{
    std::istringstream stream(text);
    return {std::istream_iterator<std::string>(stream), {}};
}

// On Android it is tried: which file it is depends on the release, and on where the program lies.
bool has_shell_of_c_library()
{
#ifdef __ANDROID__
    std::FILE *shell = popen("echo here", "re");
    const bool runs = shell != nullptr && std::fgetc(shell) == 'h';
    if (shell != nullptr) {
        pclose(shell);
    }
    return runs;
#else
    return access(shell_of_c_library(), X_OK) == 0;
#endif
}

} // namespace

void require_shell()
{
    if (access("/system/bin/sh", X_OK) != 0) {
        throw Failure(Cause::device, "this machine is not a device: there is no /system/bin/sh; "
                                     "on a desk, run it as: device/run -- fptest ...");
    }
    if (!has_shell_of_c_library()) {
        throw Failure(Cause::device,
                      "the C library's shell, by which the library runs items, does not run; "
                      "install {}{}",
                      shell_of_c_library(),
                      end_of_links("/proc/self/exe").starts_with("/vendor/")
                          ? ", or /vendor/bin/sh, as Android 9 to 13 have it for a program in "
                            "/vendor"
                          : "");
    }
}

void require_data()
{
    if (access(kDataDirectory, W_OK | X_OK) != 0) {
        throw Failure(Cause::device, "{} is not writable: {}; make it, or run this as another user",
                      kDataDirectory, std::strerror(errno));
    }
}

void require_device()
{
    refer_to_doctor([] {
        require_shell();
        require_data();
    });
    require_regular_plan();
}

void require_trigger_port()
{
    const Descriptor probe(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    const int on = 1;
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(kTriggerPort);
    setsockopt(probe.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    if (probe.is_open() &&
        bind(probe.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address) != 0) {
        throw Failure(Cause::device,
                      "port {} is not available: {}; the gatherer's run would never end: stop what "
                      "uses it (netstat -tanp names it)",
                      kTriggerPort, std::strerror(errno));
    }
}

void require_programs(const std::vector<std::string> &items, int vendor, bool force)
{
    const std::string suffix = vendor_suffix(vendor).value_or("");
    std::vector<std::string> programs;
    std::vector<std::string> missing;
    bool has_gatherer = false;
    for (const std::string &item : items) {
        const std::string program = program_of(item, suffix);
        if (is_gatherer(item, vendor)) {
            has_gatherer = true;
        } else {
            programs.push_back(program);
            for (const int other : {0, 1, 2}) { // the vendor may have been another one
                const std::string then = program_of(item, *vendor_suffix(other));
                if (then != program_of(kGatherer, "") && then != program_of(kGatherer, "_ca")) {
                    programs.push_back(then);
                }
            }
        }
        if (is_plain_name(item) && access(program.c_str(), X_OK) != 0 &&
            std::ranges::find(missing, program) == missing.end()) {
            missing.push_back(program);
        }
    }
    if (!missing.empty() && !force) {
        throw Failure(Cause::device,
                      "no program {} on this device: install what is missing (device/run --bin DIR "
                      "adds programs), or run the rest with --force",
                      one_line(join_and(missing)));
    }
    if (const auto found = process_of_any(programs)) {
        throw Failure(Cause::device,
                      "{} of an earlier run is still running, as process {}, and would report into "
                      "this one: end it first",
                      one_line(found->first), found->second);
    }
    if (has_gatherer) {
        refer_to_doctor(require_trigger_port);
    }
}

std::string other_gatherer(const std::vector<std::string> &args, const std::string &suffix)
{
    const std::string program = program_of(kGatherer, suffix);
    const auto running = found_as_gatherer();
    if (!running) {
        return {};
    }
    std::string started = read_file(fmt::format("/proc/{}/cmdline", running->second)).value_or("");
    started.erase(0, started.rfind(running->first)); // the interpreter of one that is a script
    started.erase(started.find_last_not_of('\0') + 1);
    std::ranges::replace(started, '\0', ' ');
    const bool is_other = std::ranges::any_of(args, [&](const std::string &one) {
        return words_of(started) != words_of(fmt::format("{} {}", program, one));
    });
    return is_other ? started : "";
}

} // namespace fptest
