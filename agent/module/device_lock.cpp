// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/device_lock.h"

#include "module/preflight.h"
#include "module/processes.h"
#include "plan/library_rules.h"
#include "util/failure.h"
#include "util/file_lock.h"
#include "util/text.h"
#include "util/times.h"
#include "util/write.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <fmt/core.h>
#include <sstream>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace fptest
{
namespace
{

using namespace std::chrono_literals;

constexpr auto kBetweenTries = 20ms;
constexpr std::size_t kColumns = 300; // of a text in it
constexpr std::size_t kMostOfNote = 8192;
// A note of this size asks its run to stop: that takes no room on a full disk.
constexpr off_t kAsksToStop = 1 << 20;

std::string text_of_note(const RunNote &note)
{
    std::string text;
    for (const std::string &line : {note.plan, note.labels, note.tally, note.item}) {
        text += ellipsize(one_line(line), kColumns) + "\n";
    }
    const auto count = [](RunNote::TimePoint time) { return time.time_since_epoch().count(); };
    return text + fmt::format("{} {} {}\n", count(note.begun), count(note.item_begun),
                              note.suspended ? count(*note.suspended) : 0);
}

std::optional<RunNote> read_as_note(const std::string &text)
{
    std::istringstream lines(text);
    RunNote note;
    for (std::string *line : {&note.plan, &note.labels, &note.tally, &note.item}) {
        std::getline(lines, *line);
    }
    RunNote::TimePoint::rep begun = 0;
    RunNote::TimePoint::rep item_begun = 0;
    RunNote::TimePoint::rep suspended = 0;
    if (!(lines >> begun >> item_begun >> suspended)) {
        return std::nullopt;
    }
    const auto time = [](RunNote::TimePoint::rep count) {
        return RunNote::TimePoint(RunNote::TimePoint::duration(count));
    };
    note.begun = time(begun);
    note.item_begun = time(item_begun);
    if (suspended != 0) {
        note.suspended = time(suspended);
    }
    return note;
}

std::string read_start(const Descriptor &file)
{
    std::array<char, kMostOfNote> buffer{};
    static_cast<void>(pread(file.get(), buffer.data(), buffer.size() - 1, 0));
    return buffer.data();
}

// The process that holds the note; 0 if none does.
pid_t holder_of(const Descriptor &note)
{
    struct flock asked {
    };
    asked.l_type = F_WRLCK;
    asked.l_whence = SEEK_SET;
    return note.is_open() && fcntl(note.get(), F_GETLK, &asked) == 0 && asked.l_type != F_UNLCK
               ? asked.l_pid
               : 0;
}

Descriptor open_note()
{
    return Descriptor(open(kRunNote, O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC));
}

Descriptor open_data(int flags = 0)
{
    return Descriptor(open(kDataDirectory, O_RDONLY | O_DIRECTORY | O_CLOEXEC | flags));
}

bool is_free(const Descriptor &directory)
{
    const bool is_taken = flock(directory.get(), LOCK_SH | LOCK_NB) != 0 && errno == EWOULDBLOCK;
    flock(directory.get(), LOCK_UN);
    return !is_taken;
}

std::string time_since(RunNote::TimePoint time, const RunNote &note)
{
    const auto now = note.suspended.value_or(std::chrono::steady_clock::now());
    return duration(std::max(0.0, std::chrono::duration<double>(now - time).count()));
}

} // namespace

// --- this one -------------------------------------------------------------------

DeviceLock::DeviceLock(const RunNote &note) : directory_(open_data())
{
    for (int tries = 1; directory_.is_open() && flock(directory_.get(), LOCK_EX | LOCK_NB) != 0 &&
                        errno == EWOULDBLOCK;
         ++tries) {
        // the items of one that was killed may take long to end; one that runs, longer
        if (tries % 25 == 0) {
            const OtherRun other = OtherRun::find(0ms);
            if (other.runs() && (other.process() != 0 || tries == 150)) {
                throw Failure(Cause::busy,
                              "another fptest is running on this device: {}; wait for its end, or "
                              "stop it with fptest stop",
                              other.described());
            }
        }
        std::this_thread::sleep_for(kBetweenTries);
    }
    unlink(kRunNote); // of one that was killed
    note_ = Descriptor(open(kRunNote, O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0666));
    if (note_.is_open()) {
        lock_file(note_.get());
        tell(note);
    }
}

DeviceLock::~DeviceLock()
{
    if (note_.is_open()) {
        unlink(kRunNote);
    }
}

void DeviceLock::tell(const RunNote &note) const
{
    const std::string text =
        text_of_note(note) + '\0'; // what was there before may have been longer
    static_cast<void>(pwrite(note_.get(), text.data(), text.size(), 0));
}

bool DeviceLock::is_asked_to_stop() const
{
    struct stat status {
    };
    return note_.is_open() && fstat(note_.get(), &status) == 0 && status.st_size >= kAsksToStop;
}

// --- another one ----------------------------------------------------------------

OtherRun OtherRun::find(std::chrono::milliseconds patience)
{
    const Descriptor directory = open_data();
    if (!directory.is_open()) {
        const int error = errno;
        require_shell(); // that this is a device
        throw Failure(Cause::device, "{} cannot be opened: {}", kDataDirectory,
                      std::strerror(error));
    }
    OtherRun other;
    for (const auto end = std::chrono::steady_clock::now() + patience;;) {
        other.file_ = open_note();
        other.process_ = holder_of(other.file_);
        other.runs_ = other.process_ != 0 || !is_free(directory);
        if (other.process_ != 0 || !other.runs_ || std::chrono::steady_clock::now() >= end) {
            break;
        }
        std::this_thread::sleep_for(kBetweenTries);
    }
    if (other.file_.is_open()) {
        std::string text;
        do { // it may be written meanwhile
            text = read_start(other.file_);
        } while (text != read_start(other.file_));
        other.note_ = read_as_note(text);
    }
    return other;
}

std::string OtherRun::described() const
{
    if (process_ == 0) {
        return runs_ && !file_.is_open() ? "one that could not say what it does"
               : runs_                   ? "one that was killed, and whose items are being ended"
               : note_ ? note_->plan + (note_->item.empty() ? "" : ", at " + note_->item)
                       : "";
    }
    std::string text =
        fmt::format("process {}{}", process_, state_of(process_) == 'T' ? ", suspended" : "");
    if (note_) {
        text += fmt::format(", {} for {}", note_->plan, time_since(note_->begun, *note_));
        if (!note_->item.empty()) {
            text +=
                fmt::format(", at {} for {}", note_->item, time_since(note_->item_begun, *note_));
        }
    }
    return text;
}

void OtherRun::ask_to_stop() const
{
    if (process_ == 0) {
        return; // it is being ended
    }
    // by any other name it could be a later run's
    const Descriptor note(
        open(fmt::format("/proc/self/fd/{}", file_.get()).c_str(), O_WRONLY | O_CLOEXEC));
    if (!note.is_open() || ftruncate(note.get(), kAsksToStop) != 0) {
        throw Failure(Cause::device,
                      "process {} cannot be asked to stop: {}: {}; do it as its user", process_,
                      kRunNote, std::strerror(errno));
    }
}

bool OtherRun::has_ended() const
{
    return holder_of(file_) == 0 && (is_free(open_data()) || holder_of(open_note()) != 0);
}

} // namespace fptest
