// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/stored_plan.h"

#include "plan/library_rules.h"
#include "plan/plan_text.h"
#include "util/failure.h"
#include "util/files.h"
#include "util/write.h"

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <fmt/core.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <thread>
#include <utility>

namespace fptest
{
namespace
{

std::string new_mark()
{
    static unsigned count = 0;
    const auto now = std::chrono::system_clock::now().time_since_epoch().count();
    return fmt::format("{:x}-{:x}", now, ++count);
}

// The text before the one that was parsed last, if it was whole.
std::string whole_before;

// Parses only what differs from the last text, byte for byte: two saves may leave a file of the
// same time and size.
ParsedPlan &parsed(const std::string &text)
{
    static ParsedPlan last{""};
    if (last.annotated() && last.text() != text) {
        whole_before = last.text();
    }
    last.read(text);
    return last;
}

// Leaves the plan as it is if the disk is full.
void replace_if_possible(const MakePlan &make)
{
    std::string text;
    try {
        remake_stored_plan(text, make);
    } catch (const Failure &) {
        return;
    }
}

constexpr int kRemakes = 10; // of one that is saved all the time

} // namespace

std::optional<std::string> read_stored_plan()
{
    // an item may have replaced it by a FIFO
    return read_file(kStoredPlan, O_NONBLOCK);
}

std::string require_stored_plan(const std::string &what_to_do)
{
    require_regular_plan();
    if (auto text = read_stored_plan()) {
        return *text;
    }
    if (errno == ENOENT) {
        throw Failure(Cause::device, "no plan is stored in {}{}", kStoredPlan, what_to_do);
    }
    throw Failure(Cause::device, "{} cannot be read: {}", kStoredPlan, why_unread());
}

std::optional<struct stat> stored_plan_status()
{
    struct stat status {
    };
    return stat(kStoredPlan, &status) == 0 && S_ISREG(status.st_mode) ? std::optional(status)
                                                                      : std::nullopt;
}

void require_regular_plan()
{
    struct stat plan {
    };
    if (stat(kStoredPlan, &plan) == 0 && !S_ISREG(plan.st_mode)) {
        throw Failure(Cause::device, "{} is not a regular file: remove it", kStoredPlan);
    }
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
    // the old file is overwritten
    const std::size_t freed =
        stat(kStoredPlan, &old) == 0 ? static_cast<std::size_t>(old.st_blocks) * 512 : 0;
    if (static_cast<std::size_t>(disk.f_bavail) * disk.f_frsize + freed < bytes) {
        throw Failure(
            Cause::device,
            "the disk of {} is full: make room for {} bytes; the stored plan is as it was",
            kDataDirectory, bytes);
    }
}

const ParsedPlan &parse_stored_plan()
{
    return parsed(read_stored_plan().value_or(""));
}

StoredPlan whole_stored_plan(std::chrono::milliseconds patience)
{
    StoredPlan read;
    const auto make = [&read](const std::string &text) {
        read.annotated = parsed(text).annotated();
        return read.annotated || Plan::load_as_library(text);
    };
    read.is_usable = made_of_stored_plan(read.text, make, patience);
    return read;
}

void mend_stored_plan()
{
    if (const ParsedPlan &plan = parse_stored_plan();
        plan.is_sound() || !made_loadable(plan.text())) {
        return;
    }
    std::string text;
    remake_stored_plan(text, [](const std::string &saved) {
        auto mended = made_loadable(saved);
        return mended || !Plan::parse_annotated(saved) ? mended : std::optional(saved);
    });
}

bool restore_stored_plan()
{
    constexpr std::size_t kCompared = 16;
    std::string text;
    const auto make = [](const std::string &saved) {
        const bool is_cut = !whole_before.empty() &&
                            whole_before.starts_with(saved.substr(0, kCompared)) &&
                            stored_plan_status();
        return Plan::parse_annotated(saved) ? std::optional(saved)
               : is_cut                     ? std::optional(whole_before)
                                            : std::nullopt;
    };
    try {
        return remake_stored_plan(text, make).has_value();
    } catch (const Failure &) {
        return false; // the disk is full
    }
}

Descriptor lock_stored_plan()
{
    for (;;) {
        Descriptor plan(open(kStoredPlan, O_RDONLY | O_NONBLOCK | O_CLOEXEC));
        if (!plan.is_open()) {
            return plan;
        }
        // the holder may hang
        for (int tries = 0; flock(plan.get(), LOCK_EX | LOCK_NB) != 0 && tries < 5000; ++tries) {
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
        }
        // the file may have been replaced meanwhile
        struct stat held {
        };
        struct stat named {
        };
        if (fstat(plan.get(), &held) != 0 || stat(kStoredPlan, &named) != 0 ||
            (held.st_ino == named.st_ino && held.st_dev == named.st_dev)) {
            return plan;
        }
    }
}

void replace_stored_plan(const std::string &text)
{
    const std::string aside = std::string(kStoredPlan) + ".new";
    const Descriptor file(open(aside.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666));
    if (!file.is_open() || write_text(file.get(), text) < text.size() || fsync(file.get()) != 0 ||
        std::rename(aside.c_str(), kStoredPlan) != 0) {
        const int error = errno;
        unlink(aside.c_str());
        throw Failure(Cause::device, "{} cannot be written: {}; the old plan is still there",
                      kStoredPlan, std::strerror(error));
    }
}

std::optional<std::string> remake_stored_plan(std::string &text, const MakePlan &make)
{
    Descriptor lock = lock_stored_plan();
    auto made = made_of_stored_plan(text, make);
    std::string replaced = text;
    for (int tries = 0; tries < kRemakes && made && *made != replaced; ++tries) {
        replace_stored_plan(*made);
        const std::string old_file = fmt::format("/proc/self/fd/{}", lock.get());
        const auto read = [&old_file] { return read_file(old_file); };
        if (read() == replaced) {
            break;
        }
        std::string saved;
        auto remade = made_of_stored_plan(saved, make, kForWholePlan, read);
        lock = lock_stored_plan();
        if (!remade || read_stored_plan() != made) { // or it was saved in its new place since
            break;
        }
        replaced = *std::exchange(made, std::move(remade));
        text = saved;
    }
    return made;
}

void store_as_file(const std::string &text)
{
    const Descriptor lock = lock_stored_plan();
    replace_stored_plan(text);
}

void require_stored(const std::string &found, const std::string &wanted)
{
    if (found.size() >= wanted.size() && found != wanted) {
        throw Failure(Cause::device,
                      "another process has written {} in the moment when the plan was stored; end "
                      "it, or store the plan again",
                      kStoredPlan);
    }
    if (found != wanted) {
        throw Failure(Cause::device,
                      "the plan was not stored: {} of {} bytes are in {}; make room and store it "
                      "again, or see why with --log FILE",
                      found.size(), wanted.size(), kStoredPlan);
    }
}

std::string clear_reports(const std::vector<std::size_t> &elements)
{
    std::string mark = new_mark();
    std::string text;
    std::optional<std::string> cleared;
    try {
        cleared = remake_stored_plan(text, [&](const std::string &plan) {
            cleared = parsed(plan).clear(elements, mark);
            if (cleared) {
                require_room(cleared->size());
            }
            return cleared;
        });
    } catch (const Failure &) {
        if (without_marks(*cleared) == without_marks(text)) {
            return {};
        }
        throw;
    }
    if (!cleared && Plan::load_as_library(text)) {
        return {}; // run with --force: nothing has reported into it
    }
    if (!cleared) {
        throw Failure(Cause::device, "{} {}: store it again", kStoredPlan, kPlanLost);
    }
    return mark;
}

void mark_again(const std::vector<std::size_t> &elements, const std::string &mark)
{
    if (!elements.empty()) {
        replace_if_possible(
            [&](const std::string &text) { return without_reports(text, elements, mark); });
    }
}

void remove_marks()
{
    replace_if_possible(without_marks);
}

} // namespace fptest
