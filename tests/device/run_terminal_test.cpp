// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How a device ends at a terminal: by keys typed there, and by its end.
#include "../quoted.h"
#include "common/descriptor.h"
#include "launcher_runner.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <optional>
#include <pty.h>
#include <string>
#include <thread>
#include <unistd.h>
#include <utmp.h>

using namespace launcher;
using namespace std::chrono_literals;

namespace
{

// A program at a terminal of its own, until that is closed.
class AtATerminal
{
  public:
    explicit AtATerminal(const Words &words)
    {
        int terminal = -1;
        int other_side = -1;
        EXPECT_EQ(openpty(&terminal, &other_side, nullptr, nullptr, nullptr), 0);
        terminal_ = Descriptor(terminal);
        const Descriptor closed(other_side);
        support::Start start = start_of(words);
        start.shares_streams = true;
        start.prepare = [other_side] { login_tty(other_side); };
        process_.emplace(start);
    }
    int terminal() const
    {
        return terminal_.get();
    }
    void close()
    {
        terminal_ = Descriptor(-1);
    }
    Outcome outcome()
    {
        return outcome_of(*process_);
    }

  private:
    Descriptor terminal_{-1};
    std::optional<support::Process> process_;
};

// Runs a script on a device at a terminal, and types a key when it says "ready".
Outcome at_a_terminal(const std::string &script, char key)
{
    AtATerminal device({device_run, "--", "sh", "-c", script});
    std::string out;
    bool typed = false;
    for (std::array<char, 4096> buffer{};;) {
        const ssize_t got = read(device.terminal(), buffer.data(), buffer.size());
        if (got <= 0) {
            break;
        }
        out.append(buffer.data(), static_cast<std::size_t>(got));
        if (!typed && out.find("ready") != std::string::npos) {
            typed = write(device.terminal(), &key, 1) == 1;
        }
    }
    return {device.outcome().status, out, ""};
}

constexpr char ctrl_c = '\x03';
constexpr char ctrl_backslash = '\x1c';

TEST_F(Device, CtrlCIsCommandsToHandle)
{
    const Outcome outcome = at_a_terminal(
        "trap 'echo handled; exit 7' INT; echo ready; while :; do sleep 0.05; done", ctrl_c);

    EXPECT_NE(outcome.out.find("handled"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.status, 7);
}

TEST_F(Device, CtrlCEndsACommandThatDoesNotHandleIt)
{
    // not said by the shell, which may lose the key on the way to becoming another program
    const std::string sleeper = R"(exec /usr/bin/perl -e '$| = 1; alarm 9; print "ready"; sleep')";

    EXPECT_EQ(at_a_terminal(sleeper, ctrl_c).status, 130);
}

TEST_F(Device, CtrlCDoesNotEndACommandThatIgnoresIt)
{
    const Outcome outcome = at_a_terminal("trap '' INT; echo ready; sleep 0.5; echo done", ctrl_c);

    EXPECT_NE(outcome.out.find("done"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.status, 0);
}

TEST_F(Device, CtrlBackslashIsCommandsToHandle)
{
    EXPECT_EQ(at_a_terminal("trap 'exit 8' QUIT; echo ready; while :; do sleep 0.05; done",
                            ctrl_backslash)
                  .status,
              8);
}

TEST_F(Device, CtrlCComesToCommandOnce)
{
    const Outcome outcome =
        at_a_terminal("exec " + quoted(this_program) + " " + say_signals_option, ctrl_c);

    EXPECT_TRUE(outcome.out.ends_with("ready\r\n^CINT\r\n")) << outcome.out;
    EXPECT_EQ(outcome.status, 7);
}

TEST_F(Device, AClosedTerminalComesToCommandOnce)
{
    // the terminal's first process, which gets the signal, may be device/run or a shell
    for (const std::string first : {"exec ", ""}) {
        const TemporaryDirectory host;
        const fs::path said = host.path() / "said";
        AtATerminal shell({"sh", "-c", first + "\"$0\" \"$1\" \"$2\" >\"$3\" 2>&1; :", device_run,
                           this_program, say_signals_option, said});
        ASSERT_TRUE(eventually([&] { return last_line(read_file(said)) == "ready"; }));

        shell.close();

        EXPECT_TRUE(eventually([&] { return last_line(read_file(said)) == "HUP"; }));
        shell.outcome();
        std::this_thread::sleep_for(700ms);
        EXPECT_EQ(lines_of(read_file(said)).end()[-2], "ready") << read_file(said);
    }
}

} // namespace
