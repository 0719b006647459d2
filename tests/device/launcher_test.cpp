// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The virtual device from outside: device/run as a person or a test runner
// starts it, and ps on the device. What changes the root that it runs in is
// tried only in a sandbox of its own, which truly refuses namespaces.

#include "../quoted.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <optional>
#include <poll.h>
#include <pty.h>
#include <regex>
#include <sstream>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

namespace
{

using namespace std::chrono_literals;
namespace fs = std::filesystem;

using Words = std::vector<std::string>;

const fs::path tree = QUILLMARK_SOURCE_DIR;
const fs::path build = QUILLMARK_BINARY_DIR;

// ---- processes --------------------------------------------------------------

struct Outcome {
    int status = -1; // as a shell has it: 128 + N for signal N
    std::string out;
    std::string err;
};

struct Surroundings {
    fs::path directory = tree;
    std::map<std::string, std::string> variables{};
    std::string input{};
};

int shell_status(int wait_status)
{
    return WIFEXITED(wait_status) ? WEXITSTATUS(wait_status) : 128 + WTERMSIG(wait_status);
}

[[noreturn]] void become(const Words &words, const Surroundings &surroundings)
{
    std::vector<char *> arguments;
    for (const std::string &word : words) {
        arguments.push_back(const_cast<char *>(word.c_str()));
    }
    arguments.push_back(nullptr);
    unsetenv("container");
    setenv("LC_ALL", "C", 1);
    setenv("QUILLMARK_BUILD", build.c_str(), 1);
    for (const auto &[name, value] : surroundings.variables) {
        setenv(name.c_str(), value.c_str(), 1);
    }
    fs::current_path(surroundings.directory);
    execvp(arguments[0], arguments.data());
    _exit(126);
}

class Pipe
{
  public:
    Pipe()
    {
        if (pipe2(ends_.data(), O_CLOEXEC) != 0) {
            throw std::runtime_error("pipe2");
        }
    }
    Pipe(const Pipe &) = delete;
    Pipe &operator=(const Pipe &) = delete;
    ~Pipe()
    {
        close_end(0);
        close_end(1);
    }
    int reading() const
    {
        return ends_[0];
    }
    int writing() const
    {
        return ends_[1];
    }
    void close_end(std::size_t end)
    {
        if (ends_[end] >= 0) {
            close(ends_[end]);
            ends_[end] = -1;
        }
    }

  private:
    std::array<int, 2> ends_{-1, -1};
};

void read_both(const Pipe &out, const Pipe &err, Outcome &outcome)
{
    std::array<pollfd, 2> ends{{{out.reading(), POLLIN, 0}, {err.reading(), POLLIN, 0}}};
    std::array<std::string *, 2> texts{&outcome.out, &outcome.err};

    while (ends[0].fd >= 0 || ends[1].fd >= 0) {
        poll(ends.data(), ends.size(), -1);
        for (std::size_t i = 0; i < ends.size(); ++i) {
            std::array<char, 4096> buffer{};
            if (ends[i].fd < 0 || ends[i].revents == 0) {
                continue;
            }
            const ssize_t got = read(ends[i].fd, buffer.data(), buffer.size());
            if (got <= 0) {
                ends[i].fd = -1;
            } else {
                texts[i]->append(buffer.data(), static_cast<std::size_t>(got));
            }
        }
    }
}

Outcome run(const Words &words, const Surroundings &surroundings = {})
{
    Pipe in;
    Pipe out;
    Pipe err;
    Outcome outcome;

    const pid_t child = fork();
    if (child == 0) {
        dup2(in.reading(), 0);
        dup2(out.writing(), 1);
        dup2(err.writing(), 2);
        become(words, surroundings);
    }
    in.close_end(0);
    out.close_end(1);
    err.close_end(1);
    const std::string &input = surroundings.input; // less than a pipe holds
    if (!input.empty()) {
        EXPECT_EQ(write(in.writing(), input.data(), input.size()),
                  static_cast<ssize_t>(input.size()));
    }
    in.close_end(1);
    read_both(out, err, outcome);
    int status = 0;
    waitpid(child, &status, 0);
    outcome.status = shell_status(status);
    return outcome;
}

Words operator+(Words left, const Words &right)
{
    left.insert(left.end(), right.begin(), right.end());
    return left;
}

Words split(const std::string &text)
{
    std::istringstream stream(text);
    return {std::istream_iterator<std::string>(stream), {}};
}

const std::string launcher = tree / "device/run";

Outcome on_device(const Words &command, const Words &options = {},
                  const Surroundings &surroundings = {})
{
    return run(Words{launcher} + options + Words{"--"} + command, surroundings);
}

Outcome shell(const std::string &script, const Words &options = {},
              const Surroundings &surroundings = {})
{
    return on_device({"sh", "-c", script}, options, surroundings);
}

// What device/run has against the command line; it starts nothing then.
Outcome refused(const Words &arguments, const Surroundings &surroundings = {})
{
    return run(Words{launcher} + arguments, surroundings);
}

Words lines(const std::string &text)
{
    Words result;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        result.push_back(line);
    }
    return result;
}

std::string last_line(const std::string &text)
{
    const Words all = lines(text);
    return all.empty() ? "" : all.back();
}

// ---- files ------------------------------------------------------------------

class TemporaryDirectory
{
  public:
    explicit TemporaryDirectory(const fs::path &parent = fs::temp_directory_path())
    {
        std::string name = parent / "quillmark-launcher-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error(name);
        }
        path_ = name;
    }
    TemporaryDirectory(const TemporaryDirectory &) = delete;
    TemporaryDirectory &operator=(const TemporaryDirectory &) = delete;
    ~TemporaryDirectory()
    {
        std::error_code ignored;
        fs::remove_all(path_, ignored);
    }
    const fs::path &path() const
    {
        return path_;
    }
    fs::path program(const std::string &name, const std::string &script) const
    {
        std::ofstream(path_ / name) << script;
        fs::permissions(path_ / name, fs::perms::owner_all);
        return path_ / name;
    }

  private:
    fs::path path_;
};

std::string content(const fs::path &path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf(); // a failing read ends it quietly
    return text.str();
}

// ---- what the machine allows ------------------------------------------------

enum class Way { namespaces, in_place, none };

Way way()
{
    static const Outcome asked = on_device({"printenv", "QUILLMARK_DEVICE"});
    return asked.out == "namespace\n"  ? Way::namespaces
           : asked.out == "in-place\n" ? Way::in_place
                                       : Way::none;
}

bool is_ci()
{
    const char *ci = std::getenv("CI");
    return ci != nullptr && std::string(ci) == "true";
}

// Tests of what holds on any device.
class Device : public testing::Test
{
  protected:
    void SetUp() override
    {
        if (way() == Way::none) {
            const std::string why = on_device({"true"}).err;
            if (is_ci()) {
                FAIL() << "the device does not start: " << why;
            }
            GTEST_SKIP() << "the device does not start: " << why;
        }
    }
};

class Ps : public Device
{
};

// Tests of the device that has namespaces of its own.
class NamespaceDevice : public Device
{
  protected:
    void SetUp() override
    {
        Device::SetUp();
        if (way() == Way::in_place) {
            GTEST_SKIP() << "namespaces are refused here, and the device is in place";
        }
    }
};

// ---- the command line -------------------------------------------------------

struct BadLine {
    std::string name;
    Words arguments;
    std::string complaint;
};

void PrintTo(const BadLine &line, std::ostream *stream)
{
    *stream << line.complaint;
}

class BadCommandLine : public testing::TestWithParam<BadLine>
{
};

TEST_P(BadCommandLine, GetsOneLineAndStatus125)
{
    const Outcome outcome = refused(GetParam().arguments);

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, "device/run: " + GetParam().complaint + "\n");
    EXPECT_EQ(outcome.out, "");
}

