// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The events of what several functions have in common, in their order.
#pragma once

#include "unit_test.h"

#include <bit>
#include <string>

namespace sequences
{

// A load of the plan that succeeds, and the first lines of one that does not.
inline Lines load(const std::string &plan = "plan#1")
{
    return {"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/src1.xml, O_RDONLY) = " + plan,
            "close(" + plan + ")"};
}
inline Lines failed_load(const std::string &descriptor, const std::string &reason)
{
    return {"mxmlSetLoneWhitespaceOff(1)", "open(/data/vorlane/src1.xml, O_RDONLY) = " + descriptor,
            "load_configs_file| Open /data/vorlane/src1.xml file failed" + reason + "\n"};
}

inline Lines blocked_signals()
{
    return {"sigemptyset()", "sigaddset(SIGCHLD)", "sigprocmask(SIG_BLOCK, {SIGCHLD}, old mask)"};
}

// The launcher as the host sees it, with the result of its one look at the child.
inline Lines launch(int waited = 0)
{
    return joined(
        {blocked_signals(),
         {"vfork() = 100", "signal(SIGINT, ignored)", "signal(SIGQUIT, ignored)",
          "waitpid(100, WNOHANG) = " + std::to_string(waited),
          "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)", "signal(SIGINT, the host's for SIGINT)",
          "signal(SIGQUIT, the host's for SIGQUIT)"}});
}
inline Lines failed_launch()
{
    return joined(
        {blocked_signals(), {"vfork() = -1", "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)"}});
}
// The launcher as its child sees it, when there is no shell.
inline Lines launched(const std::string &command)
{
    return joined({blocked_signals(),
                   {"vfork() = 0", "sigprocmask(SIG_SETMASK, {SIGUSR1}, null)",
                    "execve(/system/bin/sh, sh|-c|" + command + ", environ)", "_exit(127)"}});
}

// The trigger: its listener, from the socket to the accept, and what follows.
inline Lines listener(int count = 1, const std::string &listened = "0")
{
    const std::string name = "listener#" + std::to_string(count);
    const bool little = std::endian::native == std::endian::little;
    return {"socket(AF_INET, SOCK_STREAM, 0) = " + name, "Setsockopt(" + name + ", 1)",
            "Bind(" + name + ", " + (little ? "0200" : "0002") + "8888" + std::string(24, '0') +
                ", 16)",
            "listen(" + name + ", 5) = " + listened};
}
inline Lines accepted(int count = 1)
{
    const std::string number = std::to_string(count);
    return {"Accept(listener#" + number + ", 16) = connection#" + number};
}
inline Lines told(int count = 1)
{
    const std::string number = std::to_string(count);
    return {"write(connection#" + number + ", \"gather again!\", 13) = 13", "Sock_Init1| retWri=13",
            "Sock_Init1| retWri success\n", "close(listener#" + number + ")"};
}
inline Lines trigger(int count = 1)
{
    return joined({listener(count), accepted(count), told(count)});
}
inline Lines failed_accept(const std::string &error)
{
    return joined({listener(),
                   {"Accept(listener#1, 16) = -1", "Sock_Init1| accept error!\n",
                    "Sock_Init1| errno=" + error}});
}

} // namespace sequences
