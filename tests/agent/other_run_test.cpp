// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A run seen and stopped from elsewhere: fptest status, fptest stop, and the refusal of a
// second run.
#include "run_test.h"

#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

constexpr char kNote[] = "/data/vorlane/fptest.run";
constexpr int kBusy = 4;

// Of this process.
class FileLock
{
  public:
    explicit FileLock(const std::string &path) : file_(open(path.c_str(), O_RDWR | O_CLOEXEC))
    {
        struct flock lock = whole();
        EXPECT_EQ(fcntl(file_.get(), F_SETLK, &lock), 0);
    }
    // The process that holds one; 0 for none.
    static pid_t holder(const std::string &path)
    {
        const Descriptor file(open(path.c_str(), O_RDWR | O_CLOEXEC));
        struct flock lock = whole();
        EXPECT_EQ(fcntl(file.get(), F_GETLK, &lock), 0);
        return lock.l_type == F_UNLCK ? 0 : lock.l_pid;
    }

  private:
    static struct flock whole()
    {
        struct flock lock {
        };
        lock.l_type = F_WRLCK;
        lock.l_whence = SEEK_SET;
        return lock;
    }
    Descriptor file_;
};

class OtherRun : public RunCommand
{
  protected:
    // One whose second item runs.
    static Lines of_a_run(Lines options = {})
    {
        return with_group({{"Item", "report G 100 1 bad"},
                           {"Other", std::string("note /tmp/scene/begun ") + kSleeps}},
                          std::move(options));
    }

    static Ended status()
    {
        return run_fptest({"status"});
    }
    static Ended stop(Lines options = {})
    {
        options.insert(options.begin(), "stop");
        return run_fptest(options);
    }

    // Lets the one that runs see nothing more, and ends it.
    static void kill_run(FptestProcess &fptest)
    {
        fptest.signal(SIGKILL);
        fptest.wait();
    }

    static std::string of_process(const FptestProcess &fptest)
    {
        return "process " + std::to_string(fptest.pid()) + ", " + work("plan.xml") +
               " for T s, at G/Other for T s";
    }

    static bool wait_for_item(const std::string &item)
    {
        return eventually(
            [&] { return status().out.find(" at " + item + " ") != std::string::npos; });
    }
};

TEST_F(OtherRun, StatusNamesProcessItemTimesAndLabels)
{
    EXPECT_EQ(status().out, "nothing runs\n");
    FptestProcess fptest(of_a_run({"--label", "device=A7", "--label", "job=12 b"}));
    ASSERT_TRUE(wait_for_item("G/Other"));
    const Ended ended = status();
    EXPECT_EQ(ended.status, kBusy);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out),
              of_process(fptest) + "; 0 passed, 1 failed; device=A7 job=12 b\n");
    fptest.signal(SIGINT);
    fptest.wait();
    const Ended after = status();
    EXPECT_EQ(after.status, 0);
    EXPECT_EQ(after.out, "nothing runs\n");
    EXPECT_FALSE(fs::exists(kNote));
}

TEST_F(OtherRun, StatusSaysThatARunIsSuspendedAndDoesNotCountThatTime)
{
    const auto begin = std::chrono::steady_clock::now();
    const Start start{.arguments = of_a_run(), .prepare = in_own_group};
    FptestProcess fptest(start);
    ASSERT_TRUE(wait_for_item("G/Other"));
    fptest.signal(SIGTSTP);
    ASSERT_TRUE(
        eventually([] { return status().out.find(", suspended, ") != std::string::npos; }, 20));
    const std::string seen = status().out;
    std::this_thread::sleep_for(std::chrono::milliseconds(1200));
    EXPECT_EQ(status().out, seen);
    fptest.signal(SIGCONT);
    ASSERT_TRUE(eventually([&] { return status().out != seen; }));
    const std::string after = status().out;
    const std::chrono::duration<double> passed = std::chrono::steady_clock::now() - begin;
    EXPECT_THAT(after, Not(HasSubstr("suspended")));
    for (const std::string before : {"plan.xml for ", "at G/Other for "}) {
        EXPECT_LT(std::stod(after.substr(after.find(before) + before.size())),
                  passed.count() - 1.0);
    }
    fptest.signal(SIGINT);
    fptest.wait();
}

