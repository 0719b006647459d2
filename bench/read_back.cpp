// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cases.h"
#include "floor.h"
#include "plan.h"

#include "quillmark.h"

#include <fcntl.h>
#include <utility>

namespace bench
{
namespace
{

// Both read until there is nothing more, as the end of a file cannot be seen
// otherwise.
void read_bare(char *buffer, int length)
{
    FLOOR_LOG("enter... !\n");
    const int fd = open(kPlanPath, O_RDONLY);
    for (const int from : {SEEK_CUR, SEEK_END, SEEK_SET}) {
        FLOOR_LOG("offset = %d", (int)lseek(fd, 0, from));
    }
    int total = 0;
    for (int got = 1; got > 0; total += got) {
        got = (int)read(fd, buffer + total, (size_t)(length - total));
        if (got > 0) {
            FLOOR_LOG("read file unfinish, continue... n = %d \n", got);
        }
    }
    FLOOR_LOG("reach the end of file\n");
    FLOOR_LOG("read byte count = %d\n", total);
    close(fd);
    FLOOR_LOG("leave...\n");
}

class ReadBack : public Contest
{
  public:
    explicit ReadBack(int kilobytes)
        : Contest("read-back of " + (kilobytes < 1024 ? std::to_string(kilobytes) + " KB"
                                                      : std::to_string(kilobytes / 1024) + " MB"),
                  1.2, kilobytes < 64 ? 32 : 4, 0.05),
          size_(static_cast<std::size_t>(kilobytes) * 1024)
    {
    }
    void prepare() override
    {
        std::string text;
        while (text.size() < size_) {
            text += "<Cmd name=\"" + item_name(static_cast<int>(text.size())) + "\"/>\n";
        }
        write_plan(text.substr(0, size_));
    }
    void module(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            FPTEST_ExtractResultMsg(buffer_.data(), static_cast<int>(buffer_.size()));
        }
    }
    void floor(int calls) override
    {
        for (int call = 0; call < calls; ++call) {
            read_bare(buffer_.data(), static_cast<int>(buffer_.size()));
        }
    }
    std::string outcome() override
    {
        return std::exchange(buffer_, std::string(size_ + 1, '\0'));
    }

  private:
    std::size_t size_;
    std::string buffer_ = std::string(size_ + 1, '\0');
};

} // namespace

std::unique_ptr<Contest> read_back(int kilobytes)
{
    return std::make_unique<ReadBack>(kilobytes);
}

} // namespace bench
