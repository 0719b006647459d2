// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the surroundings do to a host: disks that are full or read-only, a
// directory in the plan's place, limits, a missing shell, gatherers that fail,
// signals. After each fault the next command without one works.
#include "device_test.h"
#include "network.h"
#include "support/process.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <optional>
#include <sched.h>
#include <set>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

using namespace device;
namespace fs = std::filesystem;

namespace
{

constexpr char kDataDirectory[] = "/data/vorlane";
constexpr char kProbe[] = "/system/bin/SensorProbe";
// Its name holds the gatherer's, so that it counts as one; it connects nowhere.
constexpr char kHolder[] = "/system/bin/SensorProbeHolder";

// A gatherer that is asked for help says it and ends, and connects nowhere.
const std::string kPlan = plan_of({{"G", {{"Note", "x"}, {"SensorProbe", "--help"}}}});

// The plan as it is saved after a report on Note; Mini-XML wraps long lines.
std::string saved(int progress, const std::string &description)
{
    return "<P>\n<CmdGroup name=\"G\">\n\t<Cmd name=\"Note\" args=\"x\" progress=\"" +
           std::to_string(progress) + "\" result=\"0\"" + (description.size() > 10 ? "\n" : " ") +
           "description=\"" + description +
           "\" />\n\t<Cmd name=\"SensorProbe\" args=\"--help\" />\n</CmdGroup>\n</P>\n";
}

void report(int progress, const std::string &description)
{
    EXPECT_EQ(FPTEST_SetTransation("G", "Note", progress, 0, description.c_str()), 0);
}

// Loads the plan and changes nothing.
void load()
{
    FPTEST_SetTransation("no such group", "", 0, 0, "");
    log_lines();
}

// --- what is logged ----------------------------------------------------------

Lines operator+(Lines left, const Lines &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

std::string open_failure(const std::string &function, const std::string &error)
{
    return function + "| Open /data/vorlane/src1.xml file failed(" + error;
}

const std::string kTooManyFiles = "24),Too many open files";

Lines lines_of_store(const std::string &plan, const Lines &failure = {})
{
    return Lines{"fptest_ParseCmdLine| testHead is : XMLFile",
                 "fptest_ParseCmdLine| testName is : " + plan} +
           failure + Lines{"FPTEST_RunTestCmd| Save source xml file success!"};
}

// Up to the item's lookup by name.
Lines lines_of_command(const std::string &item)
{
    return {"fptest_ParseCmdLine| testHead is : XMLNodePath",
            "fptest_ParseCmdLine| testName is : P/G/" + item,
            "fptest_ItemsTest| Input cmdline : P/G/" + item,
            "get_node_level| level = 3",
            "get_node_level| node name = " + item,
            "get_node_name| enter...",
            "get_node_name| root node:P",
            "get_node_name| mid node:G",
            "get_node_name| leaf node:" + item,
            "get_node_index| enter..."};
}

Lines lines_of_unloaded(const std::string &item, const Lines &failure = {})
{
    return lines_of_command(item) + failure +
           Lines{"get_node_index| get_node_index[]:load config file failed",
                 "SingleItemExecute| enter... !", "get_node_byIndex| enter...",
                 "get_node_byIndex| get_node_byIndex[]:load config file failed",
                 "SingleItemExecute| get node by Index fail!"};
}

const Lines kNotFound{"ResourceReduce| target process not exist!"};
const Lines kNotAsked{"ResourceReduce| popen error!"};

Lines lines_of_lookup(const std::string &item, const std::string &args, const Lines &query)
{
    return lines_of_command(item) +
           Lines{"SingleItemExecute| enter... !",
                 "get_node_byIndex| enter...",
                 "get_node_byIndex| curernt leaf node name = " + item,
                 "get_node_byIndex| leave...",
                 "SingleItemExecute| mxmlElementGetAttr name=" + item + "- args=" + args,
                 "ResourceReduce| \ncbuf=ps | grep /system/bin/SensorProbe"} +
           query + Lines{"SingleItemExecute| tpCmd:/system/bin/" + item + " " + args};
}

Lines lines_of_note(const Lines &query = kNotFound)
{
    return lines_of_lookup("Note", "x", query) + Lines{"SingleItemExecute| leave... !"};
}

const Lines kTriggered{"Sock_Init1| retWri=13", "Sock_Init1| retWri success"};

// One that was not running.
Lines lines_of_gatherer(const std::string &args, const Lines &query, const Lines &trigger)
{
    return lines_of_lookup("SensorProbe", args, query) +
           Lines{std::string("SingleItemExecute| \nrow=") + (query == kNotAsked ? "-1" : "0")} +
           trigger + Lines{"SingleItemExecute| leave... !"};
}

const Lines kSaved{"save_XmlFile| leave..."};

Lines lines_of_report(int progress, const std::string &description, const Lines &save = kSaved)
{
    return Lines{"FPTEST_SetTransation| enter...",
                 "FPTEST_SetTransation| input node name = Note",
                 "get_node_index| enter...",
                 "FPTEST_SetTransation| iResult = 0",
                 "FPTEST_SetTransation| index=0 - iResult=0 - iProgress=" +
                     std::to_string(progress) + " - iDesc=" + description,
                 "updateSrcXmlFile| enter... !",
                 "updateSrcXmlFile| curernt node name is: Note",
                 "updateSrcXmlFile| start update progress!",
                 "updateSrcXmlFile| start update result!",
                 "updateSrcXmlFile| start update description!",
                 "updateSrcXmlFile| start save xml!",
                 "save_XmlFile| enter..."} +
           save +
           Lines{"updateSrcXmlFile| update Src Xml File success . leave...",
                 "FPTEST_SetTransation| leave..."};
}

Lines lines_of_unloaded_report(int progress, const std::string &description,
                               const Lines &failure = {})
{
    return Lines{"FPTEST_SetTransation| enter...", "FPTEST_SetTransation| input node name = Note",
                 "get_node_index| enter..."} +
           failure +
           Lines{"get_node_index| get_node_index[]:load config file failed",
                 "FPTEST_SetTransation| iResult = 0",
                 "FPTEST_SetTransation| index=-1 - iResult=0 - iProgress=" +
                     std::to_string(progress) + " - iDesc=" + description,
                 "updateSrcXmlFile| enter... !"} +
           failure +
           Lines{"updateSrcXmlFile| updateSrcXmlFile[]:load config file failed",
                 "FPTEST_SetTransation| leave..."};
}

Lines lines_of_read_back(std::size_t size)
{
    const std::string count = std::to_string(size);
    return Lines{"FPTEST_ExtractResultMsg| enter... !", "FPTEST_ExtractResultMsg| offset = 0",
                 "FPTEST_ExtractResultMsg| offset = " + count,
                 "FPTEST_ExtractResultMsg| offset = 0"} +
           (size == 0 ? Lines{}
                      : Lines{"FPTEST_ExtractResultMsg| read file unfinish, continue... n = " +
                              count + " "}) +
           Lines{"FPTEST_ExtractResultMsg| reach the end of file",
                 "FPTEST_ExtractResultMsg| read byte count = " + count,
                 "FPTEST_ExtractResultMsg| leave..."};
}

// --- processes of the test's own ---------------------------------------------

// A host beside the test's own process.
class OtherHost : public support::Process
{
  public:
    using Process::Process;

    int status()
    {
        return wait(30).status;
    }
};

// A limit of this process while this lives.
class Limit
{
  public:
    Limit(int resource, rlim_t value) : resource_(resource)
    {
        getrlimit(resource_, &before_);
        const rlimit tight{value, before_.rlim_max};
        EXPECT_EQ(setrlimit(resource_, &tight), 0);
    }
    ~Limit()
    {
        setrlimit(resource_, &before_);
    }
    Limit(const Limit &) = delete;
    Limit &operator=(const Limit &) = delete;

  private:
    int resource_;
    rlimit before_{};
};

bool is_in_place()
{
    return std::getenv("QUILLMARK_DEVICE") == std::string("in-place");
}

class Fault : public DeviceTest
{
};

// --- a full disk -------------------------------------------------------------

class FullDisk : public Fault
{
  protected:
    void SetUp() override
    {
        if (is_in_place()) {
            GTEST_SKIP() << "in place, the disk is the container's own and is not to be filled";
        }
        Fault::SetUp();
        struct statvfs disk {
        };
        ASSERT_EQ(statvfs(kDataDirectory, &disk), 0);
        ASSERT_LE(disk.f_blocks * disk.f_frsize, 64U << 20) << "too much to be filled";
        EXPECT_EQ(disk.f_frsize, kBlock);
    }

    static constexpr std::size_t kBlock = 4096;

    static void fill()
    {
        const Socket filler(open(kFiller, O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
        const std::string block(kBlock, 'f');
        while (write(filler.get(), block.data(), block.size()) > 0) {
        }
        EXPECT_EQ(errno, ENOSPC);
    }
    static void make_room()
    {
        EXPECT_EQ(unlink(kFiller), 0);
    }

  private:
    static constexpr char kFiller[] = "/data/vorlane/filler";
};

TEST_F(FullDisk, StoredPlanIsLostAndTheNextOneWorks)
{
    store("<P/>"); // stays open, and so keeps its block when it is removed
    load();
    fill();
    log_lines();
    store(kPlan);
    EXPECT_EQ(log_lines(), lines_of_store(kPlan, {"saveRecvFile| WRITE DATA FAIL!"}));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);

    EXPECT_EQ(read_back(), "");
    EXPECT_EQ(log_lines(), lines_of_read_back(0));
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_unloaded("Note"));
    report(1, "d");
    EXPECT_EQ(log_lines(), lines_of_unloaded_report(1, "d"));
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);

    make_room();
    store(kPlan);
    EXPECT_EQ(log_lines(), lines_of_store(kPlan));
    EXPECT_EQ(read_file(kPlanFile), kPlan);
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_note());
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|x"));
    report(2, "d");
    EXPECT_EQ(log_lines(), lines_of_report(2, "d"));
    EXPECT_EQ(read_back(), saved(2, "d"));
}