TEST_F(OtherRun, StatusSaysWhatIsTriedAgain)
{
    FptestProcess fptest(with_group(
        {{"Other", "note /tmp/scene/begun $(test ! -e /tmp/scene/begun || echo sleep 60)"}},
        {"--retry", "2"}));
    ASSERT_TRUE(wait_for_events("start", 2));
    ASSERT_TRUE(wait_for_item("G/Other (attempt 2 of 3)"));
    EXPECT_THAT(status().out, HasSubstr(" s; 0 passed, 0 failed, 0 flaky, 1 retry; device="));
    fptest.signal(SIGINT);
    fptest.wait();
}

TEST_F(OtherRun, SecondRunIsRefusedAndNamesTheFirst)
{
    FptestProcess fptest(of_a_run());
    ASSERT_TRUE(wait_for_events("progress", 2));
    const std::string stored = read_file(kPlanFile);
    for (const Lines &words : {Lines{"run", "P/G"}, Lines{"send", "XMLNodePath::P/G"}}) {
        const Ended second = run_fptest(words);
        EXPECT_EQ(second.status, kBusy);
        EXPECT_EQ(without_times(second.err),
                  "fptest: another fptest is running on this device: " + of_process(fptest) +
                      "; wait for its end, or stop it with fptest stop\n");
        EXPECT_LT(second.seconds, 2);
    }
    EXPECT_EQ(read_file(kPlanFile), stored);
    EXPECT_EQ(stop().status, 0);
}

TEST_F(OtherRun, StopIsAnInterruptionThatIsWaitedFor)
{
    FptestProcess fptest(of_a_run({"--junit", work("junit")}));
    ASSERT_TRUE(wait_for_events("progress", 2));
    const Ended ended = stop();
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(without_times(ended.out), "stopped: " + of_process(fptest) + "\n");
    EXPECT_THAT(running_items(), IsEmpty());
    EXPECT_EQ(fptest.wait().status, 130);
    EXPECT_EQ(read_file(work("signal")), "SIGTERM\n");
    EXPECT_THAT(outcomes(), ElementsAre("Item: failed", "Other: stopped"));
    EXPECT_EQ(reasons().at(1), "stopped by fptest stop");
    EXPECT_EQ(events("finish").at(0).at("reason"), "interrupted by fptest stop");
    EXPECT_EQ(parse_xml(junit()).children.at(0).properties()["reason"],
              "interrupted by fptest stop");
    EXPECT_EQ(run_fptest({"run", "P/G/Item"}).status, 1);
}

