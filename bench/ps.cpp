// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"

#include "common/descriptor.h"

#include <array>
#include <cctype>
#include <csignal>
#include <dirent.h>
#include <fcntl.h>
#include <functional>
#include <initializer_list>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

namespace bench
{
namespace
{

constexpr int kProcesses = 1000;

// Processes that wait, for as long as it lives.
class Crowd
{
  public:
    Crowd()
    {
        for (int i = 0; i < kProcesses; ++i) {
            pids_.push_back(fork());
            if (pids_.back() == 0) {
                prctl(PR_SET_PDEATHSIG, SIGKILL);
                pause();
                _exit(0);
            }
        }
    }
    ~Crowd()
    {
        for (const pid_t pid : pids_) {
            if (pid > 0) {
                kill(pid, SIGKILL);
                waitpid(pid, nullptr, 0);
            }
        }
    }
    Crowd(const Crowd &) = delete;
    Crowd &operator=(const Crowd &) = delete;

  private:
    std::vector<pid_t> pids_;
};

void in_child(const std::function<void()> &act)
{
    const pid_t pid = fork();
    if (pid == 0) {
        act();
        _exit(1);
    }
    int status = 0;
    if (pid < 0 || waitpid(pid, &status, 0) != pid || status != 0) {
        throw std::runtime_error("ps: a query fails");
    }
}

void ask(std::vector<const char *> words)
{
    in_child([&words] {
        words.push_back(nullptr);
        dup2(open("/dev/null", O_WRONLY | O_CLOEXEC), STDOUT_FILENO);
        execv(words[0], const_cast<char *const *>(words.data()));
    });
}

// What a query cannot do without: these files of each process.
void read_bare(std::initializer_list<const char *> files)
{
    in_child([files] {
        DIR *proc = opendir("/proc");
        std::array<char, 4096> buffer{};
        while (const dirent *entry = readdir(proc)) {
            if (std::isdigit(static_cast<unsigned char>(entry->d_name[0])) == 0) {
                continue;
            }
            for (const char *file : files) {
                const std::string path = std::string(entry->d_name) + "/" + file;
                const Descriptor opened(openat(dirfd(proc), path.c_str(), O_RDONLY | O_CLOEXEC));
                [[maybe_unused]] const ssize_t got =
                    read(opened.get(), buffer.data(), buffer.size());
            }
        }
        _exit(0);
    });
}

Comparison query(const std::string &name, double limit, const std::function<void()> &library,
                 const std::function<void()> &baseline)
{
    return {.name = name,
            .limit = limit,
            .seconds = 0.5,
            .prepare =
                [crowd = std::shared_ptr<Crowd>()]() mutable {
                    if (!crowd) {
                        crowd = std::make_shared<Crowd>();
                    }
                },
            .library = library,
            .baseline = baseline};
}

constexpr const char *kPs = "/system/bin/ps";

} // namespace

Comparison ps_of_all()
{
    return query(
        "ps, 1,000 processes", 1.5, [] { ask({kPs}); },
        [] {
            read_bare({"cmdline", "stat", "status"});
        });
}

Comparison ps_of_one()
{
    return query(
        "ps of an item", 1.5,
        [] {
            ask({kPs, "BurnIn"});
        },
        [] { read_bare({"cmdline"}); });
}

Comparison ps_beside_toybox()
{
    return query(
        "  beside toybox's", 1, [] { ask({kPs}); },
        [] {
            ask({"/system/bin/toybox", "ps", "-A", "-o",
                 "USER,PID,PPID,VSZ,RSS,WCHAN,ADDR,S,NAME"});
        });
}

} // namespace bench