TEST_F(FullDisk, ReportIsCutAtTheDisksEndAndTheNextOneSavesAllOfIt)
{
    const std::string description(10000, 'd');
    store(kPlan);
    load();
    fill();
    report(1, description);
    EXPECT_EQ(log_lines(), lines_of_report(1, description));
    // the block that the plan had before
    EXPECT_EQ(read_file(kPlanFile), saved(1, description).substr(0, kBlock));
    EXPECT_EQ(read_back(), saved(1, description).substr(0, kBlock));
    EXPECT_EQ(log_lines(), lines_of_read_back(kBlock));
    run_path("P/G/Note"); // from the copy in memory, which is whole
    EXPECT_EQ(log_lines(), lines_of_note());

    make_room();
    report(2, description);
    EXPECT_EQ(log_lines(), lines_of_report(2, description));
    EXPECT_EQ(read_back(), saved(2, description));
}

// --- other mounts ------------------------------------------------------------

// Mounts of this process alone. It needs no privilege for them, only a user
// namespace of its own.
class PrivateMounts : public Fault
{
  protected:
    void SetUp() override
    {
        if (is_in_place()) {
            GTEST_SKIP() << "in place, there are no namespaces to mount in";
        }
        Fault::SetUp();
        ASSERT_EQ(unshare(CLONE_NEWUSER | CLONE_NEWNS), 0) << "no user namespace within the device";
    }
    void TearDown() override
    {
        while (!mounted_.empty()) {
            EXPECT_EQ(umount2(mounted_.back().c_str(), MNT_DETACH), 0);
            mounted_.pop_back();
        }
        Fault::TearDown();
    }

