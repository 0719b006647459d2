// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "launcher_machine.h"

#include <fstream>

namespace launcher
{
namespace
{

Words libraries()
{
    Words options;
    for (const auto &entry : fs::directory_iterator("/")) {
        const std::string path = entry.path();
        if (!path.starts_with("/lib")) {
            continue;
        }
        options = entry.is_symlink() ? options + Words{"--symlink", fs::read_symlink(path), path}
                                     : options + Words{"--ro-bind", path, path};
    }
    return options;
}

// A machine's own values in the place of the kernel's. What is not among them is
// not there, but for what bwrap itself wants to read.
Words sysctl_options(std::map<std::string, std::string> sysctls, const fs::path &files)
{
    Words options = {"--tmpfs", "/proc/sys"};
    sysctls.insert({{"kernel/overflowuid", "65534"}, {"kernel/overflowgid", "65534"}});
    for (const auto &[key, value] : sysctls) {
        fs::create_directories((files / key).parent_path());
        std::ofstream(files / key) << value << '\n';
        options = options + Words{"--ro-bind", files / key, "/proc/sys/" + key};
    }
    return options;
}

} // namespace

Outcome Machine::run(const std::string &script) const
{
    const TemporaryDirectory files;
    const std::string id = std::to_string(user);
    // A nested /proc can be mounted only where the outer one has nothing on top,
    // as the one of bwrap's own making has.
    Words words =
        refuses_namespaces
            ? split("bwrap --unshare-user --uid " + id + " --gid " + id +
                    " --disable-userns --unshare-pid --proc /proc")
            : split("unshare --user --map-root-user --mount --pid --fork --mount-proc --kill-child "
                    "bwrap --bind /proc /proc");
    words = words +
            split("--die-with-parent --unshare-net --unshare-ipc --unshare-uts "
                  "--unshare-cgroup-try --ro-bind /usr /usr --dev /dev --tmpfs /tmp --dir /run "
                  "--dir /var/lib --dir /etc --ro-bind /etc/passwd /etc/passwd --dir /bin "
                  "--symlink /usr/bin/mksh /bin/mksh --symlink /usr/bin/dash /bin/sh") +
            libraries() + Words{"--ro-bind", tree, tree, "--ro-bind", build, build};
    if (is_container) {
        words = words + split("--symlink /dev/null /.dockerenv");
    }
    if (!sysctls.empty()) {
        words = words + sysctl_options(sysctls, files.path());
    }
    words = words + options + split("--chdir / --setenv PATH /usr/sbin:/usr/bin -- bash -c") +
            Words{script, device_run, device_run};
    return launcher::run(words);
}

} // namespace launcher
