// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/writer.h"

#include "common/descriptor.h"
#include "util/file_lock.h"
#include "util/files.h"
#include "util/write.h"

#include <chrono>
#include <condition_variable>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fmt/core.h>
#include <mutex>
#include <sys/stat.h>
#include <thread>
#include <utility>

namespace fptest
{
namespace
{

// A reader that takes longer is no longer waited for.
constexpr std::chrono::milliseconds kPrompt(100);

// Whether opening it may wait for a reader.
bool may_block(const std::string &path)
{
    struct stat status {
    };
    return stat(path.c_str(), &status) == 0 && !S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode);
}

} // namespace

struct Writer::State {
    // set before the thread starts; afterwards only the thread uses them
    std::string name;
    int flags = 0;
    mode_t mode = 0;
    Descriptor file{-1}; // if it is not the caller's
    int descriptor = -1;

    std::mutex mutex;
    std::condition_variable changed;
    bool opened = false;
    std::string queue;
    std::size_t in_work = 0; // bytes that the thread is writing
    bool closed = false;
    std::string failure;

    void open()
    {
        const bool is_emptied = (flags & O_TRUNC) != 0;
        file = Descriptor(::open(name.c_str(), flags & ~O_TRUNC, mode));
        descriptor = file.get();
        std::string why = file.is_open() ? "" : failure_of(name, errno);
        if ((flags & O_CREAT) != 0 && !lock_file(descriptor)) {
            why = locked_text(name);
        } else if (is_emptied && is_regular_file(descriptor) && ftruncate(descriptor, 0) != 0) {
            why = failure_of(name, errno);
        }
        const std::lock_guard lock(mutex);
        failure = std::move(why);
    }

    void run()
    {
        if (descriptor < 0) {
            open();
        }
        std::unique_lock lock(mutex);
        opened = true;
        changed.notify_all();
        for (;;) {
            changed.wait(lock, [this] { return closed || !queue.empty(); });
            if (queue.empty() || !failure.empty()) {
                return;
            }
            const std::string text = std::exchange(queue, {});
            in_work = text.size();
            lock.unlock();
            const bool written = write_text(descriptor, text) == text.size();
            const int error = errno;
            lock.lock();
            in_work = 0;
            if (!written && failure.empty()) {
                failure = failure_of(name, error);
            }
            changed.notify_all();
        }
    }
};

Writer::Writer(std::string name, int descriptor) : state_(std::make_shared<State>())
{
    state_->name = std::move(name);
    state_->descriptor = descriptor;
    if (!is_regular_file(descriptor)) {
        start();
    }
}

Writer::Writer(const std::string &path, int flags, mode_t mode)
    : state_(std::make_shared<State>()), is_own_((flags & O_CREAT) != 0)
{
    state_->name = path;
    state_->flags = flags | O_NOCTTY | O_CLOEXEC;
    state_->mode = mode;
    if (may_block(path)) {
        start();
        return;
    }
    state_->open();
}

Writer::~Writer()
{
    const std::lock_guard lock(state_->mutex);
    state_->closed = true;
    state_->changed.notify_all();
}

int Writer::obstacle(const std::string &path)
{
    if (may_block(path)) {
        return 0;
    }
    const bool is_there = access(path.c_str(), F_OK) == 0;
    const int flags = O_WRONLY | O_NOCTTY | O_CLOEXEC | (is_there ? 0 : O_CREAT);
    const Descriptor file(::open(path.c_str(), flags, 0666));
    if (!file.is_open()) {
        return errno;
    }
    if (!is_there) { // keep a link that leads to it
        std::error_code none;
        std::filesystem::remove(std::filesystem::canonical(path, none), none);
    }
    return 0;
}

// Blocks signals in the thread, as another one waits for them. The thread is detached,
// because it may be stuck for good.
void Writer::start()
{
    has_thread_ = true;
    sigset_t all;
    sigset_t before;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &before);
    std::thread([state = state_] { state->run(); }).detach();
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
    std::unique_lock lock(state_->mutex);
    waits_for_reader_ = state_->changed.wait_for(lock, kPrompt, [this] { return state_->opened; });
}

void Writer::write(const std::string &text)
{
    if (!has_thread_) {
        write_now(text);
        return;
    }
    State &state = *state_;
    std::unique_lock lock(state.mutex);
    if (!state.failure.empty()) {
        return;
    }
    if (state.queue.size() + state.in_work + text.size() > kMostWaiting) {
        state.failure = fmt::format("{}: nobody reads it, and more than {} MiB wait", state.name,
                                    kMostWaiting >> 20);
        state.queue.clear();
        return;
    }
    state.queue += text;
    state.changed.notify_all();
    if (waits_for_reader_) {
        waits_for_reader_ = state.changed.wait_for(lock, kPrompt, [&state] {
            return !state.failure.empty() || (state.queue.empty() && state.in_work == 0);
        });
    }
}

void Writer::write_now(const std::string &text)
{
    if (!state_->failure.empty()) {
        return;
    }
    const std::size_t written = write_text(state_->descriptor, text);
    const int error = errno;
    struct stat status {
    };
    const bool is_known = is_own_ && fstat(state_->descriptor, &status) == 0;
    written_ += static_cast<off_t>(written);
    if (is_known && (status.st_nlink == 0 || status.st_size < written_)) {
        state_->failure = fmt::format("{}: somebody has {} it", state_->name,
                                      status.st_nlink == 0 ? "removed" : "cut");
        return;
    }
    if (written == text.size()) {
        return;
    }
    state_->failure = failure_of(state_->name, error);
    if (is_known) {
        // if even that fails the last line stays broken; the failure is reported anyway
        [[maybe_unused]] const int result =
            ftruncate(state_->descriptor, status.st_size - static_cast<off_t>(written));
    }
}

bool Writer::is_pending() const
{
    const std::lock_guard lock(state_->mutex);
    return state_->failure.empty() && (!state_->queue.empty() || state_->in_work > 0);
}

std::string Writer::failure() const
{
    const std::lock_guard lock(state_->mutex);
    return state_->failure;
}

} // namespace fptest