    void mount_over(const std::string &target, const std::string &source)
    {
        ASSERT_EQ(mount(source.c_str(), target.c_str(), nullptr, MS_BIND, nullptr), 0) << target;
        mounted_.push_back(target);
    }
    static void remount(const std::string &target, unsigned long flags)
    {
        ASSERT_EQ(mount(nullptr, target.c_str(), nullptr,
                        MS_BIND | MS_REMOUNT | MS_NOSUID | MS_NODEV | flags, nullptr),
                  0);
    }

  private:
    Lines mounted_;
};

using ReadOnlyDisk = PrivateMounts;

TEST_F(ReadOnlyDisk, StoreLeavesTheOldPlanInUse)
{
    store(kPlan);
    load();
    const mxml_node_t *cached = g_TestCmdTree;
    mount_over(kDataDirectory, kDataDirectory);
    remount(kDataDirectory, MS_RDONLY);
    store("<P/>");
    EXPECT_EQ(log_lines(), lines_of_store("<P/>", {"saveRecvFile| OPEN FILE FAIL!"}));
    EXPECT_EQ(g_TestCmdTree, cached);
    EXPECT_EQ(read_file(kPlanFile), kPlan);
    EXPECT_EQ(read_back(), kPlan);
    EXPECT_EQ(log_lines(), lines_of_read_back(kPlan.size()));
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_note());

    remount(kDataDirectory, 0);
    store("<P/>");
    EXPECT_EQ(log_lines(), lines_of_store("<P/>"));
    EXPECT_EQ(g_TestCmdTree, nullptr);
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

TEST_F(ReadOnlyDisk, ReportStaysInMemoryUntilOneCanBeSaved)
{
    store(kPlan);
    load();
    mount_over(kDataDirectory, kDataDirectory);
    remount(kDataDirectory, MS_RDONLY);
    report(1, "d");
    EXPECT_EQ(log_lines(),
              lines_of_report(1, "d", {open_failure("save_XmlFile", "30),Read-only file system")}));
    EXPECT_EQ(read_file(kPlanFile), kPlan);

    remount(kDataDirectory, 0);
    EXPECT_EQ(FPTEST_SetTransation("G", "SensorProbe", 2, 1, "e"), 0);
    EXPECT_EQ(read_file(kPlanFile),
              "<P>\n<CmdGroup name=\"G\">\n\t<Cmd name=\"Note\" args=\"x\" progress=\"1\" "
              "result=\"0\" description=\"d\" />\n\t<Cmd name=\"SensorProbe\" args=\"--help\" "
              "progress=\"2\" result=\"1\"\ndescription=\"e\" />\n</CmdGroup>\n</P>\n");
}

// --- a missing shell ---------------------------------------------------------

class MissingShell : public PrivateMounts
{
  protected:
    void SetUp() override
    {
        PrivateMounts::SetUp();
        if (IsSkipped() || HasFatalFailure()) {
            return;
        }
        fs::create_directory("/tmp/empty");
        fs::create_directory("/tmp/bin");
        for (const auto &entry : fs::directory_iterator("/system/bin")) {
            if (entry.path().filename() != "sh") {
                fs::create_symlink(fs::read_symlink(entry.path()),
                                   "/tmp/bin" / entry.path().filename());
            }
        }
    }
    void TearDown() override
    {
        PrivateMounts::TearDown();
        fs::remove_all("/tmp/bin");
        fs::remove_all("/tmp/empty");
    }

    void hide_the_libcs()
    {
        mount_over("/bin", "/tmp/empty");
        ASSERT_NE(access("/bin/sh", F_OK), 0);
    }
    void hide_the_launchers()
    {
        mount_over("/system/bin", "/tmp/bin");
        ASSERT_NE(access("/system/bin/sh", F_OK), 0);
        ASSERT_EQ(access("/system/bin/ps", X_OK), 0);
    }

    // The exit codes of the children, but for one that goes on running. The
    // launcher's own look may have taken one that has ended at once.
    static std::multiset<int> exit_codes(pid_t running = -1)
    {
        EXPECT_TRUE(eventually([=] {
            const auto all = processes();
            return std::none_of(all.begin(), all.end(), [=](const Process &process) {
                return process.parent == getpid() && process.pid != running && process.state != 'Z';
            });
        }));
        std::multiset<int> codes;
        for (int status = 0; waitpid(-1, &status, WNOHANG) > 0;) {
            codes.insert(WIFEXITED(status) ? WEXITSTATUS(status) : -1);
        }
        return codes;
    }
};

using Codes = std::multiset<int>;

