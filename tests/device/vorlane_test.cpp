// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The platform's interfaces as they are implemented on Linux.
#include "network.h"
#include "support/this_process.h"

#include "sockwrap.h"
#include "sysparm.h"
#include "vr_log.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace
{

using Vorlane = DeviceTest;

// Standard error as a socket that keeps every write apart.
class WritesToStandardError
{
  public:
    WritesToStandardError() : kept_(dup(STDERR_FILENO))
    {
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends_.data()), 0);
        dup2(ends_[1], STDERR_FILENO);
    }
    ~WritesToStandardError()
    {
        dup2(kept_, STDERR_FILENO);
        close(kept_);
        close(ends_[0]);
        close(ends_[1]);
    }
    WritesToStandardError(const WritesToStandardError &) = delete;
    WritesToStandardError &operator=(const WritesToStandardError &) = delete;

    Lines take()
    {
        Lines writes;
        std::string buffer(1 << 20, '\0');
        for (;;) {
            const ssize_t size = recv(ends_[0], buffer.data(), buffer.size(), MSG_DONTWAIT);
            if (size < 0) {
                return writes;
            }
            writes.push_back(buffer.substr(0, static_cast<std::size_t>(size)));
        }
    }

  private:
    int kept_;
    std::array<int, 2> ends_{};
};

TEST_F(Vorlane, LogGoesToStandardErrorWithOneWriteForEachLine)
{
    unsetenv("VR_LOG_FILE");
    WritesToStandardError writes;
    EXPECT_EQ(vr_log_printf(VR_LOG_DEBUG, "TAG", "%s=%d\n", "one", 1), 6);
    EXPECT_EQ(vr_log_printf(VR_LOG_DEBUG, "TAG", "no line feed"), 12);
    EXPECT_EQ(vr_log_printf(5, "TAG", "\ntwo\n"), 5);
    EXPECT_EQ(vr_log_printf(VR_LOG_DEBUG, "TAG", "%s", ""), 0);

    EXPECT_THAT(writes.take(), ElementsAre("4/TAG: one=1\n", "4/TAG: no line feed\n",
                                           "5/TAG: \ntwo\n", "4/TAG: \n"));
}

TEST_F(Vorlane, LogWritesLinesOfAnyLengthWhole)
{
    unsetenv("VR_LOG_FILE");
    WritesToStandardError writes;
    for (const std::size_t size : {2030U, 2038U, 2039U, 2040U, 2041U, 2042U, 2048U, 100000U}) {
        const std::string text(size, 'x');
        EXPECT_EQ(vr_log_printf(VR_LOG_DEBUG, "TAG", "%s", text.c_str()), static_cast<int>(size));
        EXPECT_THAT(writes.take(), ElementsAre("4/TAG: " + text + "\n")) << size;
    }
}

TEST_F(Vorlane, LogGoesToTheFileThatTheEnvironmentNames)
{
    WritesToStandardError writes;
    vr_log_printf(VR_LOG_DEBUG, "TAG", "text\n");

    EXPECT_EQ(read_file(kLogFile), "4/TAG: text\n");
    EXPECT_THAT(writes.take(), IsEmpty());
}

TEST_F(Vorlane, LogAppendsToItsFile)
{
    write_file(kLogFile, "from before\n");
    vr_log_printf(VR_LOG_DEBUG, "TAG", "text\n");
    EXPECT_EQ(read_file(kLogFile), "from before\n4/TAG: text\n");
}

TEST_F(Vorlane, LogThatCannotBeOpenedIsToldOnceAndGoesToStandardError)
{
    setenv("VR_LOG_FILE", "/nowhere/log", 1);
    WritesToStandardError writes;
    vr_log_printf(VR_LOG_DEBUG, "TAG", "one\n");
    vr_log_printf(VR_LOG_DEBUG, "TAG", "two\n");

    EXPECT_THAT(writes.take(),
                ElementsAre("vr_log: cannot open /nowhere/log, which VR_LOG_FILE names: No such "
                            "file or directory; logging to standard error\n",
                            "4/TAG: one\n", "4/TAG: two\n"));
}

TEST_F(Vorlane, LogKeepsErrnoAlsoWhenItFails)
{
    errno = EXDEV;
    vr_log_printf(VR_LOG_DEBUG, "TAG", "opens its file\n");
    EXPECT_EQ(errno, EXDEV);
    vr_log_printf(VR_LOG_DEBUG, "TAG", "%s\n", std::string(5000, 'x').c_str());
    EXPECT_EQ(errno, EXDEV);
    for (int descriptor = 3; descriptor < 64; ++descriptor) {
        close(descriptor); // the log's is among them
    }
    errno = EXDEV;
    vr_log_printf(VR_LOG_DEBUG, "TAG", "cannot be written\n");
    EXPECT_EQ(errno, EXDEV);
}

TEST_F(Vorlane, LogLeavesStandardDescriptorsFree)
{
    const support::FreedDescriptor freed(STDIN_FILENO);
    vr_log_printf(VR_LOG_DEBUG, "TAG", "text\n");
    EXPECT_EQ(dup(STDERR_FILENO), STDIN_FILENO);
    EXPECT_EQ(read_file(kLogFile), "4/TAG: text\n");
}

TEST_F(Vorlane, LogFileIsNotHandedToPrograms)
{
    vr_log_printf(VR_LOG_DEBUG, "TAG", "text\n");
    EXPECT_EQ(std::system("ls -l /proc/self/fd | grep -q /tmp/vr.log"), 256);
}

