// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/item_shell.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <mutex>
#include <spawn.h>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

#ifdef __ANDROID__
#include <sys/auxv.h>
#endif

namespace fptest
{

const char *shell_of_c_library()
{
#ifdef __ANDROID__
    const auto *program = reinterpret_cast<const char *>(getauxval(AT_EXECFN));
    if (program != nullptr && std::string_view(program).starts_with("/vendor/") &&
        access("/vendor/bin/sh", X_OK) == 0) {
        return "/vendor/bin/sh";
    }
    return "/system/bin/sh";
#else
    return "/bin/sh";
#endif
}

namespace
{

std::function<void(int)> on_status;
std::mutex starting;
bool starts_none = false;

// The shell gets the caller's signal mask, and the defaults of those signals that only
// system() ignores.
class SpawnAttributes
{
  public:
    SpawnAttributes(const sigset_t &mask, const sigset_t &defaults)
    {
        posix_spawnattr_init(&attributes_);
        posix_spawnattr_setsigmask(&attributes_, &mask);
        posix_spawnattr_setsigdefault(&attributes_, &defaults);
        short flags = POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF;
        if (on_status) {
            posix_spawnattr_setpgroup(&attributes_, 0);
            flags |= POSIX_SPAWN_SETPGROUP;
        }
        posix_spawnattr_setflags(&attributes_, flags);
    }
    ~SpawnAttributes()
    {
        posix_spawnattr_destroy(&attributes_);
    }
    SpawnAttributes(const SpawnAttributes &) = delete;
    SpawnAttributes &operator=(const SpawnAttributes &) = delete;

    const posix_spawnattr_t *get() const
    {
        return &attributes_;
    }

  private:
    posix_spawnattr_t attributes_{};
};

// The command's status; that of an exit with 127 if there is no shell.
int run_by_shell(const char *command, const SpawnAttributes &attributes)
{
    const std::array<const char *, 4> arguments{"sh", "-c", command, nullptr};
    pid_t child = -1;
    std::unique_lock lock(starting);
    const int error = starts_none
                          ? ECANCELED
                          : posix_spawn(&child, shell_of_c_library(), nullptr, attributes.get(),
                                        const_cast<char *const *>(arguments.data()), environ);
    lock.unlock();
    if (error == EAGAIN || error == ENOMEM) {
        errno = error;
        return -1;
    }
    if (error != 0) {
        return 127 << 8;
    }
    int status = -1;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR) {
            return -1;
        }
    }
    return status;
}

} // namespace

void set_status_handler(std::function<void(int)> handler)
{
    on_status = std::move(handler);
}

void start_no_more_items()
{
    const std::lock_guard lock(starting);
    starts_none = true;
}

} // namespace fptest

extern "C" int system(const char *command)
{
    if (command == nullptr) {
        return access(fptest::shell_of_c_library(), X_OK) == 0 ? 1 : 0;
    }
    sigset_t child_signal;
    sigset_t mask;
    sigset_t defaults;
    sigemptyset(&child_signal);
    sigaddset(&child_signal, SIGCHLD);
    sigemptyset(&defaults);
    struct sigaction ignored {
    };
    ignored.sa_handler = SIG_IGN;
    std::array<struct sigaction, 2> before{};
    const std::array<int, 2> signals{SIGINT, SIGQUIT};
    for (std::size_t at = 0; at < signals.size(); ++at) {
        sigaction(signals[at], &ignored, &before[at]);
        if (before[at].sa_handler != SIG_IGN) {
            sigaddset(&defaults, signals[at]);
        }
    }
    pthread_sigmask(SIG_BLOCK, &child_signal, &mask);
    const int status = fptest::run_by_shell(command, fptest::SpawnAttributes(mask, defaults));
    pthread_sigmask(SIG_SETMASK, &mask, nullptr);
    for (std::size_t at = 0; at < signals.size(); ++at) {
        sigaction(signals[at], &before[at], nullptr);
    }
    if (fptest::on_status) {
        fptest::on_status(status);
    }
    return status;
}
