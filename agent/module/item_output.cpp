// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/item_output.h"

#include "util/files.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <fmt/core.h>
#include <fstream>
#include <string>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

constexpr off_t kMuch = off_t{64} * 1024;
constexpr off_t kPiece = off_t{64} * 1024;
constexpr off_t kFront = 16; // which nothing is printed into: a file without was truncated
constexpr off_t kRoomLeft = off_t{1024} * 1024;
constexpr char kName[] = "/memfd:fptest-output"; // as /proc has it

} // namespace

ItemOutput::ItemOutput() : file_(memory_file(kName + sizeof("/memfd:") - 1, MFD_ALLOW_SEALING))
{
    if (!file_.is_open()) {
        throw std::system_error(errno, std::generic_category(), "no memory for what items print");
    }
    rewind();
}

off_t ItemOutput::size() const
{
    struct stat status {
    };
    return fstat(file_.get(), &status) == 0 ? status.st_size : 0;
}

void ItemOutput::rewind()
{
    rlimit limit{};
    const bool is_limited = getrlimit(RLIMIT_FSIZE, &limit) == 0 && limit.rlim_cur != RLIM_INFINITY;
    if ((is_limited || taken_ < kFront || taken_ > kMuch) && size() == taken_) {
        fallocate(file_.get(), FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, kFront);
        taken_ = ftruncate(file_.get(), kFront) == 0 ? kFront : taken_;
    }
    // an item may have changed these, for all others too
    fcntl(file_.get(), F_SETFL, O_APPEND);
    lseek(file_.get(), 0, SEEK_END);
}

void ItemOutput::leave()
{
    const off_t end = size();
    fcntl(file_.get(), F_SETFL, 0);
    lseek(file_.get(), end, SEEK_SET);
    static_cast<void>(ftruncate(file_.get(), end + kRoomLeft));
    fcntl(file_.get(), F_ADD_SEALS, F_SEAL_GROW);
}

bool ItemOutput::is_filling(pid_t process)
{
    const std::string file = fmt::format("/proc/{}/fd/1", process);
    std::ifstream about(fmt::format("/proc/{}/fdinfo/1", process));
    std::error_code unknown;
    struct stat status {
    };
    std::string name;
    off_t used = 0;
    return std::filesystem::read_symlink(file, unknown).string().starts_with(kName) &&
           stat(file.c_str(), &status) == 0 && about >> name >> used && // "pos: 4096"
           status.st_size - used < kRoomLeft / 2;
}

// An item that opens /dev/stderr anew ("> /dev/stderr") truncates the file. What was taken
// is a hole: data in its place is new. No lseek() here, as the items' position is the same.
void ItemOutput::note_truncation(off_t end)
{
    std::array<char, 4096> bytes{};
    const auto size = std::min(bytes.size(), static_cast<std::size_t>(taken_));
    static_cast<void>(pread(file_.get(), bytes.data(), size, 0));
    if (end < taken_ || std::ranges::any_of(bytes, [](char byte) { return byte != 0; })) {
        taken_ = 0;
        was_truncated_ = true;
    }
}

bool ItemOutput::was_truncated()
{
    return std::exchange(was_truncated_, false);
}

bool ItemOutput::skip(off_t end, off_t most)
{
    note_truncation(end);
    const bool is_more = end - taken_ > most;
    taken_ = is_more ? end - std::min(most, kPiece) : taken_;
    release();
    return is_more;
}

void ItemOutput::take(off_t end, const Use &use, TimePoint until)
{
    note_truncation(end);
    for (std::string text; taken_ < end && std::chrono::steady_clock::now() < until; release()) {
        text.resize(static_cast<std::size_t>(std::min(end - taken_, kPiece)));
        const ssize_t got = pread(file_.get(), text.data(), text.size(), taken_);
        taken_ = got > 0 ? taken_ + got : end;
        if (got > 0) {
            use(std::string_view(text).substr(0, static_cast<std::size_t>(got)));
        }
    }
}

void ItemOutput::release()
{
    fallocate(file_.get(), FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, taken_);
}

} // namespace fptest