INSTANTIATE_TEST_SUITE_P(
    Launcher, BadCommandLine,
    testing::Values(
        BadLine{"NoCommand", {}, "no COMMAND given; see device/run --help"},
        BadLine{"NothingBehindTheDashes",
                {"--vendor", "1", "--"},
                "no COMMAND given; see device/run --help"},
        BadLine{"UnknownOption",
                {"--speed", "9", "--", "true"},
                "unknown option '--speed'; see device/run --help"},
        BadLine{
            "DataWithoutArgument", {"--data"}, "--data wants an argument; see device/run --help"},
        BadLine{"BinWithoutArgument", {"--bin"}, "--bin wants an argument; see device/run --help"},
        BadLine{"BuildWithoutArgument",
                {"--build"},
                "--build wants an argument; see device/run --help"},
        BadLine{"VendorWithoutArgument",
                {"--vendor"},
                "--vendor wants an argument; see device/run --help"},
        BadLine{"VendorThatIsNoNumber",
                {"--vendor", "1a", "--", "true"},
                "--vendor wants a whole number, not '1a'"},
        BadLine{
            "EmptyVendor", {"--vendor", "", "--", "true"}, "--vendor wants a whole number, not ''"},
        BadLine{"BinThatIsNoDirectory",
                {"--bin", "/dev/null", "--", "true"},
                "--bin /dev/null: no such directory"},
        BadLine{"BinThatIsTheDevicesOwn",
                {"--bin", "/dev", "--", "true"},
                "--bin /dev: the device has its own directory of that name"},
        BadLine{"DataThatIsNoDirectory",
                {"--data", "/dev/null", "--", "true"},
                "--data /dev/null: cannot be made"},
        BadLine{"BuildWithoutPrograms",
                {"--build", "/usr", "--", "true"},
                "nothing is built in /usr; build first, or name the build with --build DIR"}),
    [](const auto &test) { return test.param.name; });

TEST(Launcher, UsesTheBuildThatTheEnvironmentNames)
{
    const Outcome outcome = refused({"true"}, {.variables = {{"QUILLMARK_BUILD", "/nowhere"}}});

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, "device/run: nothing is built in /nowhere; build first, or name the "
                           "build with --build DIR\n");
}

TEST(Launcher, WithoutABuildNamedUsesTheReleaseBuildOfItsOwnTree)
{
    const TemporaryDirectory other;
    fs::copy(tree / "device", other.path() / "device", fs::copy_options::recursive);

    const Outcome outcome =
        run({other.path() / "device/run", "true"}, {.variables = {{"QUILLMARK_BUILD", ""}}});

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, "device/run: nothing is built in " + other.path().string() +
                               "/build/release; build first, or name the build with --build DIR\n");
}

TEST(Launcher, HelpFitsATerminalAndNamesEveryOption)
{
    const Outcome outcome = refused({"--help"});

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err, "");
    EXPECT_TRUE(std::ranges::all_of(lines(outcome.out), [](auto &l) { return l.size() <= 80; }));
    for (const char *option : {"--data DIR", "--bin DIR", "--vendor N", "--build DIR", "--in-place",
                               "--help", "125", "127"}) {
        EXPECT_NE(outcome.out.find(option), std::string::npos) << option;
    }
}

TEST(Launcher, RefusesToReplaceTheDevicesOwnPrograms)
{
    for (const std::string name : {"ps", "sh", "grep", "toybox"}) {
        const TemporaryDirectory own;
        own.program(name, "");

        const Outcome outcome = refused({"--bin", own.path(), "--", "true"});

        EXPECT_EQ(outcome.status, 125);
        EXPECT_EQ(outcome.err, "device/run: --bin " + own.path().string() + ": " + name +
                                   " is the device's own and cannot be replaced\n");
    }
}

// ---- what COMMAND finds -----------------------------------------------------

TEST_F(Device, PassesTheExitStatusThrough)
{
    EXPECT_EQ(on_device({"true"}).status, 0);
    EXPECT_EQ(on_device({"false"}).status, 1);
    EXPECT_EQ(shell("exit 77").status, 77);
    EXPECT_EQ(shell("kill -TERM $$").status, 143);
}

TEST_F(Device, PassesInputAndOutputsThrough)
{
    const Outcome outcome = shell("cat; echo complaint >&2", {}, {.input = "typed\n"});

    EXPECT_EQ(outcome.out, "typed\n");
    EXPECT_EQ(last_line(outcome.err), "complaint");
}

TEST_F(Device, PassesArgumentsUnchanged)
{
    EXPECT_EQ(on_device({"printf", "[%s]", "a b", "", "$HOME", "--", "*"}).out,
              "[a b][][$HOME][--][*]");
}

TEST_F(Device, SaysThatItHasNoSuchProgram)
{
    for (const std::string name : {"gcc", "/system/bin/NoSuchItem", "./device"}) {
        const Outcome outcome = on_device({name});

        EXPECT_EQ(outcome.status, 127);
        EXPECT_EQ(last_line(outcome.err),
                  "device/run: " + name + ": no such program on the device");
    }
}

TEST_F(Device, SetsThreeVariablesAndLeavesTheOthers)
{
    const Outcome outcome = shell("echo $PATH; echo $TMPDIR; echo $QUILLMARK_DEVICE; echo $COLOUR",
                                  {}, {.variables = {{"COLOUR", "green"}, {"TMPDIR", "/var/tmp"}}});

    EXPECT_EQ(outcome.out, std::string("/system/bin\n/tmp\n") +
                               (way() == Way::namespaces ? "namespace" : "in-place") + "\ngreen\n");
}

TEST_F(Device, BothShellsAreMksh)
{
    for (const std::string path : {"/bin/sh", "/system/bin/sh", "sh"}) {
        EXPECT_EQ(on_device({path, "-c", "echo ${KSH_VERSION%% R*}"}).out, "@(#)MIRBSD KSH\n");
    }
}

// Arguments of this program when it is COMMAND.
constexpr const char *call_the_libc = "--call-the-libc";

int print_the_shell_of_the_libc()
{
    std::array<char, 200> line{};
    FILE *stream = popen("echo popen $0 ${KSH_VERSION%% R*}", "r");
    std::fputs(std::fgets(line.data(), line.size(), stream), stdout);
    pclose(stream);
    std::fflush(stdout);
    return std::system("echo system $0 ${KSH_VERSION%% R*}");
}

TEST_F(Device, TheLibcsSystemAndPopenUseMksh)
{
    EXPECT_EQ(on_device({fs::read_symlink("/proc/self/exe"), call_the_libc}).out,
              "popen sh @(#)MIRBSD KSH\nsystem sh @(#)MIRBSD KSH\n");
}

TEST_F(Device, SystemBinHoldsToolboxToolsAndItems)
{
    const Words found = lines(on_device({"ls", "/system/bin"}).out);

    for (const std::string name :
         {"sh", "ps", "grep", "kill", "sleep", "cat", "SpiCheck", "SpiCheck_ca", "SpiCheck_ca_qsee",
          "DeadPixel", "FingerWait", "BurnIn", "QuietRun", "SensorProbe", "SensorProbe_ca",
          "SensorProbe_ca_qsee"}) {
        EXPECT_EQ(std::ranges::count(found, name), 1) << name;
    }
    EXPECT_EQ(on_device({"readlink", "-f", "/system/bin/grep"}).out,
              on_device({"readlink", "-f", "/system/bin/toybox"}).out);
}

TEST_F(Device, StartsWithAnEmptyWritableDataDirectory)
{
    EXPECT_EQ(shell("ls -A /data/vorlane; echo x >/data/vorlane/x").status, 0);
    EXPECT_EQ(shell("ls -A /data/vorlane").out, "");
}

TEST_F(Device, KeepsDataInTheDirectoryNamed)
{
    const TemporaryDirectory host;
    const fs::path kept = host.path() / "made/on/the/way";

    EXPECT_EQ(shell("echo first >/data/vorlane/file", {"--data", kept}).status, 0);
    EXPECT_EQ(content(kept / "file"), "first\n");
    EXPECT_EQ(on_device({"cat", "/data/vorlane/file"}, {"--data", kept}).out, "first\n");
    EXPECT_EQ(content(kept / "file"), "first\n");
}

TEST_F(Device, TakesDataRelativeToTheCallersDirectory)
{
    const TemporaryDirectory host;

    shell("echo x >/data/vorlane/file", {"--data", "kept"}, {.directory = host.path()});

    EXPECT_EQ(content(host.path() / "kept/file"), "x\n");
}

TEST_F(Device, HasNoParameterFileUnlessAVendorIsNamed)
{
    EXPECT_EQ(shell("ls -A /etc/vorlane/sysparms").out, "");
}