TEST_F(MissingShell, OfTheLibcLetsNoItemRun)
{
    hide_the_libcs();
    store(kPlan);
    load();
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_note(kNotAsked));
    EXPECT_THAT(ran(), IsEmpty());

    EXPECT_EQ(FPTEST_SuspendItemExecute(), -1);
    EXPECT_THAT(log_lines(), ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                         "FPTEST_SuspendItemExecute| popen error!"));
    EXPECT_EQ(exit_codes(), Codes());
}

TEST_F(MissingShell, OfTheLibcLetsTheGathererRun)
{
    hide_the_libcs();
    store(plan_of({{"G", {{"SensorProbe", "--group G"}}}}));
    load();
    run_path("P/G/SensorProbe");
    EXPECT_EQ(log_lines(), lines_of_gatherer("--group G", kNotAsked, kTriggered));
    EXPECT_EQ(processes_named(kProbe).size(), 1U);
}

TEST_F(MissingShell, OfTheLauncherStartsNoGatherer)
{
    hide_the_launchers();
    store(kPlan);
    load();
    run_path("P/G/Note"); // has the libc's
    EXPECT_EQ(log_lines(), lines_of_note());
    EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|x"));

    std::thread command([] { run_path("P/G/SensorProbe"); });
    EXPECT_TRUE(eventually([] { return !listeners().empty(); }));
    EXPECT_EQ(receive(connect_to(kTriggerPort)), "gather again!");
    command.join();
    EXPECT_EQ(log_lines(), lines_of_gatherer("--help", kNotFound, kTriggered));
    EXPECT_THAT(exit_codes(), ::testing::AnyOf(Codes(), Codes({127})));
}

TEST_F(MissingShell, OfTheLauncherStopsNoItem)
{
    store(kPlan);
    load();
    run_path("P/G/Note");
    const pid_t running = start_program({"/system/bin/Note", "--sleep", "60"});
    hide_the_launchers();
    log_lines();

    EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
    EXPECT_THAT(log_lines(),
                ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                            "FPTEST_SuspendItemExecute| pid = " + std::to_string(running)));
    EXPECT_THAT(exit_codes(running), ::testing::AnyOf(Codes({0}), Codes({0, 127})))
        << "of the listing, of the kill";
    EXPECT_EQ(waitpid(running, nullptr, WNOHANG), 0) << "still running";
}

// --- a directory in the plan's place -----------------------------------------

class DirectoryInThePlansPlace : public Fault
{
  protected:
    void SetUp() override
    {
        fs::remove_all(kPlanFile);
        Fault::SetUp();
        ::testing::internal::CaptureStderr(); // Mini-XML's complaints
    }
    void TearDown() override
    {
        ::testing::internal::GetCapturedStderr();
        fs::remove_all(kPlanFile);
        Fault::TearDown();
    }

    static void put_directory()
    {
        fs::remove_all(kPlanFile);
        fs::create_directory(kPlanFile);
    }
};

TEST_F(DirectoryInThePlansPlace, IsRemovedByAStoreWhileItIsEmpty)
{
    put_directory();
    store(kPlan);
    EXPECT_EQ(log_lines(), lines_of_store(kPlan));
    EXPECT_EQ(read_file(kPlanFile), kPlan);
}

TEST_F(DirectoryInThePlansPlace, WithSomethingInItKeepsAStoreOut)
{
    store(kPlan);
    load();
    const mxml_node_t *cached = g_TestCmdTree;
    put_directory();
    write_file(std::string(kPlanFile) + "/kept", "text");
    const auto open = descriptors();
    store("<P/>");
    EXPECT_EQ(log_lines(), lines_of_store("<P/>", {"saveRecvFile| OPEN FILE FAIL!"}));
    EXPECT_EQ(read_file(std::string(kPlanFile) + "/kept"), "text");
    EXPECT_EQ(descriptors(), open);
    EXPECT_EQ(g_TestCmdTree, cached);
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_note());

    fs::remove_all(kPlanFile);
    store("<P/>");
    EXPECT_EQ(log_lines(), lines_of_store("<P/>"));
    EXPECT_EQ(read_file(kPlanFile), "<P/>");
}

TEST_F(DirectoryInThePlansPlace, IsOpenedButNotLoaded)
{
    put_directory();
    const auto open = descriptors();
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_unloaded("Note"));
    report(1, "d");
    EXPECT_EQ(log_lines(), lines_of_unloaded_report(1, "d"));
    EXPECT_EQ(descriptors(), open);
    EXPECT_TRUE(fs::is_directory(kPlanFile));

    fs::remove(kPlanFile);
    write_file(kPlanFile, kPlan);
    run_path("P/G/Note");
    EXPECT_EQ(log_lines(), lines_of_note());
}

TEST_F(DirectoryInThePlansPlace, KeepsAReportInMemory)
{
    store(kPlan);
    load();
    put_directory();
    report(1, "d");
    EXPECT_EQ(log_lines(),
              lines_of_report(1, "d", {open_failure("save_XmlFile", "21),Is a directory")}));
    EXPECT_TRUE(fs::is_directory(kPlanFile));

    fs::remove(kPlanFile);
    report(2, "e");
    EXPECT_EQ(log_lines(), lines_of_report(2, "e"));
    EXPECT_EQ(read_file(kPlanFile), saved(2, "e"));
}

long count_in(pid_t process, const std::string &key)
{
    const std::string counts = read_file("/proc/" + std::to_string(process) + "/io");
    const auto at = counts.find("\n" + key + ": ");
    return at == std::string::npos ? -1 : std::stol(counts.substr(at + key.size() + 3));
}