TEST_F(OtherRun, StopAndCtrlCAreOneInterruption)
{
    for (const bool is_stop_first : {true, false}) {
        fs::remove(work("begun"));
        FptestProcess fptest(with_group(
            {{"Stubborn", "ignore-stop note /tmp/scene/begun sleep 60"}}, {"--grace", "0.6"}));
        ASSERT_TRUE(wait_for_file("begun"));
        if (!is_stop_first) {
            fptest.signal(SIGINT);
            usleep(100'000);
        }
        FptestProcess stopping({"stop"});
        if (is_stop_first) {
            ASSERT_TRUE(eventually([] { return fs::file_size(kNote) > 100'000; }));
            usleep(100'000);
            fptest.signal(SIGHUP);
        }
        EXPECT_EQ(fptest.wait().status, 130);
        EXPECT_EQ(stopping.wait().status, 0);
        EXPECT_THAT(events("finish"), SizeIs(1));
    }
}

TEST_F(OtherRun, StopIsTakenWhereSignalsAreIgnored)
{
    Start start{.arguments = of_a_run(), .prepare = [] {
                    std::signal(SIGINT, SIG_IGN);
                    std::signal(SIGTERM, SIG_IGN);
                    std::signal(SIGHUP, SIG_IGN);
                }};
    FptestProcess fptest(start);
    ASSERT_TRUE(wait_for_item("G/Other"));
    EXPECT_EQ(stop().status, 0);
    EXPECT_EQ(fptest.wait().status, 130);
}

TEST_F(OtherRun, StopOfNothingSucceeds)
{
    const Ended ended = stop();
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, "nothing runs\n");
}

TEST_F(OtherRun, StopGivesUpAtItsLimitAndSaysWhatToDo)
{
    FptestProcess fptest(with_group({{"Stubborn", "ignore-stop note /tmp/scene/begun sleep 60"}},
                                    {"--grace", "1.2"}));
    ASSERT_TRUE(wait_for_file("begun"));
    const std::string pid = std::to_string(fptest.pid());
    const Ended ended = stop({"--wait", "0.1"});
    EXPECT_EQ(ended.status, kBusy);
    EXPECT_EQ(without_times(ended.err), "fptest: process " + pid + ", " + work("plan.xml") +
                                            " for T s, at G/Stubborn for T s, has been asked to "
                                            "stop and goes on after T s; wait longer, or end it "
                                            "with kill -KILL " +
                                            pid + "\n");
    EXPECT_EQ(fptest.wait().status, 130);
}

TEST_F(OtherRun, StopSaysNotThatItHasAskedOneWhoseNoteIsGone)
{
    FptestProcess fptest(of_a_run());
    ASSERT_TRUE(wait_for_item("G/Other"));
    fs::remove(kNote);
    const Ended ended = stop({"--wait", "0.1"});
    EXPECT_EQ(ended.status, kBusy);
    EXPECT_EQ(without_times(ended.err), "fptest: one that could not say what it does, goes on "
                                        "after T s; wait, or see what runs with ps\n");
    fptest.signal(SIGINT);
    EXPECT_EQ(fptest.wait().status, 130);
}

TEST_F(OtherRun, StopResumesARunThatIsSuspended)
{
    for (const int signal : {SIGTSTP, SIGSTOP}) {
        const Start start{.arguments = of_a_run(), .prepare = in_own_group};
        FptestProcess fptest(start);
        ASSERT_TRUE(wait_for_item("G/Other"));
        fptest.signal(signal);
        ASSERT_TRUE(
            eventually([] { return status().out.find(", suspended, ") != std::string::npos; }, 20));
        EXPECT_EQ(stop().status, 0);
        EXPECT_EQ(fptest.wait().status, 130);
        EXPECT_THAT(running_items(), IsEmpty());
    }
}

TEST_F(OtherRun, OneThatWasKilledIsNoRun)
{
    FptestProcess fptest(of_a_run());
    ASSERT_TRUE(wait_for_item("G/Other"));
    kill_run(fptest);
    EXPECT_TRUE(eventually([] { return status().status == 0; }));
    EXPECT_EQ(status().out,
              "nothing runs; the last run was killed: " + work("plan.xml") + ", at G/Other\n");
    EXPECT_EQ(stop().out, "nothing runs\n");
    EXPECT_TRUE(fs::exists(kNote));
    EXPECT_EQ(run_fptest({"run", "P/G/Item"}).status, 1);
    EXPECT_EQ(status().out, "nothing runs\n");
}

TEST_F(OtherRun, ItemsOfOneThatWasKilledAreWaitedFor)
{
    FptestProcess fptest(with_group({{"Stubborn", "ignore-stop note /tmp/scene/begun sleep 60"}}));
    ASSERT_TRUE(wait_for_file("begun"));
    kill_run(fptest);
    const Ended seen = status();
    EXPECT_EQ(seen.status, kBusy);
    EXPECT_EQ(seen.out, "one that was killed, and whose items are being ended\n");
    EXPECT_EQ(stop().status, 0);
    EXPECT_THAT(running_items(), IsEmpty());
}

// The number may be another process's by then, and the kernel knows who has locked the note.
TEST_F(OtherRun, NoteThatNobodyHoldsIsBelievedInNothing)
{
    const support::Process innocent({.arguments = {"sleep", "60"}});
    device::write_file(kNote, "plan\n\n\nG/I\n" + std::to_string(innocent.pid()) + " 1 0\n");
    EXPECT_EQ(status().status, 0);
    EXPECT_EQ(stop().status, 0);
    device::write_file(kNote, "");
    EXPECT_EQ(status().out, "nothing runs\n");
    fs::remove(kNote);
    ASSERT_EQ(mkfifo(kNote, 0600), 0);
    EXPECT_EQ(status().out, "nothing runs\n");
    EXPECT_EQ(stop().out, "nothing runs\n");
    EXPECT_EQ(kill(innocent.pid(), 0), 0);
    EXPECT_EQ(run_group({{"Item", kPasses}}).status, 0);
}

TEST_F(OtherRun, CommandsThatAreSentAreSeenAndStopped)
{
    write_file(kPlanFile, group_of({{"Item", std::string("note /tmp/scene/begun ") + kSleeps}}));
    FptestProcess fptest({"send", "XMLNodePath::P/G/Item"});
    ASSERT_TRUE(wait_for_file("begun"));
    EXPECT_EQ(without_times(status().out),
              "process " + std::to_string(fptest.pid()) + ", commands for T s\n");
    EXPECT_EQ(stop().status, 0);
    EXPECT_EQ(fptest.wait().status, 130);
    expect_items_to_end();
}

TEST_F(OtherRun, RunOnAFullDiskIsSeenAndStopped)
{
    if (is_in_place()) {
        GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
    }
    write_file(kPlanFile, group_of({{"Item", std::string("note /tmp/scene/begun ") + kSleeps}}));
    fill_disk();
    FptestProcess fptest({"run", "P/G"});
    ASSERT_TRUE(wait_for_file("begun"));
    EXPECT_EQ(status().out, "process " + std::to_string(fptest.pid()) + "\n");
    EXPECT_EQ(stop().status, 0);
    EXPECT_EQ(fptest.wait().status, 130);
}

TEST_F(OtherRun, OfAnotherUserIsSeenAndNotStopped)
{
    FptestProcess fptest(of_a_run());
    ASSERT_TRUE(wait_for_item("G/Other"));
    fs::permissions(kNote, fs::perms::owner_read);
    EXPECT_EQ(run_fptest({.arguments = {"status"}, .prepare = as_plain_user}).status, kBusy);
    const Ended ended = run_fptest({.arguments = {"stop"}, .prepare = as_plain_user});
    EXPECT_EQ(ended.status, 3);
    EXPECT_EQ(ended.err, "fptest: process " + std::to_string(fptest.pid()) +
                             " cannot be asked to stop: /data/vorlane/fptest.run: Permission "
                             "denied; do it as its user\n");
    EXPECT_FALSE(fptest.has_ended());
    fptest.signal(SIGINT);
    fptest.wait();
}

// --- another one, on a device that shares a directory ----------------------------

TEST_F(OtherRun, ResultFilesOfOneThatRunsAreRefused)
{
    const Lines names = {"--json", "--junit", "--log"};
    for (const std::string &name : names) {
        SCOPED_TRACE(name);
        const std::string path = file("taken", "its");
        const FileLock others(path);
        expect_refusal(2,
                       "fptest: " + (name == "--log" ? "--log " + path : path) +
                           ": another fptest is writing it; name another file",
                       {"run", name, path, "--plan", plan(kOnePasses), "P/G"});
        EXPECT_EQ(read_file(path), "its");
        EXPECT_EQ(fs::exists(device::kPlanFile), false);
    }
}

TEST_F(OtherRun, ResultFilesAreLockedAsLongAsItRuns)
{
    const Lines names = {"json", "junit", "log"};
    FptestProcess fptest(of_a_run({"--junit", work("junit"), "--log", work("log")}));
    ASSERT_TRUE(wait_for_file("begun"));
    const auto first = fs::last_write_time(work("junit"));
    for (const std::string &name : names) {
        EXPECT_EQ(FileLock::holder(work(name)), fptest.pid()) << name;
    }
    EXPECT_TRUE(eventually([&] { return fs::last_write_time(work("junit")) != first; }));
    EXPECT_EQ(FileLock::holder(work("junit")), fptest.pid());
    kill_run(fptest);
    for (const std::string &name : names) {
        EXPECT_EQ(FileLock::holder(work(name)), 0) << name;
    }
}

} // namespace