TEST_F(Device, WritesTheVendorSelector)
{
    const std::string file = "/etc/vorlane/sysparms/vr_common_cfg.xml";

    for (const std::string vendor : {"0", "1", "2", "-1", "12345"}) {
        EXPECT_EQ(on_device({"cat", file}, {"--vendor", vendor}).out,
                  "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<device>\n\t<SysParam>\n"
                  "\t\t<Quillmark>\n\t\t\t<vendor>" +
                      vendor + "</vendor>\n\t\t</Quillmark>\n\t</SysParam>\n</device>\n");
    }
}

TEST_F(Device, LetsTheParameterFileChangeWhileItRuns)
{
    EXPECT_EQ(
        shell("cd /etc/vorlane/sysparms && echo x >vr_common_cfg.xml && cat *", {"--vendor", "1"})
            .out,
        "x\n");
}

TEST_F(Device, AddsProgramsOfTheUser)
{
    const TemporaryDirectory own;
    own.program("MyItem", "#!/system/bin/sh\necho mine $0 $*\n");
    fs::create_symlink("MyItem", own.path() / "MyItem_ca");
    std::ofstream(own.path() / "README") << "not a program";

    EXPECT_EQ(
        shell("MyItem 1; MyItem_ca 2; ls /system/bin | grep -c README", {"--bin", own.path()}).out,
        "mine /system/bin/MyItem 1\nmine /system/bin/MyItem_ca 2\n0\n");
    EXPECT_EQ(on_device({"MyItem"}).status, 127);
}

TEST_F(Device, AUsersProgramTakesThePlaceOfASampleItem)
{
    const TemporaryDirectory own;
    own.program("SpiCheck", "#!/system/bin/sh\necho mine\n");

    EXPECT_EQ(on_device({"/system/bin/SpiCheck"}, {"--bin", own.path()}).out, "mine\n");
    EXPECT_EQ(on_device({"SpiCheck", "--help"}).out.substr(0, 6), "Checks");
}

TEST_F(Device, FindsACommandRelativeToTheCallersDirectory)
{
    const TemporaryDirectory host;
    host.program("mine", "#!/system/bin/sh\npwd\n");

    EXPECT_EQ(on_device({"./mine"}, {}, {.directory = host.path()}).out,
              host.path().string() + "\n");
}

TEST_F(Device, ShowsTheCallersDirectoryAlsoUnderTheNameOfALink)
{
    const TemporaryDirectory host;
    fs::create_directory(host.path() / "real");
    std::ofstream(host.path() / "real/file") << "x";
    fs::create_directory_symlink("real", host.path() / "link");
    const fs::path link = host.path() / "link";

    EXPECT_EQ(
        on_device({"cat", link / "file"}, {}, {.directory = link, .variables = {{"PWD", link}}})
            .out,
        "x");
}

TEST_F(Device, WorksFromAnyDirectoryThatIsTheDevicesOwn)
{
    for (const std::string directory : {"/", "/tmp", "/etc", "/dev", "/proc", "/usr/bin"}) {
        EXPECT_EQ(on_device({"true"}, {}, {.directory = directory}).status, 0) << directory;
    }
}

// ---- ps ---------------------------------------------------------------------

const std::string header = "USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME";

// The lines below the header, each in its columns.
std::vector<Words> processes(const Outcome &outcome)
{
    static const std::regex line("([^ ]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9]+) +([0-9a-f]{8}) "
                                 "([0-9a-f]{8}) ([A-Za-z]) (.+)");
    std::vector<Words> result;
    const Words all = lines(outcome.out);

    EXPECT_EQ(all.empty() ? "" : all.front(), header);
    for (std::size_t i = 1; i < all.size(); ++i) {
        std::smatch columns;
        if (std::regex_match(all[i], columns, line)) {
            result.emplace_back(columns.begin() + 1, columns.end());
        } else {
            ADD_FAILURE() << "no process: " << all[i];
        }
    }
    return result;
}

enum Column : std::size_t { user, pid, parent, virtual_size, resident, wchan, pc, state, name };

Words column(const std::vector<Words> &rows, Column wanted)
{
    Words result;
    for (const Words &row : rows) {
        result.push_back(row[wanted]);
    }
    return result;
}

TEST_F(Ps, PrintsTheOldToolboxsColumns)
{
    const auto rows = processes(shell("ps; :"));

    ASSERT_GE(rows.size(), 2U);
    for (const Words &row : rows) {
        EXPECT_EQ(row[user], way() == Way::namespaces ? "root" : row[user]);
    }
    EXPECT_EQ(rows.back()[name], "ps");
    EXPECT_EQ(rows.back()[parent], rows[rows.size() - 2][pid]);
    EXPECT_EQ(rows[rows.size() - 2][name], "sh");
    EXPECT_GT(std::stoi(rows.back()[virtual_size]), std::stoi(rows.back()[resident]));
    EXPECT_GT(std::stoi(rows.back()[resident]), 0);
}

TEST_F(Ps, ListsByProcessId)
{
    const auto ids = column(processes(shell("sleep 9 & sleep 9 & sleep 9 & ps")), pid);

    EXPECT_GE(ids.size(), 5U);
    EXPECT_TRUE(std::ranges::is_sorted(ids, {}, [](auto &id) { return std::stoi(id); }));
}

TEST_F(Ps, SelectsByTheStartOfTheLastPartOfTheProgramsPath)
{
    const std::string two = "sleep 9 & /system/bin/sleep 9 & sleep 0.3; ";

    for (const std::string wanted : {"s", "sle", "sleep"}) {
        auto names = column(processes(shell(two + "ps " + wanted)), name);
        std::erase(names, "sh");
        EXPECT_EQ(names, (Words{"sleep", "/system/bin/sleep"})) << wanted;
    }
    for (const std::string wanted : {"leep", "sleeper", "/system", "Sleep"}) {
        const Outcome outcome = shell(two + "ps " + wanted);
        EXPECT_EQ(outcome.out, header + "\n") << wanted;
        EXPECT_EQ(outcome.status, 0);
    }
}

TEST_F(Ps, WithAnEmptyNameListsEveryProcess)
{
    EXPECT_EQ(column(processes(shell("ps ''; :")), name), column(processes(shell("ps; :")), name));
}

TEST_F(Ps, ShowsTheProgramWithoutItsArguments)
{
    const auto rows =
        processes(shell("sh -c 'sleep 9; : /system/bin/SensorProbe' & sleep 0.3; ps"));

    EXPECT_EQ(std::ranges::count(column(rows, name), "sh"), 2);
}

TEST_F(Ps, ShowsTheKernelsNameOfAZombie)
{
    // a program that never reaps takes the place of the shell that started a child
    const auto rows = processes(shell("(sleep 0 & exec sleep 9) & sleep 0.4; ps sleep"));

    EXPECT_EQ(std::ranges::count_if(
                  rows, [](auto &row) { return row[state] == "Z" && row[name] == "sleep"; }),
              1);
}

TEST_F(Ps, ShowsTheKernelsNameWhereTheProgramsIsEmpty)
{
    const auto rows = processes(shell("(exec -a '' /usr/bin/sleep 9) & sleep 0.3; ps sleep"));

    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0][name], "sleep");
}

TEST_F(Ps, ReadsAKernelsNameThatLooksLikeTheNextFields)
{
    const TemporaryDirectory own;
    fs::copy_file("/usr/bin/sleep", own.path() / "a) Z 7");

    const auto rows = processes(
        shell("(exec -a '' '/system/bin/a) Z 7' 9) & sleep 0.3; ps 'a)'", {"--bin", own.path()}));

    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0][name], "a) Z 7");
    EXPECT_EQ(rows[0][state], "S");
    EXPECT_NE(rows[0][parent], "7");
}

TEST_F(Ps, KeepsAProcessOnOneLine)
{
    const auto rows =
        processes(shell("(exec -a $'two\\nlines' /usr/bin/sleep 9) & sleep 0.3; ps two"));

    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0][name], "two?lines");
}

TEST_F(Ps, AQueryPipedIntoGrepNeverFindsItsOwnGrep)
{
    for (int i = 0; i < 10; ++i) {
        const Outcome outcome = shell("ps | grep /system/bin/SensorProbe");
        EXPECT_EQ(outcome.out, "");
        EXPECT_EQ(outcome.status, 1);
    }
}

