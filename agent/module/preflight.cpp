// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/preflight.h"

#include "module/processes.h"
#include "module/stored_plan.h"
#include "plan/plan.h"
#include "util/failure.h"
#include "util/text.h"

#include <cerrno>
#include <chrono>
#include <cstring>
#include <fcntl.h>
#include <fmt/core.h>
#include <netinet/in.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <thread>

namespace fptest
{
namespace
{

constexpr char kDataDirectory[] = "/data/vorlane";

} // namespace

void require_device()
{
    if (access("/system/bin/sh", X_OK) != 0) {
        throw Failure(Cause::device, "this machine is not a device: there is no /system/bin/sh; "
                                     "on a desk, run it as: device/run -- fptest ...");
    }
    if (access(kDataDirectory, W_OK | X_OK) != 0) {
        throw Failure(Cause::device, "{} is not writable: {}; make it, or run this as another user",
                      kDataDirectory, std::strerror(errno));
    }
    require_regular_plan();
}

void require_room(std::size_t bytes)
{
    struct statvfs disk {
    };
    struct stat old {
    };
    if (statvfs(kDataDirectory, &disk) != 0) {
        return;
    }
    // the file that is there is overwritten, its blocks are as good as free
    const std::size_t freed =
        stat(kStoredPlan, &old) == 0 ? static_cast<std::size_t>(old.st_blocks) * 512 : 0;
    if (static_cast<std::size_t>(disk.f_bavail) * disk.f_frsize + freed < bytes) {
        throw Failure(
            Cause::device,
            "the disk of {} is full: make room for {} bytes; the stored plan is as it was",
            kDataDirectory, bytes);
    }
}

void require_stored(const std::string &found, const std::string &wanted)
{
    if (found != wanted) {
        throw Failure(Cause::device,
                      "the plan was not stored: {} of {} bytes are in {}; make room and store it "
                      "again, or see why with --log FILE",
                      found.size(), wanted.size(), kStoredPlan);
    }
}

Descriptor lock_device()
{
    Descriptor directory(open(kDataDirectory, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    // one that has only just been killed has it for a moment still
    for (int tries = 0; directory.is_open() && flock(directory.get(), LOCK_EX | LOCK_NB) != 0 &&
                        errno == EWOULDBLOCK;
         ++tries) {
        if (tries == 25) {
            throw Failure(Cause::device, "another fptest is running a plan on this device: "
                                         "wait for its end, or stop it");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    return directory;
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
                      "listens there (netstat -ltnp names it)",
                      kTriggerPort, std::strerror(errno));
    }
}

std::string gone_text(const LibraryProcess::Event &event)
{
    return fmt::format("the library's process ended {}; --log FILE keeps what it says", event.text);
}

int send_and_wait(LibraryProcess &library, const std::string &command)
{
    int vendor = 0;
    library.command(command);
    for (;;) {
        const auto event = library.wait(std::chrono::seconds(1));
        if (event && event->kind == LibraryProcess::Event::Kind::item) {
            vendor = event->value;
        }
        if (event && event->kind == LibraryProcess::Event::Kind::returned) {
            return vendor;
        }
        if (event && event->kind == LibraryProcess::Event::Kind::gone) {
            throw Failure(Cause::device, "{}", gone_text(*event));
        }
    }
}

void require_no_leftovers(const std::vector<std::string> &programs)
{
    if (const auto found = process_of_any(programs)) {
        throw Failure(Cause::device,
                      "{} of an earlier run is still running, as process {}, and would report into "
                      "this one: end it first",
                      one_line(found->first), found->second);
    }
}

int ask_vendor(LibraryProcess &library)
{
    // a path that leads nowhere: the selector is read and told before that shows
    const int vendor = send_and_wait(library, "XMLNodePath::-/fptest asks for the vendor/-");
    if (!vendor_suffix(vendor)) {
        throw Failure(Cause::device,
                      "the vendor selector is {}, and the library runs nothing then: set "
                      "device/SysParam/Quillmark/vendor to 0, 1 or 2 in "
                      "/etc/vorlane/sysparms/vr_common_cfg.xml",
                      vendor);
    }
    return vendor;
}

} // namespace fptest