TEST_F(DirectoryInThePlansPlace, IsReadBackWithoutEndAndEveryTryIsLogged)
{
    put_directory();
    OtherHost host([] {
        const itimerval alarm{{}, {0, 50000}};
        setitimer(ITIMER_REAL, &alarm, nullptr);
        read_back();
        ADD_FAILURE() << "the read-back has returned";
    });
    // as long as nobody has waited for it, its counters can be read
    EXPECT_TRUE(eventually([&] { return status_field(host.pid(), "State").starts_with("Z"); }));
    const long reads = count_in(host.pid(), "syscr");
    EXPECT_EQ(host.status(), -SIGALRM);

    const Lines lines = log_lines(host.pid());
    ASSERT_GE(lines.size(), 100U);
    EXPECT_THAT(
        Lines(lines.begin(), lines.begin() + 2),
        ElementsAre("FPTEST_ExtractResultMsg| enter... !", "FPTEST_ExtractResultMsg| offset = 0"));
    // where a directory ends is the file system's to say
    EXPECT_THAT(lines[2], ::testing::StartsWith("FPTEST_ExtractResultMsg| offset = "));
    EXPECT_EQ(lines[3], "FPTEST_ExtractResultMsg| offset = 0");
    const Lines failures(lines.begin() + 4, lines.end());
    EXPECT_THAT(failures, ::testing::Each("FPTEST_ExtractResultMsg| FPTEST_ExtractResultMsg[]:read "
                                          "file failed"));
    // the last one may have ended before it was told
    EXPECT_GE(reads, static_cast<long>(failures.size()));
    EXPECT_LE(reads, static_cast<long>(failures.size()) + 1);
}

// --- a limit on the size of files --------------------------------------------

class FileSizeLimit : public Fault, public ::testing::WithParamInterface<bool>
{
  protected:
    static constexpr rlim_t kLimit = 100;

    static bool is_ignored()
    {
        return GetParam();
    }

    // Runs the body in a host of its own, whose log goes into a pipe: a file of
    // it would be limited as well. Returns the host's wait status.
    template <typename Body> int run_limited(rlim_t limit, Body body)
    {
        std::array<int, 2> ends{};
        EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
        const Socket reading(ends[0]);
        std::optional<Socket> writing(ends[1]);
        OtherHost host([&] {
            dup2(writing->get(), STDERR_FILENO);
            unsetenv("VR_LOG_FILE");
            std::signal(SIGXFSZ, is_ignored() ? SIG_IGN : SIG_DFL);
            const Limit limited(RLIMIT_FSIZE, limit);
            body();
        });
        writing.reset();
        std::string log;
        std::array<char, 4096> buffer{};
        for (ssize_t got = 0; (got = read(reading.get(), buffer.data(), buffer.size())) > 0;) {
            log.append(buffer.data(), static_cast<std::size_t>(got));
        }
        write_file(kLogFile, log);
        lines_ = log_lines(host.pid());
        return host.status();
    }

    [[nodiscard]] const Lines &lines() const
    {
        return lines_;
    }

  private:
    Lines lines_;
};

TEST_P(FileSizeLimit, CutsAStoredPlanWithoutASignal)
{
    EXPECT_EQ(run_limited(kLimit, [] { store(kPlan); }), 0);
    EXPECT_EQ(lines(), lines_of_store(kPlan, {"saveRecvFile| WRITE DATA FAIL!"}));
    ASSERT_GT(kPlan.size(), kLimit);
    EXPECT_EQ(read_file(kPlanFile), kPlan.substr(0, kLimit));
}

TEST_P(FileSizeLimit, OfNothingKeepsAStoredPlanOut)
{
    const int status = run_limited(0, [] { store(kPlan); });
    const Lines all = lines_of_store(kPlan, {"saveRecvFile| WRITE DATA FAIL!"});
    if (is_ignored()) {
        EXPECT_EQ(status, 0);
        EXPECT_EQ(lines(), all);
    } else {
        EXPECT_EQ(status, -SIGXFSZ) << "the library changes no disposition";
        EXPECT_EQ(lines(), Lines(all.begin(), all.end() - 2));
    }
    EXPECT_EQ(fs::file_size(kPlanFile), 0U);
}

TEST_P(FileSizeLimit, CutsASavedPlan)
{
    write_file(kPlanFile, kPlan);
    const int status = run_limited(kLimit, [] { report(1, "d"); });
    const Lines all = lines_of_report(1, "d");
    if (is_ignored()) {
        EXPECT_EQ(status, 0);
        EXPECT_EQ(lines(), all);
    } else {
        EXPECT_EQ(status, -SIGXFSZ) << "the library changes no disposition";
        EXPECT_EQ(lines(), Lines(all.begin(), all.end() - 3));
    }
    EXPECT_EQ(read_file(kPlanFile), saved(1, "d").substr(0, kLimit));
}

INSTANTIATE_TEST_SUITE_P(Signal, FileSizeLimit, ::testing::Bool(),
                         [](const auto &test) { return test.param ? "Ignored" : "NotIgnored"; });

// --- a limit on descriptors --------------------------------------------------

class DescriptorLimit : public Fault, public ::testing::WithParamInterface<rlim_t>
{
  protected:
    // So many more can be opened under the limit.
    static std::size_t room()
    {
        std::size_t free = 0;
        for (rlim_t descriptor = 0; descriptor < GetParam(); ++descriptor) {
            free += fcntl(static_cast<int>(descriptor), F_GETFD) < 0 ? 1 : 0;
        }
        return free;
    }