TEST_F(Ps, AQueryForTheGathererFindsEveryVariantOfIt)
{
    for (const std::string program : {"SensorProbe", "SensorProbe_ca"}) {
        const Outcome outcome = shell("/system/bin/sh -c '/system/bin/" + program +
                                      " --group g' & sleep 0.4; ps | grep /system/bin/SensorProbe");
        ASSERT_EQ(lines(outcome.out).size(), 1U) << outcome.out;
        EXPECT_TRUE(outcome.out.ends_with(" /system/bin/" + program + "\n")) << outcome.out;
    }
}

TEST_F(Ps, SkipsProcessesThatEndMeanwhile)
{
    // in 300 runs, some meet a process that ends between two looks at it
    const Outcome outcome =
        shell("churn() { while :; do /system/bin/true; done; }; churn & first=$!; churn & "
              "i=0; while [ $((i += 1)) -le 300 ]; do ps >/tmp/list || exit 9; done; "
              "kill $! $first; cat /tmp/list");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_GE(processes(outcome).size(), 5U);
}

TEST_F(Ps, TakesOneNameAndNoOptions)
{
    for (const Words &arguments : {Words{"ps", "-A"}, Words{"ps", "a", "b"}}) {
        const Outcome outcome = on_device(arguments);
        EXPECT_EQ(outcome.status, 1);
        EXPECT_EQ(outcome.out, "");
        EXPECT_EQ(last_line(outcome.err),
                  "ps: it takes no options and one name at most: ps [NAME]");
    }
}

// ---- the sample items -------------------------------------------------------

// A stored plan that every sample item is in, kept on the host.
class SampleItems : public Device
{
  protected:
    void SetUp() override
    {
        Device::SetUp();
        std::ofstream(kept.path() / "src1.xml")
            << "<?xml version=\"1.0\"?>\n<Plan><CmdGroup name=\"sensor\"><Cmd name=\"SpiCheck\"/>"
               "<Cmd name=\"DeadPixel\"/><Cmd name=\"FingerWait\"/><Cmd name=\"BurnIn\"/>"
               "<Cmd name=\"QuietRun\"/><Cmd name=\"SensorProbe\"/></CmdGroup></Plan>\n";
    }
    Outcome on_plan(const std::string &script) const
    {
        return shell(script, {"--data", kept.path()});
    }
    // What the plan says of an item: the attributes behind its name.
    std::string report(const std::string &item) const
    {
        const std::string plan = content(kept.path() / "src1.xml");
        const std::string start = "<Cmd name=\"" + item + "\"";
        const auto begin = plan.find(start);
        const auto end = plan.find("/>", begin);
        if (begin == std::string::npos || end == std::string::npos) {
            return "not in the plan: " + plan;
        }
        std::string attributes = plan.substr(begin + start.size(), end - begin - start.size());
        std::ranges::replace(attributes, '\n', ' ');
        if (attributes.ends_with(' ')) {
            attributes.pop_back();
        }
        return attributes;
    }
    // The progress and the result of every report, in order, from the module's log.
    static Words reports(const Outcome &outcome)
    {
        static const std::regex line("iResult=(-?[0-9]+) - iProgress=([0-9]+) - iDesc=.+");
        Words found;
        for (const std::string &text : lines(outcome.err)) {
            std::smatch values;
            if (std::regex_search(text, values, line)) {
                found.push_back(values[2].str() + ":" + values[1].str());
            }
        }
        return found;
    }
    const TemporaryDirectory kept;
};

TEST_F(SampleItems, SpiCheckReportsTenStepsAndPasses)
{
    const Outcome outcome = on_plan("SpiCheck --group sensor --seconds 0.05");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(reports(outcome), (Words{"10:-2", "20:-2", "30:-2", "40:-2", "50:-2", "60:-2",
                                       "70:-2", "80:-2", "90:-2", "100:0"}));
    EXPECT_EQ(report("SpiCheck"),
              " progress=\"100\" result=\"0\" description=\"chip 0x1a2b answers at 8 MHz\"");
}

TEST_F(SampleItems, DeadPixelFailsWithADescription)
{
    const Outcome outcome = on_plan("DeadPixel --group sensor --seconds 0.05");

    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(reports(outcome), (Words{"0:-2", "100:1"}));
    EXPECT_EQ(report("DeadPixel"),
              " progress=\"100\" result=\"1\" description=\"3 dead pixels, limit 2\"");
}

TEST_F(SampleItems, FingerWaitEndsUnfinished)
{
    const Outcome outcome = on_plan("FingerWait --group sensor --seconds 0.05");

    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(reports(outcome), (Words{"0:-2", "100:-2"}));
    EXPECT_EQ(report("FingerWait"),
              " progress=\"100\" result=\"-2\" description=\"no finger within 0.05 s\"");
}

TEST_F(SampleItems, BurnInReportsNowAndThenAndPassesInTheEnd)
{
    const Outcome outcome = on_plan("BurnIn --group sensor --seconds 0.1");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(reports(outcome).size(), 21U);
    EXPECT_EQ(reports(outcome)[1], "5:-2");
    EXPECT_EQ(report("BurnIn"), " progress=\"100\" result=\"0\" description=\"stable for 0.1 s\"");
}

TEST_F(SampleItems, BurnInIsStillRunningAfterAWhileAndEndsBySigterm)
{
    const Outcome outcome = on_plan("BurnIn --group sensor 2>/dev/null & sleep 1; "
                                    "kill $! && wait $!; echo $?");

    EXPECT_EQ(outcome.out, "143\n");
    EXPECT_EQ(report("BurnIn"), " progress=\"0\" result=\"-2\" description=\"0 s of 60 s\"");
}

TEST_F(SampleItems, QuietRunNeverReports)
{
    const std::string before = content(kept.path() / "src1.xml");

    const Outcome outcome = on_plan("QuietRun --group sensor --seconds 0.05");

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err.find("FPTEST_"), std::string::npos);
    EXPECT_EQ(content(kept.path() / "src1.xml"), before);
}

TEST_F(SampleItems, VendorVariantsReportUnderThePlansName)
{
    on_plan(
        "DeadPixel_ca --group sensor --seconds 0; FingerWait_ca_qsee --group sensor --seconds 0");

    EXPECT_NE(report("DeadPixel"), "");
    EXPECT_NE(report("FingerWait"), "");
}

TEST_F(SampleItems, ReportUnderTheNameGiven)
{
    on_plan("DeadPixel --group sensor --item QuietRun --seconds 0");

    EXPECT_EQ(report("DeadPixel"), "");
    EXPECT_NE(report("QuietRun"), "");
}

TEST_F(SampleItems, DoNotUndoEachOthersReports)
{
    on_plan("SpiCheck --group sensor --seconds 0.3 & sleep 0.1; "
            "DeadPixel --group sensor --seconds 0; wait");

    EXPECT_TRUE(report("SpiCheck").starts_with(" progress=\"100\""));
    EXPECT_TRUE(report("DeadPixel").starts_with(" progress=\"100\""));
}

TEST_F(SampleItems, WaitForWhoeverHasThePlanLocked)
{
    const Outcome outcome =
        on_plan("sh -c 'flock 9; sleep 1; echo unlocked' 9</data/vorlane/src1.xml & sleep 0.5; "
                "DeadPixel --group sensor --seconds 0; echo reported; wait");

    EXPECT_EQ(outcome.out, "unlocked\nreported\n");
}

TEST_F(SampleItems, LeaveAWholePlanWhenStopped)
{
    // thousandths of a second apart, so that some stops fall into a report
    on_plan("for i in 0 1 2 3 4 5 6 7 8 9; do BurnIn --group sensor --seconds 0.01 & "
            "sleep 0.00$i; kill $!; done; sleep 1");

    EXPECT_TRUE(content(kept.path() / "src1.xml").ends_with("</Plan>\n"));
}

TEST_F(SampleItems, SayInOneLineWhatIsWrongWithTheirOptions)
{
    const std::map<std::string, std::string> complaints = {
        {"SpiCheck", "SpiCheck: --group is required; see SpiCheck --help\n"},
        {"BurnIn_ca --group g --seconds -1",
         "BurnIn_ca: --seconds: wants a number from 0 to 86400; see BurnIn_ca --help\n"},
        {"SensorProbe --group g --seconds nan",
         "SensorProbe: --seconds: wants a number from 0 to 86400; see SensorProbe --help\n"},
        {"QuietRun --group g --speed 9",
         "QuietRun: The following arguments were not expected: 9 --speed; see QuietRun --help\n"},
    };
    for (const auto &[command, complaint] : complaints) {
        const Outcome outcome = on_plan(command);
        EXPECT_EQ(outcome.status, 1) << command;
        EXPECT_TRUE(outcome.err.ends_with(complaint)) << outcome.err;
        EXPECT_EQ(outcome.out, "");
    }
}