TEST_F(Vorlane, LogSplitsNoStrings)
{
    char text[] = "one two";
    EXPECT_STREQ(std::strtok(text, " "), "one");
    vr_log_printf(VR_LOG_DEBUG, "TAG", "%s %d\n", "text", 1);
    EXPECT_STREQ(std::strtok(nullptr, " "), "two");
}

TEST_F(Vorlane, LogOfAHostWithoutStandardErrorIsNotWrittenIntoItsFiles)
{
    unsetenv("VR_LOG_FILE");
    {
        const support::FreedDescriptor freed(STDERR_FILENO);
        store("<P/>"); // its file gets the free number and keeps it
        vr_log_printf(VR_LOG_DEBUG, "TAG", "text\n");
    }
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

constexpr char kFile[] = "/tmp/parameters.xml";

std::string value_of(const std::string &path, std::size_t room = 64)
{
    std::string buffer(80, '\0');
    if (get_node_value(kFile, path.c_str(), buffer.data(), room) != 0) {
        return "missing" + std::string(buffer.c_str());
    }
    return buffer.c_str();
}

TEST_F(Vorlane, ParametersAreFoundByTheirPath)
{
    for (const char *declaration : {"", "<?xml version=\"1.0\"?>\n"}) {
        write_file(kFile, std::string(declaration) + "<device>\n <!-- c -->\n"
                                                     " <Other><Quillmark><vendor>5</vendor>"
                                                     "</Quillmark></Other>\n"
                                                     " <SysParam><Quillmark>\n"
                                                     "  <vendor> 1</vendor><vendor>2</vendor>\n"
                                                     "  <empty/>\n"
                                                     " </Quillmark></SysParam>\n</device>\n");
        EXPECT_EQ(value_of("device/SysParam/Quillmark/vendor"), " 1");
        EXPECT_EQ(value_of("device/Other/Quillmark/vendor"), "5");
        EXPECT_EQ(value_of("device/SysParam/Quillmark/empty"), "missing");
        EXPECT_EQ(value_of("device/SysParam/Quillmark/vend"), "missing");
        EXPECT_EQ(value_of("device/SysParam/Quillmark/vendors"), "missing");
        EXPECT_EQ(value_of("device/SysParam/vendor"), "missing");
        EXPECT_EQ(value_of("SysParam/Quillmark/vendor"), "missing");
    }
}

TEST_F(Vorlane, ParameterIsCutToTheBuffer)
{
    write_file(kFile, "<v>" + std::string(70, '7') + "</v>");
    EXPECT_EQ(value_of("v"), std::string(63, '7'));
    EXPECT_EQ(value_of("v", 1), "");
    std::string buffer = "untouched";
    EXPECT_EQ(get_node_value(kFile, "v", buffer.data(), 0), -1);
    EXPECT_EQ(buffer, "untouched");
}

TEST_F(Vorlane, MissingOrBrokenParameterFileLeavesTheBuffer)
{
    unlink(kFile);
    EXPECT_EQ(value_of("v"), "missing");
    write_file(kFile, "<v>1</w>");
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(value_of("v"), "missing");
    EXPECT_NE(::testing::internal::GetCapturedStderr(), "");
}

Socket bound(unsigned short port)
{
    Socket listener(socket(AF_INET, SOCK_STREAM, 0));
    const sockaddr_in address = loopback(port);
    const int on = 1;
    Setsockopt(listener.get(), &on);
    Bind(listener.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address);
    EXPECT_EQ(listen(listener.get(), 5), 0);
    return listener;
}

Socket accept_at(int listener)
{
    sockaddr_in peer{};
    socklen_t length = sizeof peer;
    Socket connection(Accept(listener, reinterpret_cast<sockaddr *>(&peer), &length));
    if (connection.is_open()) {
        EXPECT_EQ(ntohl(peer.sin_addr.s_addr), INADDR_LOOPBACK);
    }
    return connection;
}

TEST_F(Vorlane, PortIsBoundAgainWhileAnOldConnectionLingers)
{
    for (int round = 0; round < 3; ++round) {
        const Socket listener = bound(kTriggerPort);
        const Socket client = connect_to(kTriggerPort);
        // closed first: its end is the one that lingers
        EXPECT_TRUE(accept_at(listener.get()).is_open());
    }
    EXPECT_EQ(read_file(kLogFile), "");
}

TEST_F(Vorlane, SocketFailuresAreLoggedUnderTheirOwnTag)
{
    const sockaddr_in address = loopback(kTriggerPort);
    const int on = 1;
    Setsockopt(-1, &on);
    Bind(-1, reinterpret_cast<const sockaddr *>(&address), sizeof address);
    EXPECT_EQ(read_file(kLogFile), "4/VRSOCK: setsockopt failed(9),Bad file descriptor\n"
                                   "4/VRSOCK: bind failed(9),Bad file descriptor\n");
}

TEST_F(Vorlane, AcceptSaysWhyItFailed)
{
    EXPECT_FALSE(accept_at(-1).is_open());
    EXPECT_EQ(errno, EBADF);
}

void nothing(int /*signal*/)
{
}

TEST_F(Vorlane, SignalDoesNotEndTheWaitForAConnection)
{
    struct sigaction action {
    };
    action.sa_handler = nothing; // without SA_RESTART
    sigaction(SIGUSR1, &action, nullptr);
    const Socket listener = bound(kTriggerPort);
    const pthread_t waiting = pthread_self();
    std::thread other([&] {
        for (int signals = 0; signals < 3; ++signals) {
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
            pthread_kill(waiting, SIGUSR1);
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        connect_to(kTriggerPort);
    });
    EXPECT_TRUE(accept_at(listener.get()).is_open());
    other.join();
}

} // namespace