    template <typename Body> static Lines lines_under_limit(Body body)
    {
        log_lines();
        {
            const Limit limited(RLIMIT_NOFILE, GetParam());
            body();
        }
        return log_lines();
    }

    static void expect_item(bool loaded)
    {
        const std::size_t room_before = room();
        EXPECT_EQ(
            lines_under_limit([] { run_path("P/G/Note"); }),
            loaded ? lines_of_note(room_before >= 2 ? kNotFound : kNotAsked)
                   : lines_of_unloaded("Note", {open_failure("load_configs_file", kTooManyFiles)}));
        EXPECT_EQ(room(), room_before);
    }
    static void expect_report(bool loaded)
    {
        const std::size_t room_before = room();
        const Lines failure{
            open_failure(loaded ? "save_XmlFile" : "load_configs_file", kTooManyFiles)};
        EXPECT_EQ(lines_under_limit([] { report(1, "d"); }),
                  loaded ? lines_of_report(1, "d", room_before > 0 ? kSaved : failure)
                         : lines_of_unloaded_report(1, "d", failure));
        EXPECT_EQ(read_file(kPlanFile), room_before > 0 ? saved(1, "d") : kPlan);
        EXPECT_EQ(room(), room_before);
    }
    static void expect_read_back()
    {
        const std::size_t room_before = room();
        const std::string plan = read_file(kPlanFile);
        std::string text;
        EXPECT_EQ(
            lines_under_limit([&] { text = read_back(); }),
            room_before > 0
                ? lines_of_read_back(plan.size())
                : Lines({"FPTEST_ExtractResultMsg| enter... !",
                         "FPTEST_ExtractResultMsg| Open /data/vorlane/src1.xml file failed!"}));
        EXPECT_EQ(text, room_before > 0 ? plan : "");
        EXPECT_EQ(room(), room_before);
    }
    static void expect_suspension()
    {
        const std::size_t room_before = room();
        const bool listed = room_before >= 2;
        EXPECT_EQ(lines_under_limit([] { EXPECT_EQ(FPTEST_SuspendItemExecute(), -1); }),
                  Lines({"FPTEST_SuspendItemExecute| enter... !",
                         listed ? "FPTEST_SuspendItemExecute| target process not exist!"
                                : "FPTEST_SuspendItemExecute| popen error!"}));
        EXPECT_EQ(room(), room_before - (listed ? 1 : 0)) << "the stream stays open";
    }
    static void expect_gatherer()
    {
        const std::size_t room_before = room();
        const Lines no_socket{"VRSOCK: setsockopt failed(9),Bad file descriptor",
                              "VRSOCK: bind failed(9),Bad file descriptor",
                              "Sock_Init1| listen error",
                              "Sock_Init1| errno=9",
                              "Sock_Init1| accept error!",
                              "Sock_Init1| errno=9"};
        const Lines no_connection{"Sock_Init1| accept error!", "Sock_Init1| errno=24"};
        EXPECT_EQ(lines_under_limit([] { run_path("P/G/SensorProbe"); }),
                  lines_of_gatherer("--help", room_before >= 2 ? kNotFound : kNotAsked,
                                    room_before == 0   ? no_socket
                                    : room_before == 1 ? no_connection
                                                       : kTriggered));
        EXPECT_EQ(room(), room_before - (room_before > 0 ? 1 : 0))
            << "the connection stays open, or else the listening socket";
        EXPECT_TRUE(eventually([] {
            const auto all = processes();
            return std::none_of(all.begin(), all.end(), [](const Process &process) {
                return process.parent == getpid() && process.state != 'Z';
            });
        })) << "the gatherer does not end";
    }
    static void expect_store()
    {
        const std::size_t room_before = room();
        EXPECT_EQ(lines_under_limit([] { store(kPlan); }),
                  lines_of_store(kPlan, room_before > 0 ? Lines{}
                                                        : Lines{"saveRecvFile| OPEN FILE FAIL!"}));
        EXPECT_EQ(fs::exists(kPlanFile), room_before > 0) << "removed before it is opened";
        EXPECT_EQ(g_TestCmdTree == nullptr, room_before > 0);
        EXPECT_EQ(room(), room_before - (room_before > 0 ? 1 : 0)) << "the plan stays open";
    }

    static void run_everything(bool loaded)
    {
        close_range(STDERR_FILENO + 1, ~0U, 0);
        FPTEST_RunTestCmd("unknown", nullptr, 0); // the log opens its file
        if (loaded) {
            load();
        }
        const bool loads = loaded || room() > 0;
        expect_report(loads);
        expect_item(loads);
        expect_read_back();
        expect_suspension();
        if (loads) { // without its plan it is an item as any other
            expect_gatherer();
            expect_store();
        }
        log_lines();
        store(kPlan); // without the limit
        run_path("P/G/Note");
        EXPECT_EQ(log_lines(), lines_of_store(kPlan) + lines_of_note());
        EXPECT_THAT(ran(), ::testing::Contains("/system/bin/Note|x"));
    }
};