// Listens once on the module's port and says that.
std::string say(const std::string &text)
{
    return "printf '" + text + "' | timeout 5 netcat -l -p 34952 >/dev/null; ";
}

class Gatherer : public SampleItems
{
  protected:
    // Starts a gatherer, speaks to it, and gives it time to come to a gathering.
    Outcome after(const std::string &saying, const std::string &gathering) const
    {
        return on_plan("/system/bin/SensorProbe --group sensor --seconds 0.02 & " + saying +
                       "for i in 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17 18 19 20; do sleep 0.1; "
                       "grep -q '" +
                       gathering +
                       "' /data/vorlane/src1.xml && break; done; "
                       "ps | grep -c /system/bin/SensorProbe");
    }
    std::string complaint(const Outcome &outcome) const
    {
        std::string found;
        for (const std::string &line : lines(outcome.err)) {
            found += line.starts_with("SensorProbe: ") ? line + "\n" : "";
        }
        return found;
    }
};

TEST_F(Gatherer, GathersEachTimeItIsTold)
{
    const Outcome outcome = after(say("gather again!") + say("gather again!"), "gathering 2");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 2, 64 samples\"");
    EXPECT_TRUE(content(kept.path() / "readings.txt").starts_with("gatherings 2\n"));
}

TEST_F(Gatherer, DoesNothingUntilItIsTold)
{
    const Outcome outcome = after("", "no gathering at all");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(report("SensorProbe"), "");
    EXPECT_FALSE(fs::exists(kept.path() / "readings.txt"));
}

