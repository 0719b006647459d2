// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "module/item_output.h"

#include "util/files.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace fptest
{
namespace
{

constexpr off_t kRoomLeft = off_t{1024} * 1024;

} // namespace

ItemOutput::ItemOutput() : file_(memory_file("fptest-output", MFD_ALLOW_SEALING))
{
    if (!file_.is_open()) {
        throw std::system_error(errno, std::generic_category(), "no memory for what items print");
    }
    fcntl(file_.get(), F_SETFL, O_APPEND);
}

off_t ItemOutput::size() const
{
    struct stat status {
    };
    return fstat(file_.get(), &status) == 0 ? status.st_size : 0;
}

void ItemOutput::rewind()
{
    if (size() == taken_ && ftruncate(file_.get(), 0) == 0) {
        taken_ = 0;
    }
}

void ItemOutput::leave()
{
    const off_t end = size();
    fcntl(file_.get(), F_SETFL, 0);
    lseek(file_.get(), end, SEEK_SET);
    static_cast<void>(ftruncate(file_.get(), end + kRoomLeft));
    fcntl(file_.get(), F_ADD_SEALS, F_SEAL_GROW);
}

// An item that opens /dev/stderr anew ("> /dev/stderr") truncates the file. What was taken
// is a hole: data in its place is new.
void ItemOutput::note_truncation(off_t end)
{
    std::array<char, 4096> bytes{};
    const off_t data = taken_ > 0 ? lseek(file_.get(), 0, SEEK_DATA) : -1;
    if (data >= 0 && data < taken_) {
        const auto size = std::min(bytes.size(), static_cast<std::size_t>(taken_ - data));
        static_cast<void>(pread(file_.get(), bytes.data(), size, data));
    }
    if (end < taken_ || std::ranges::any_of(bytes, [](char byte) { return byte != 0; })) {
        taken_ = 0;
    }
}

void ItemOutput::pass(std::FILE *stream, off_t end)
{
    note_truncation(end);
    while (taken_ < end) {
        const std::string piece = take(std::min(end, taken_ + kKept));
        std::fwrite(piece.data(), 1, piece.size(), stream);
    }
}

std::string ItemOutput::take(off_t end)
{
    note_truncation(end);
    if (end <= taken_) {
        return {};
    }
    const off_t begin = std::max(taken_, end - kKept);
    std::string text(static_cast<std::size_t>(end - begin), '\0');
    const ssize_t got = pread(file_.get(), text.data(), text.size(), begin);
    text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
    taken_ = end;
    fallocate(file_.get(), FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, taken_);
    return text;
}

} // namespace fptest