TEST_P(DescriptorLimit, IsLoggedAndEndsNothing)
{
    for (const bool loaded : {false, true}) {
        SCOPED_TRACE(loaded ? "with a plan in memory" : "with no plan in memory");
        write_file(kPlanFile, kPlan);
        OtherHost host([&] { run_everything(loaded); });
        while (!host.has_ended()) {
            if (!listeners().empty()) { // it may have gone by the time of connecting
                const Socket client(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
                const sockaddr_in address = loopback(kTriggerPort);
                static_cast<void>(connect(
                    client.get(), reinterpret_cast<const sockaddr *>(&address), sizeof address));
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        EXPECT_EQ(host.status(), 0);
    }
}

INSTANTIATE_TEST_SUITE_P(From0, DescriptorLimit, ::testing::Range<rlim_t>(0, 13));

// --- gatherers that fail -----------------------------------------------------

class FailingGatherer : public Fault
{
  protected:
    void SetUp() override
    {
        Fault::SetUp();
        start_program({kHolder, "--sleep", "60"}); // so that none is started
        write_file(kPlanFile, kPlan);
    }

    static std::size_t open_sockets()
    {
        const auto open = descriptors();
        return static_cast<std::size_t>(
            std::count_if(open.begin(), open.end(), [](const auto &descriptor) {
                return descriptor.second.starts_with("socket:");
            }));
    }

    static void await_listener()
    {
        EXPECT_TRUE(eventually([] { return !listeners().empty(); }));
        EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    }

    // Connects and leaves with a reset while the host stands still, so that it
    // finds the connection already reset.
    static void connect_and_reset(const OtherHost &host, bool says_goodbye)
    {
        await_listener();
        kill(host.pid(), SIGSTOP);
        EXPECT_TRUE(eventually([&] { return status_field(host.pid(), "State")[0] == 'T'; }));
        {
            const Socket client = connect_to(kTriggerPort);
            if (says_goodbye) {
                shutdown(client.get(), SHUT_WR);
            }
            const linger reset{1, 0};
            setsockopt(client.get(), SOL_SOCKET, SO_LINGER, &reset, sizeof reset);
        }
        kill(host.pid(), SIGCONT);
    }

    // The lines since the last call that stand after the presence check's.
    static Lines trigger_lines()
    {
        const Lines lines = log_lines();
        const auto row = std::find_if(lines.begin(), lines.end(), [](const std::string &line) {
            return line.starts_with("SingleItemExecute| \nrow=");
        });
        EXPECT_NE(row, lines.end());
        return row == lines.end() ? lines : Lines(row + 1, lines.end());
    }
    static Lines trigger()
    {
        run_path("P/G/SensorProbe");
        return trigger_lines();
    }
};

TEST_F(FailingGatherer, ThatResetsItsConnectionIsLoggedAndTheNextIsTriggered)
{
    for (const bool says_goodbye : {false, true}) {
        SCOPED_TRACE(says_goodbye);
        OtherHost host([=] {
            EXPECT_THAT(trigger(),
                        ElementsAre("Sock_Init1| retWri=-1", "Sock_Init1| retWri error",
                                    "Sock_Init1| errno=" +
                                        std::to_string(says_goodbye ? EPIPE : ECONNRESET),
                                    "Sock_Init1| retWri success"));
            EXPECT_EQ(open_sockets(), 1U);
            EXPECT_THAT(listeners(), IsEmpty());
            write_file("/tmp/triggered", "");
            EXPECT_EQ(trigger(), kTriggered);
            EXPECT_EQ(open_sockets(), 2U);
        });
        connect_and_reset(host, says_goodbye);
        EXPECT_TRUE(eventually([] { return unlink("/tmp/triggered") == 0; }));
        await_listener();
        const Socket client = connect_to(kTriggerPort);
        EXPECT_EQ(receive(client).substr(0, 13), "gather again!");
        EXPECT_EQ(host.status(), 0);
    }
}

TEST_F(FailingGatherer, ThatLeavesWithoutReadingIsNotNoticed)
{
    OtherHost host([] {
        EXPECT_EQ(trigger(), kTriggered);
        EXPECT_TRUE(eventually([] { return unlink("/tmp/left") == 0; }));
        EXPECT_EQ(trigger(), kTriggered);
        EXPECT_EQ(open_sockets(), 2U);
    });
    await_listener();
    {
        const Socket client = connect_to(kTriggerPort);
        EXPECT_TRUE(eventually([] { return listeners().empty(); })); // it has been told
    } // unread, so that this resets the connection
    write_file("/tmp/left", "");
    await_listener();
    const Socket client = connect_to(kTriggerPort);
    EXPECT_EQ(receive(client).substr(0, 13), "gather again!");
    EXPECT_EQ(host.status(), 0);
}

TEST_F(FailingGatherer, EndsAHostThatDoesNotIgnoreSigpipe)
{
    OtherHost host([] {
        std::signal(SIGPIPE, SIG_DFL);
        run_path("P/G/SensorProbe");
        ADD_FAILURE() << "the command has returned";
    });
    connect_and_reset(host, true);
    EXPECT_EQ(host.status(), -SIGPIPE) << "the library changes no disposition";
    EXPECT_EQ(log_lines(host.pid()).back(), "SingleItemExecute| \nrow=1");
}

TEST_F(FailingGatherer, ThatNeverConnectsHoldsTheHostUntilItIsEnded)
{
    OtherHost host([] { run_path("P/G/SensorProbe"); });
    await_listener();
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    EXPECT_FALSE(host.has_ended());
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    kill(host.pid(), SIGKILL);
    EXPECT_EQ(host.status(), -SIGKILL);
    EXPECT_THAT(listeners(), IsEmpty());
    EXPECT_EQ(read_file(kPlanFile), kPlan);

    OtherHost next([] { EXPECT_EQ(trigger(), kTriggered); });
    await_listener();
    const Socket client = connect_to(kTriggerPort);
    EXPECT_EQ(receive(client).substr(0, 13), "gather again!");
    EXPECT_EQ(next.status(), 0);
}

TEST_F(FailingGatherer, FindsThePortHeldByAListenerWhoseAcceptHasFailed)
{
    load();
    {
        const Socket next(dup(STDIN_FILENO));
        const Limit limited(RLIMIT_NOFILE, static_cast<rlim_t>(next.get()) + 2);
        run_path("P/G/SensorProbe");
    }
    EXPECT_THAT(trigger_lines(), ElementsAre("Sock_Init1| accept error!", "Sock_Init1| errno=24",
                                             "SingleItemExecute| leave... !"));
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));

    std::thread command([] {
        EXPECT_EQ(trigger(),
                  Lines({"VRSOCK: bind failed(98),Address already in use"}) + kTriggered);
    });
    EXPECT_TRUE(eventually([] { return listeners().size() == 2; }));
    EXPECT_EQ(receive(connect_to(kTriggerPort)), "") << "nobody accepts on the old one";
    Lines found = listeners();
    std::erase(found, "00000000:8888");
    ASSERT_EQ(found.size(), 1U);
    const auto port = static_cast<unsigned short>(std::stoul(found[0].substr(9), nullptr, 16));
    EXPECT_EQ(receive(connect_to(port)), "gather again!");
    command.join();
    EXPECT_THAT(listeners(), ElementsAre("00000000:8888"));
    EXPECT_EQ(open_sockets(), 2U) << "the old listener, the connection";
}

// --- signals -----------------------------------------------------------------

class HostsSignals : public Fault
{
  protected:
    void SetUp() override
    {
        Fault::SetUp();
        store(plan_of({{"G", {{"Note", "--sleep 0.3"}, {"SensorProbe", "--group G"}}}}));
        load();
    }

    // Once the gatherer has gathered; its report is a child of the same name.
    static pid_t gatherer()
    {
        EXPECT_TRUE(
            eventually([] { return read_back().find("result=\"0\"") != std::string::npos; }));
        EXPECT_TRUE(eventually([] { return processes_named(kProbe).size() == 1; }));
        log_lines();
        const auto running = processes_named(kProbe);
        return running.empty() ? -1 : running[0].pid;
    }

    static void run_item()
    {
        const auto start = std::chrono::steady_clock::now();
        run_path("P/G/Note");
        EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(300));
        EXPECT_EQ(log_lines(), lines_of_lookup("Note", "--sleep 0.3", kNotFound) +
                                   Lines{"SingleItemExecute| leave... !"});
        EXPECT_THAT(ran(), ElementsAre("/system/bin/Note|--sleep|0.3"));
    }
    static void run_gatherer()
    {
        run_path("P/G/SensorProbe");
        EXPECT_EQ(log_lines(), lines_of_gatherer("--group G", kNotFound, kTriggered));
    }
    static void stop_gatherer()
    {
        const pid_t pid = gatherer();
        EXPECT_EQ(FPTEST_SuspendItemExecute(), 0);
        EXPECT_THAT(log_lines(),
                    ElementsAre("FPTEST_SuspendItemExecute| enter... !",
                                "FPTEST_SuspendItemExecute| pid = " + std::to_string(pid)));
        EXPECT_TRUE(eventually([] { return processes_named(kProbe).empty(); }));
    }
};