TEST_F(Gatherer, OutlivesATriggerThatIsCutShort)
{
    const Outcome outcome = after(say("gather") + say("gather again!"), "gathering 1");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "SensorProbe: the trigger ended after 6 of 13 bytes\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, OutlivesAWrongTrigger)
{
    const Outcome outcome = after(say("hello") + say("gather again!"), "gathering 1");

    EXPECT_EQ(outcome.out, "1\n");
    EXPECT_EQ(complaint(outcome), "SensorProbe: the trigger is not \"gather again!\"\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, PutsATriggerTogetherThatComesInPieces)
{
    EXPECT_EQ(after("(printf gather; sleep 0.1; printf ' again!') | "
                    "timeout 5 netcat -l -p 34952 >/dev/null; ",
                    "gathering 1")
                  .out,
              "1\n");
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, OfVendorTwoGathersOnceAndEnds)
{
    EXPECT_EQ(on_plan("SensorProbe_ca_qsee --group sensor --seconds 0").status, 0);
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"0\" description=\"gathering 1, 64 samples\"");
}

TEST_F(Gatherer, ReportsThatItCannotWriteItsReadings)
{
    const Outcome outcome = on_plan("mkdir /data/vorlane/readings.txt; "
                                    "SensorProbe_ca_qsee --group sensor --seconds 0");

    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(report("SensorProbe"),
              " progress=\"100\" result=\"1\" "
              "description=\"/data/vorlane/readings.txt cannot be written\"");
}

// ---- namespaces -------------------------------------------------------------

TEST_F(NamespaceDevice, HasNamespacesOfItsOwn)
{
    for (const std::string kind : {"pid", "net", "ipc", "uts", "mnt"}) {
        const std::string link = "/proc/self/ns/" + kind;
        const std::string own = on_device({"readlink", link}).out;
        EXPECT_TRUE(own.starts_with(kind + ":[")) << own;
        EXPECT_NE(own, fs::read_symlink(link).string() + "\n");
    }
    EXPECT_EQ(on_device({"hostname"}).out, "quillmark\n");
}

TEST_F(NamespaceDevice, IsRunByRootWithoutAnyCapability)
{
    EXPECT_EQ(on_device({"id", "-u"}).out, "0\n");
    EXPECT_EQ(on_device({"grep", "CapEff", "/proc/self/status"}).out,
              "CapEff:\t0000000000000000\n");
}

TEST_F(NamespaceDevice, SeesOnlyItsOwnProcesses)
{
    const auto rows = processes(on_device({"ps"}));

    EXPECT_EQ(column(rows, name), (Words{"bwrap", "ps"}));
    EXPECT_EQ(column(rows, pid), (Words{"1", "2"}));
}

TEST_F(NamespaceDevice, ProcessNineIsNobody)
{
    const Outcome outcome = shell("for i in 1 2 3 4 5 6 7 8 9 10 11 12; do /system/bin/true; done; "
                                  "ls -d /proc/9; kill -0 9");

    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_NE(outcome.err.find("kill: 9: No such process"), std::string::npos) << outcome.err;
    // the first process that COMMAND starts is behind it
    EXPECT_GT(std::stoi(shell("sh -c 'echo $$'; :").out), 9);
}

TEST_F(NamespaceDevice, HasTheLoopbackAloneAndItIsUp)
{
    const Words interfaces = lines(on_device({"cat", "/proc/net/dev"}).out);

    ASSERT_EQ(interfaces.size(), 3U); // two are headers
    EXPECT_TRUE(interfaces[2].starts_with("    lo:")) << interfaces[2];
    EXPECT_NE(on_device({"ifconfig", "lo"}).out.find("UP LOOPBACK RUNNING"), std::string::npos);
    EXPECT_EQ(shell("echo over the loopback | timeout 9 netcat -l -p 34952 & sleep 0.5; "
                    "sleep 0.5 | timeout 9 netcat 127.0.0.1 34952")
                  .out,
              "over the loopback\n");
}

TEST_F(NamespaceDevice, ShowsTheHostReadOnly)
{
    const TemporaryDirectory own;
    const TemporaryDirectory cwd;
    own.program("Mine", "");

    for (const fs::path &directory :
         {tree, build, own.path(), cwd.path(), fs::path("/usr"), fs::path("/etc"), fs::path("/"),
          fs::path("/bin"), fs::path("/data"), fs::path("/system/bin")}) {
        const std::string file = directory / "written-by-the-device";
        const Outcome outcome =
            on_device({"touch", file}, {"--bin", own.path()}, {.directory = cwd.path()});
        EXPECT_EQ(outcome.err, "touch: '" + file + "': Read-only file system\n");
        EXPECT_FALSE(fs::exists(file));
    }
}

TEST_F(NamespaceDevice, HasATemporaryDirectoryOfItsOwn)
{
    const TemporaryDirectory host("/tmp");
    const std::string file = host.path().string() + "-of-the-device";

    EXPECT_EQ(on_device({"touch", file}).status, 0);
    EXPECT_FALSE(fs::exists(file));
    EXPECT_EQ(on_device({"ls", host.path()}, {}, {.directory = "/"}).status, 1);
}

TEST_F(NamespaceDevice, HasNothingButTheShellInBin)
{
    EXPECT_EQ(on_device({"ls", "-A", "/bin"}).out, "sh\n");
    EXPECT_EQ(on_device({"ls", "-A", "/"}).out.find("home"), std::string::npos);
}

TEST_F(NamespaceDevice, SaysNothingOfItsOwn)
{
    const Outcome outcome = on_device({"true"});

    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, "");
}

// ---- how it ends ------------------------------------------------------------

// The processes of this machine with that word among their arguments.
std::vector<pid_t> processes_with(const std::string &word)
{
    std::vector<pid_t> found;
    for (const auto &entry : fs::directory_iterator("/proc")) {
        const std::string id = entry.path().filename();
        if (std::ranges::all_of(id, [](unsigned char c) { return std::isdigit(c); }) &&
            ('\0' + content(entry.path() / "cmdline")).find('\0' + word + '\0') !=
                std::string::npos) {
            found.push_back(std::stoi(id));
        }
    }
    return found;
}

bool eventually(const std::function<bool()> &condition)
{
    for (const auto end = std::chrono::steady_clock::now() + 10s;
         std::chrono::steady_clock::now() < end; std::this_thread::sleep_for(5ms)) {
        if (condition()) {
            return true;
        }
    }
    return false;
}

// A length to sleep that nobody else on this machine has.
std::string unique_length()
{
    static int count = 0;
    return "9" + std::to_string(getpid()) + "." + std::to_string(++count);
}

// A device that has a program in front and one in the background.
class RunningDevice
{
  public:
    RunningDevice() : front_(unique_length()), behind_(unique_length())
    {
        pid_ = fork();
        if (pid_ == 0) {
            become({launcher, "sh", "-c", "sleep " + behind_ + " & sleep " + front_}, {});
        }
    }
    RunningDevice(const RunningDevice &) = delete;
    RunningDevice &operator=(const RunningDevice &) = delete;
    ~RunningDevice()
    {
        if (pid_ > 0) {
            end_by(SIGKILL);
        }
    }
    bool has_started() const
    {
        return eventually([this] { return count() == 2; });
    }
    bool is_gone() const
    {
        return eventually([this] { return count() == 0; });
    }
    int end_by(int signal)
    {
        int status = 0;
        kill(pid_, signal);
        waitpid(std::exchange(pid_, -1), &status, 0);
        return shell_status(status);
    }

  private:
    std::size_t count() const
    {
        return processes_with(front_).size() + processes_with(behind_).size();
    }
    std::string front_;
    std::string behind_;
    pid_t pid_ = -1;
};

TEST_F(Device, SigtermEndsItAndEverythingOnIt)
{
    RunningDevice device;
    ASSERT_TRUE(device.has_started());

    EXPECT_EQ(device.end_by(SIGTERM), 143);
    EXPECT_TRUE(device.is_gone());
}

TEST_F(NamespaceDevice, SigkillOfTheLauncherEndsItAndEverythingOnIt)
{
    RunningDevice device;
    ASSERT_TRUE(device.has_started());

    EXPECT_EQ(device.end_by(SIGKILL), 137);
    EXPECT_TRUE(device.is_gone());
}

TEST_F(Device, WhatCommandLeavesRunningEndsWithIt)
{
    const std::string length = unique_length();

    shell("sleep " + length + " >/dev/null 2>&1 &");

    EXPECT_TRUE(eventually([&] { return processes_with(length).empty(); }));
}

// Runs a script on a device at a terminal, and types a key when it says "ready".
Outcome at_a_terminal(const std::string &script, char key)
{
    int terminal = -1;
    Outcome outcome;

    const pid_t child = forkpty(&terminal, nullptr, nullptr, nullptr);
    if (child == 0) {
        become({launcher, "--", "sh", "-c", script}, {});
    }
    bool typed = false;
    for (std::array<char, 4096> buffer{};;) {
        const ssize_t got = read(terminal, buffer.data(), buffer.size());
        if (got <= 0) {
            break;
        }
        outcome.out.append(buffer.data(), static_cast<std::size_t>(got));
        if (!typed && outcome.out.find("ready") != std::string::npos) {
            typed = write(terminal, &key, 1) == 1;
        }
    }
    int status = 0;
    waitpid(child, &status, 0);
    close(terminal);
    outcome.status = shell_status(status);
    return outcome;
}

constexpr char ctrl_c = '\x03';
constexpr char ctrl_backslash = '\x1c';

TEST_F(Device, CtrlCIsCommandsToHandle)
{
    const Outcome outcome = at_a_terminal(
        "trap 'echo handled; exit 7' INT; echo ready; while :; do sleep 0.05; done", ctrl_c);

    EXPECT_NE(outcome.out.find("handled"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.status, 7);
}

TEST_F(Device, CtrlCEndsACommandThatDoesNotHandleIt)
{
    // not said by the shell, which may lose the key on the way to becoming another program
    const std::string sleeper = R"(exec /usr/bin/perl -e '$| = 1; alarm 9; print "ready"; sleep')";

    EXPECT_EQ(at_a_terminal(sleeper, ctrl_c).status, 130);
}

TEST_F(Device, CtrlCDoesNotEndACommandThatIgnoresIt)
{
    const Outcome outcome = at_a_terminal("trap '' INT; echo ready; sleep 0.5; echo done", ctrl_c);

    EXPECT_NE(outcome.out.find("done"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.status, 0);
}

TEST_F(Device, CtrlBackslashIsCommandsToHandle)
{
    EXPECT_EQ(at_a_terminal("trap 'exit 8' QUIT; echo ready; while :; do sleep 0.05; done",
                            ctrl_backslash)
                  .status,
              8);
}

TEST_F(Device, ASignalThatTheCallerIgnoresStaysIgnored)
{
    const Outcome outcome =
        run({"sh", "-c", "trap '' INT; exec \"$0\" sh -c 'kill -INT $$; echo on'", launcher});

    EXPECT_EQ(outcome.out, "on\n");
    EXPECT_EQ(outcome.status, 0);
}

// ---- where namespaces are refused -------------------------------------------

// A machine in a sandbox of its own, with a root of its own to write to. Unless
// told otherwise it refuses further namespaces and shows no sign of a container.
struct Machine {
    bool refuses_namespaces = true;
    bool is_container = false;
    int user = 0;
    std::map<std::string, std::string> sysctls{};
    Words options{}; // bwrap's

    Outcome run(const std::string &script) const;
};

Words libraries()
{
    Words options;
    for (const auto &entry : fs::directory_iterator("/")) {
        const std::string path = entry.path();
        if (!path.starts_with("/lib")) {
            continue;
        }
        options = entry.is_symlink() ? options + Words{"--symlink", fs::read_symlink(path), path}
                                     : options + Words{"--ro-bind", path, path};
    }
    return options;
}

// A machine's own values in the place of the kernel's. What is not among them is
// not there, but for what bwrap itself wants to read.
Words sysctl_options(std::map<std::string, std::string> sysctls, const fs::path &files)
{
    Words options = {"--tmpfs", "/proc/sys"};
    sysctls.insert({{"kernel/overflowuid", "65534"}, {"kernel/overflowgid", "65534"}});
    for (const auto &[key, value] : sysctls) {
        fs::create_directories((files / key).parent_path());
        std::ofstream(files / key) << value << '\n';
        options = options + Words{"--ro-bind", files / key, "/proc/sys/" + key};
    }
    return options;
}

Outcome Machine::run(const std::string &script) const
{
    const TemporaryDirectory files;
    const std::string id = std::to_string(user);
    // A nested /proc can be mounted only where the outer one has nothing on top,
    // as the one of bwrap's own making has.
    Words words =
        refuses_namespaces
            ? split("bwrap --unshare-user --uid " + id + " --gid " + id +
                    " --disable-userns --unshare-pid --proc /proc")
            : split("unshare --user --map-root-user --mount --pid --fork --mount-proc --kill-child "
                    "bwrap --bind /proc /proc");
    words = words +
            split("--die-with-parent --unshare-net --unshare-ipc --unshare-uts "
                  "--unshare-cgroup-try --ro-bind /usr /usr --dev /dev --tmpfs /tmp --dir /run "
                  "--dir /var/lib --dir /etc --ro-bind /etc/passwd /etc/passwd --dir /bin "
                  "--symlink /usr/bin/mksh /bin/mksh --symlink /usr/bin/dash /bin/sh") +
            libraries() + Words{"--ro-bind", tree, tree, "--ro-bind", build, build};
    if (is_container) {
        words = words + split("--symlink /dev/null /.dockerenv");
    }
    if (!sysctls.empty()) {
        words = words + sysctl_options(sysctls, files.path());
    }
    words = words + options + split("--chdir / --setenv PATH /usr/sbin:/usr/bin -- bash -c") +
            Words{script, launcher, launcher};
    return ::run(words);
}

// The script's $1 is device/run.
class Sandbox : public NamespaceDevice
{
};

class Refusal : public Sandbox
{
};

TEST_F(Sandbox, TrulyRefusesNamespaces)
{
    const std::string nested = "bwrap --unshare-user-try --unshare-pid --ro-bind / / true";

    EXPECT_NE(Machine{}.run(nested).status, 0);
    EXPECT_EQ(Machine{.refuses_namespaces = false}.run(nested).status, 0);
}

void expect_refusal(const Machine &machine, const std::string &complaint,
                    const std::string &options = "")
{
    const Outcome outcome = machine.run("\"$1\" " + options + " -- true");

    EXPECT_EQ(outcome.err, "device/run: " + complaint + "\n");
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 125);
}

TEST_F(Refusal, NamesTheNumberOfNamespaces)
{
    for (const int user : {0, 1000}) {
        expect_refusal(
            {.user = user, .sysctls = {{"user/max_user_namespaces", "0"}}},
            "namespaces are refused here; as root: sysctl user.max_user_namespaces=15000");
    }
}

TEST_F(Refusal, NamesTheSwitchForUsersOtherThanRoot)
{
    expect_refusal(
        {.user = 1000, .sysctls = {{"kernel/unprivileged_userns_clone", "0"}}},
        "namespaces are refused here; as root: sysctl kernel.unprivileged_userns_clone=1");
}

TEST_F(Refusal, NamesTheSwitchOfAppArmor)
{
    expect_refusal(
        {.user = 1000, .sysctls = {{"kernel/apparmor_restrict_unprivileged_userns", "1"}}},
        "namespaces are refused here; as root: sysctl "
        "kernel.apparmor_restrict_unprivileged_userns=0");
}

TEST_F(Refusal, GivesBwrapsReasonWhereNoSwitchExplainsIt)
{
    for (const int user : {0, 1000}) {
        const std::string reason =
            Machine{.user = user}.run("bwrap --unshare-user --ro-bind / / true").err;
        ASSERT_TRUE(reason.starts_with("bwrap: ")) << reason;

        expect_refusal({.user = user}, "namespaces are refused here; enable user namespaces (" +
                                           reason.substr(0, reason.size() - 1) + ")");
    }
}

TEST_F(Refusal, DoesNotBlameASwitchThatLeavesRootAlone)
{
    const Outcome outcome = Machine{
        .sysctls = {{"kernel/unprivileged_userns_clone", "0"},
                    {"kernel/apparmor_restrict_unprivileged_userns",
                     "1"}}}.run("\"$1\" -- true");

    EXPECT_TRUE(outcome.err.starts_with(
        "device/run: namespaces are refused here; enable user namespaces (bwrap: "))
        << outcome.err;
}

TEST_F(Refusal, TellsAUserOfAContainerToBeRoot)
{
    expect_refusal({.is_container = true, .user = 1000},
                   "namespaces are refused here; run this as root in this container");
}

TEST_F(Refusal, NamesThePackageOfAMissingTool)
{
    const std::map<std::string, std::string> packages = {
        {"bwrap", "bubblewrap"}, {"mksh", "mksh"}, {"toybox", "toybox"}};

    for (const auto &[tool, package] : packages) {
        const Words hidden = {"--ro-bind", "/dev/null", "/usr/bin/" + tool};
        expect_refusal({.options = hidden}, tool + " is missing; apt-get install " + package);
    }
}

TEST_F(Refusal, DoesNotGoInPlaceOutsideAContainer)
{
    expect_refusal({}, "--in-place would change this machine, which is no container", "--in-place");
}

TEST_F(Refusal, GoesInPlaceOnlyForRoot)
{
    expect_refusal({.is_container = true, .user = 1000}, "--in-place needs root", "--in-place");
}

TEST_F(Refusal, ABoxThatFailsForAnotherReasonIsNoRefusal)
{
    // the container could be the device; but namespaces work, so it is not touched
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "mkdir /tmp/bin; printf '%s\\n' '#!/bin/sh' "
        "'case $* in *--hostname*) echo \"bwrap: no name\" >&2; exit 1;; esac' "
        "'exec /usr/bin/bwrap \"$@\"' >/tmp/bin/bwrap; chmod +x /tmp/bin/bwrap; "
        "PATH=/tmp/bin:$PATH \"$1\" -- true; echo $?; ls /");

    EXPECT_TRUE(outcome.out.starts_with("125\n")) << outcome.out;
    EXPECT_EQ(outcome.out.find("system"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.err, "device/run: bwrap cannot lay out the device: no name\n");
}

// ---- other places for the tree ----------------------------------------------

TEST_F(Sandbox, ATreeMayLieInAnyDirectory)
{
    for (const std::string parent :
         {"/tmp", "/root", "/home/user", "/data", "/data/vorlane", "/mnt", "/opt", "/srv/a/b"}) {
        const std::string place = parent + "/project";
        const Machine machine{.refuses_namespaces = false, .options = {"--ro-bind", tree, place}};

        const Outcome outcome = machine.run(place + "/device/run -- ls " + place + "/device/run");

        EXPECT_EQ(outcome.out, place + "/device/run\n") << outcome.err;
    }
}

// ---- the gatherer's own port ------------------------------------------------

// Every connection is made from the module's port, so that it finds itself.
TEST_F(Sandbox, AGathererConnectedToItselfDoesNotHoldTheModulesPort)
{
    const std::string gatherer = quoted(build / "device/bin/SensorProbe");

    const Outcome outcome = Machine{.refuses_namespaces = false}.run(
        "echo 34952 34953 >/proc/sys/net/ipv4/ip_local_port_range; " + gatherer +
        " --group g & sleep 0.2; printf 'gather again!' | timeout 3 toybox netcat -l -p 34952; "
        "echo $?; kill $!");

    EXPECT_EQ(outcome.out, "0\n") << outcome.err;
}

// ---- in place ---------------------------------------------------------------

class InPlace : public Sandbox
{
  protected:
    const Machine container{.is_container = true};
    const std::string announcement =
        "device/run: in place: this container (/.dockerenv) refuses namespaces\n";
};

TEST_F(InPlace, IsChosenByItselfInAContainerThatRefusesNamespaces)
{
    const Outcome outcome =
        container.run("\"$1\" -- sh -c 'echo $QUILLMARK_DEVICE $PATH $TMPDIR $KSH_VERSION'");

    EXPECT_TRUE(outcome.out.starts_with("in-place /system/bin /tmp @(#)MIRBSD KSH")) << outcome.out;
    EXPECT_EQ(outcome.err, announcement);
    EXPECT_EQ(outcome.status, 0);
}

TEST_F(InPlace, IsNotChosenWhereNamespacesWork)
{
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "\"$1\" -- printenv QUILLMARK_DEVICE");

    EXPECT_EQ(outcome.out, "namespace\n");
    EXPECT_EQ(outcome.err, "");
}

TEST_F(InPlace, CanBeAskedFor)
{
    const Outcome outcome = Machine{.refuses_namespaces = false, .is_container = true}.run(
        "\"$1\" --in-place -- printenv QUILLMARK_DEVICE");

    EXPECT_EQ(outcome.out, "in-place\n");
    EXPECT_EQ(outcome.err, "device/run: in place: asked for, in this container (/.dockerenv)\n");
}

TEST_F(InPlace, NeedsNoBwrapWhenAskedFor)
{
    const Machine without_bwrap{.is_container = true,
                                .options = {"--ro-bind", "/dev/null", "/usr/bin/bwrap"}};

    EXPECT_EQ(without_bwrap.run("\"$1\" --in-place -- true").status, 0);
}

TEST_F(InPlace, KnowsAContainerByOtherMarks)
{
    EXPECT_EQ(Machine{}.run("touch /run/.containerenv; \"$1\" -- true").err,
              "device/run: in place: this container (/run/.containerenv) refuses namespaces\n");
    EXPECT_EQ(Machine{}.run("container=podman \"$1\" -- true").err,
              "device/run: in place: this container (the variable 'container') refuses "
              "namespaces\n");
}

TEST_F(InPlace, LaysOutTheDevice)
{
    const Outcome outcome = container.run(
        "\"$1\" --vendor 2 -- sh -c 'ls -A /data/vorlane; grep -c \"<vendor>2</vendor>\" "
        "/etc/vorlane/sysparms/vr_common_cfg.xml; readlink /bin/sh; cd /system/bin; "
        "ls -d SpiCheck_ca cat ps sh; ps | grep -c \" ps$\"; exit 9'");

    EXPECT_EQ(outcome.out, "1\n/usr/bin/mksh\nSpiCheck_ca\ncat\nps\nsh\n1\n");
    EXPECT_EQ(outcome.status, 9);
}

TEST_F(InPlace, PutsTheContainerBack)
{
    const std::string look = "ls -l /bin /var/lib /system /data /etc/vorlane 2>&1; ls -A /; ";
    const Outcome before = container.run(look);
    const Outcome after = container.run("\"$1\" --vendor 1 -- touch /data/vorlane/x; " + look);
    const auto without_times = [](const std::string &text) {
        return std::regex_replace(text, std::regex("[A-Z][a-z]{2} +[0-9]+ [0-9:]{5}"), "");
    };

    EXPECT_NE(before.out.find("sh -> /usr/bin/dash"), std::string::npos) << before.out;
    EXPECT_EQ(without_times(after.out), without_times(before.out));
}

TEST_F(InPlace, RunsTheModulesShellAsMkshWithItsArgumentsUnchanged)
{
    const Outcome outcome =
        container.run("\"$1\" -- /system/bin/sh -c 'echo $0 ${KSH_VERSION%% R*} \"$@\"' a 'b  c'");

    EXPECT_EQ(outcome.out, "a @(#)MIRBSD KSH b  c\n");
    EXPECT_EQ(container.run("\"$1\" -- /system/bin/sh -c 'echo $0'").out, "sh\n");
}

// Makes the next process of the script number 9, which then sleeps.
const std::string sleep_as_process_9 =
    "until [ ${last:=0} -ge 8 ]; do : & last=$!; wait; done; sleep 99 & [ $! = 9 ] || exit 99; ";

TEST_F(InPlace, RefusesToStopItemsWhileAProcessNineIsAlive)
{
    const Outcome outcome =
        container.run(sleep_as_process_9 + "sleep 98 & \"$1\" -- /system/bin/sh -c \"kill 9 $!\"; "
                                           "echo $?; kill -0 9 $! && echo alive; "
                                           "kill 9 $!");

    EXPECT_EQ(outcome.out, "1\nalive\n");
    std::smatch id;
    EXPECT_TRUE(std::regex_search(
        outcome.err, id,
        std::regex("\ndevice/run: 'kill 9 [0-9]+' is not run: process 9 is alive here and would "
                   "get the signal\n")))
        << outcome.err;
    EXPECT_EQ(lines(outcome.err).size(), 2U) << outcome.err;
}

TEST_F(InPlace, RunsEveryOtherCommandWhileAProcessNineIsAlive)
{
    const Outcome outcome =
        container.run(sleep_as_process_9 + "sleep 98 & \"$1\" -- /system/bin/sh -c \"kill $!; echo "
                                           "killed\"; wait $!; echo $?; kill 9");

    EXPECT_EQ(outcome.out, "killed\n143\n");
}

TEST_F(InPlace, StopsItemsWhileProcessNineIsNobody)
{
    const Outcome outcome =
        container.run("sleep 0.1 & while [ $! -le 9 ]; do : & wait; done; sleep 98 & "
                      "\"$1\" -- /system/bin/sh -c \"kill 9 $!\"; wait $!; echo $?");

    EXPECT_EQ(outcome.out, "143\n");
}

// A shell function that prints the command lines, of all processes, that match.
const std::string running =
    "running() { for p in /proc/[0-9]*; do "
    "echo $(tr '\\0' ' ' 2>/dev/null <$p/cmdline); done | grep -xE \"$1\"; }; ";

TEST_F(InPlace, EndsWhatCommandLeavesRunning)
{
    const Outcome outcome = container.run(
        running + "sleep 77 & \"$1\" -- sh -c 'sleep 78 & /system/bin/sleep 79 & "
                  "(trap \"\" TERM; exec -a deaf /usr/bin/sleep 80) & "
                  "/usr/bin/env -i /system/bin/sleep 81 & sleep 0.5; ps sl; ps deaf'; "
                  "running '(.*sleep|deaf) [0-9]+'; kill %1");

    for (const std::string left : {" sleep\n", " /system/bin/sleep\n", " deaf\n"}) {
        EXPECT_NE(outcome.out.find(left), std::string::npos) << outcome.out;
    }
    EXPECT_TRUE(outcome.out.ends_with(" deaf\nsleep 77\n")) << outcome.out;
}

TEST_F(InPlace, EndsAndPutsBackOnSigterm)
{
    const Outcome outcome = container.run(
        running + "\"$1\" -- sh -c 'sleep 78 & touch /tmp/on; sleep 79' & "
                  "until [ -e /tmp/on ]; do sleep 0.05; done; kill $!; wait $!; echo $?; "
                  "running 'sleep 7.'; readlink /bin/sh; ls -d /system");

    EXPECT_EQ(outcome.out, "143\n/usr/bin/dash\n");
}

TEST_F(InPlace, TheNextRunUndoesWhatAnInterruptedOneLeft)
{
    const Outcome outcome = container.run(
        "\"$1\" -- sh -c 'touch /data/vorlane/left; sleep 78 & sleep 79' & "
        "until [ -e /data/vorlane/left ]; do sleep 0.05; done; "
        "kill -KILL $!; wait $! 2>/dev/null; readlink /bin/sh; "
        "\"$1\" -- sh -c 'ls -A /data/vorlane; ps sleep'; readlink /bin/sh; ls -d /system");

    EXPECT_EQ(outcome.out, "/usr/bin/mksh\n" + header + "\n/usr/bin/dash\n");
}

TEST_F(InPlace, SigkillOfTheLauncherEndsCommand)
{
    const Outcome outcome = container.run(
        running + "\"$1\" -- sleep 79 & until running 'sleep 79'; do sleep 0.05; done; "
                  "kill -KILL $!; wait $! 2>/dev/null; sleep 0.3; running 'sleep 79'");

    EXPECT_EQ(outcome.out, "sleep 79\n");
}

TEST_F(InPlace, OneRunWaitsForAnother)
{
    const Outcome outcome =
        container.run("\"$1\" -- sh -c 'touch /tmp/on; sleep 1; echo first' & "
                      "until [ -e /tmp/on ]; do sleep 0.05; done; \"$1\" -- echo second; wait");

    EXPECT_EQ(outcome.out, "first\nsecond\n");
    EXPECT_EQ(outcome.err,
              announcement + announcement +
                  "device/run: in place: waiting for the run that has this container\n");
}

TEST_F(InPlace, AProgramThatItCannotTellForItsOwnDoesNotHoldTheContainer)
{
    const Outcome outcome = container.run("\"$1\" -- sh -c '/usr/bin/env -i /usr/bin/sleep 99 &'; "
                                          "timeout 5 \"$1\" -- echo on");

    EXPECT_EQ(outcome.out, "on\n");
}

TEST_F(InPlace, KeepsDataInTheDirectoryNamed)
{
    const Outcome outcome = container.run(
        "mkdir /tmp/kept; echo old >/tmp/kept/old; "
        "\"$1\" --data /tmp/kept -- sh -c 'cat /data/vorlane/old; echo new >/data/vorlane/new'; "
        "cat /tmp/kept/*; ls -d /data");

    EXPECT_EQ(outcome.out, "old\nnew\nold\n");
}

TEST_F(InPlace, LeavesAloneWhatTheContainerAlreadyHas)
{
    for (const std::string path : {"/data/vorlane", "/system/bin", "/etc/vorlane"}) {
        const Outcome outcome =
            container.run("mkdir -p " + path + "; touch " + path +
                          "/precious; \"$1\" -- true; echo $?; ls " + path + "; readlink /bin/sh");

        EXPECT_EQ(outcome.out, "125\nprecious\n/usr/bin/dash\n");
        EXPECT_EQ(outcome.err, announcement + "device/run: in place: " + path +
                                   " exists already; move it away first\n");
    }
}

TEST_F(InPlace, SaysThatTheRootCannotBeChanged)
{
    const Machine read_only{.is_container = true, .options = {"--remount-ro", "/"}};

    const Outcome outcome = read_only.run("\"$1\" -- true");

    EXPECT_EQ(outcome.status, 125);
    EXPECT_EQ(outcome.err, announcement + "device/run: in place: mkdir: cannot create directory "
                                          "'/var/lib/quillmark-device': Read-only file system\n");
}

TEST_F(InPlace, CtrlCIsCommandsToHandle)
{
    // a job of its own gets the signal as a terminal would send it
    const Outcome outcome =
        container.run("set -m; \"$1\" -- sh -c 'trap \"echo handled; exit 7\" INT; touch /tmp/on; "
                      "while :; do sleep 0.05; done' & until [ -e /tmp/on ]; do sleep 0.05; done; "
                      "kill -INT -- -$!; wait $!; echo $?; readlink /bin/sh");

    EXPECT_EQ(outcome.out, "handled\n7\n/usr/bin/dash\n");
}

} // namespace

int main(int argc, char **argv)
{
    if (argc > 1 && std::string(argv[1]) == call_the_libc) {
        return print_the_shell_of_the_libc();
    }
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
