// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is written to readers that do not read.
#include "reporters/writer.h"

#include "common/descriptor.h"
#include "support/temporary_directory.h"
#include "support/wait.h"

#include <gmock/gmock.h>

#include <array>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace
{

using namespace fptest;
using namespace std::chrono_literals;
using namespace support;

// A pipe; nobody reads it but on request.
class Pipe
{
  public:
    Pipe()
    {
        EXPECT_EQ(pipe2(ends_.data(), O_CLOEXEC), 0);
    }
    Pipe(const Pipe &) = delete;
    Pipe &operator=(const Pipe &) = delete;
    ~Pipe()
    {
        close_reader();
        close(ends_[1]);
    }

    int writer() const
    {
        return ends_[1];
    }
    void close_reader()
    {
        if (ends_[0] >= 0) {
            close(ends_[0]);
            ends_[0] = -1;
        }
    }
    std::string read(std::size_t size)
    {
        std::string text(size, '\0');
        for (std::size_t at = 0; at < size;) {
            const ssize_t got = ::read(ends_[0], text.data() + at, size - at);
            if (got <= 0) {
                ADD_FAILURE() << "no more to be read";
                break;
            }
            at += static_cast<std::size_t>(got);
        }
        return text;
    }

  private:
    std::array<int, 2> ends_{};
};

class WriterTest : public ::testing::Test
{
  protected:
    void SetUp() override
    {
        std::signal(SIGPIPE, SIG_IGN);
    }
    TemporaryDirectory directory_;
};

constexpr std::size_t kMoreThanAPipe = 300'000;

TEST_F(WriterTest, HasWrittenToAReaderWhenItReturns)
{
    Pipe pipe;
    Writer writer("the pipe", pipe.writer());
    writer.write("one\n");
    EXPECT_FALSE(writer.is_pending());
    EXPECT_EQ(pipe.read(4), "one\n");
}

TEST_F(WriterTest, WaitsForNoReaderAndLosesNothing)
{
    Pipe pipe;
    Writer writer("the pipe", pipe.writer());
    std::string expected;
    const auto begin = std::chrono::steady_clock::now();
    for (int at = 0; at < 1000; ++at) {
        const std::string text = std::to_string(at) + std::string(1000, 'x') + "\n";
        writer.write(text);
        expected += text;
    }
    EXPECT_LT(std::chrono::steady_clock::now() - begin, 2s);
    EXPECT_TRUE(writer.is_pending());
    EXPECT_EQ(pipe.read(expected.size()), expected);
    EXPECT_TRUE(eventually([&] { return !writer.is_pending(); }));
    EXPECT_EQ(writer.failure(), "");
}

TEST_F(WriterTest, FailsWhereMoreWaitsThanThereIsRoomFor)
{
    Pipe pipe;
    Writer writer("standard output", pipe.writer());
    const std::string mebibyte(1 << 20, 'x');
    for (int at = 0; at < 16; ++at) {
        writer.write(mebibyte);
    }
    EXPECT_EQ(writer.failure(), "");
    writer.write("x");
    EXPECT_EQ(writer.failure(), "standard output: nobody reads it, and more than 16 MiB wait");
    EXPECT_FALSE(writer.is_pending()) << "what will not be written any more is waited for";
    pipe.close_reader();
    writer.write("x");
    EXPECT_EQ(writer.failure(), "standard output: nobody reads it, and more than 16 MiB wait");
}

TEST_F(WriterTest, TellsThatItsReaderHasLeftWhileItWaited)
{
    Pipe pipe;
    Writer writer("the pipe", pipe.writer());
    writer.write(std::string(kMoreThanAPipe, 'x'));
    EXPECT_TRUE(writer.is_pending());
    pipe.close_reader();
    EXPECT_TRUE(eventually([&] { return !writer.is_pending(); }));
    EXPECT_EQ(writer.failure(), "the pipe: Broken pipe");
}

TEST_F(WriterTest, DoesNotWaitForAReaderToOpenAFifo)
{
    const std::string path = directory_.path("fifo");
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    const auto begin = std::chrono::steady_clock::now();
    Writer writer(path, O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0666);
    writer.write("one\n");
    EXPECT_LT(std::chrono::steady_clock::now() - begin, 2s);
    EXPECT_TRUE(writer.is_pending());
    const Descriptor reader(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    std::array<char, 10> text{};
    EXPECT_EQ(read(reader.get(), text.data(), text.size()), 4);
    EXPECT_STREQ(text.data(), "one\n");
    EXPECT_EQ(writer.failure(), "");
}

TEST_F(WriterTest, LeavesItsOwnerFreeToEndWhileNobodyReads)
{
    Pipe pipe;
    const auto begin = std::chrono::steady_clock::now();
    {
        Writer writer("the pipe", pipe.writer());
        writer.write(std::string(kMoreThanAPipe, 'x'));
    }
    EXPECT_LT(std::chrono::steady_clock::now() - begin, 2s);
    pipe.read(kMoreThanAPipe); // by its thread, which is still there
}

TEST_F(WriterTest, HasWrittenToARegularFileWhenItReturns)
{
    const std::string path = directory_.path("file");
    Writer writer(path, O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0666);
    const std::string text(kMoreThanAPipe, 'x');
    writer.write(text);
    EXPECT_EQ(read_file(path), text);
}

TEST_F(WriterTest, TellsAtOnceWhatCannotBeOpened)
{
    const std::string path = directory_.path("none/file");
    EXPECT_EQ(Writer(path, O_WRONLY | O_CREAT | O_APPEND, 0666).failure(),
              path + ": No such file or directory");
}

TEST_F(WriterTest, TellsThatItsFileHasBeenRemoved)
{
    const std::string path = directory_.path("file");
    Writer writer(path, O_WRONLY | O_CREAT | O_APPEND, 0600);
    writer.write("a");
    EXPECT_EQ(writer.failure(), "");
    ASSERT_EQ(unlink(path.c_str()), 0);
    writer.write("b");
    EXPECT_EQ(writer.failure(), path + ": somebody has removed it");
}

TEST_F(WriterTest, TellsThatItsFileHasBeenCut)
{
    const std::string path = directory_.path("file");
    Writer writer(path, O_WRONLY | O_CREAT | O_APPEND, 0600);
    writer.write("abc");
    ASSERT_EQ(truncate(path.c_str(), 2), 0);
    writer.write("d");
    EXPECT_EQ(writer.failure(), path + ": somebody has cut it");
}

} // namespace