TEST_F(HostsSignals, IgnoredSigchldLeavesNothingToWaitForAndChangesNothingElse)
{
    std::signal(SIGCHLD, SIG_IGN);
    run_item();
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    run_gatherer();
    stop_gatherer();
    EXPECT_TRUE(eventually([] { return waitpid(-1, nullptr, WNOHANG) == -1 && errno == ECHILD; }));
    EXPECT_EQ(std::signal(SIGCHLD, SIG_DFL), SIG_IGN);
}

volatile std::sig_atomic_t interrupts = 0;
volatile std::sig_atomic_t quits = 0;

void count_signal(int signal)
{
    if (signal == SIGINT) {
        interrupts = interrupts + 1;
    } else {
        quits = quits + 1;
    }
}

TEST_F(HostsSignals, ItsHandlersAreItsOwnAgainAfterEveryCall)
{
    std::signal(SIGINT, count_signal);
    std::signal(SIGQUIT, count_signal);
    int calls = 0;
    for (void (*call)() : {run_item, run_gatherer, stop_gatherer}) {
        call();
        ++calls;
        std::raise(SIGINT);
        std::raise(SIGQUIT);
        EXPECT_EQ(interrupts, calls);
        EXPECT_EQ(quits, calls);
    }
    EXPECT_EQ(std::signal(SIGINT, SIG_DFL), count_signal);
    EXPECT_EQ(std::signal(SIGQUIT, SIG_DFL), count_signal);
}

TEST_F(HostsSignals, IgnoredInterruptsStayIgnoredAfterEveryCall)
{
    std::signal(SIGINT, SIG_IGN);
    std::signal(SIGQUIT, SIG_IGN);
    for (void (*call)() : {run_item, run_gatherer, stop_gatherer}) {
        call();
        std::raise(SIGINT);
        std::raise(SIGQUIT);
    }
    EXPECT_EQ(std::signal(SIGINT, SIG_DFL), SIG_IGN);
    EXPECT_EQ(std::signal(SIGQUIT, SIG_DFL), SIG_IGN);
}

} // namespace
