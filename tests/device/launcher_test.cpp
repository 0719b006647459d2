// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The virtual device from outside: device/run's command line, and what COMMAND finds.
#include "launcher_runner.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <string>

using namespace launcher;

namespace
{

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
        BadLine{"NothingAfterTheDashes",
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
        BadLine{"OutWithoutArgument", {"--out"}, "--out wants an argument; see device/run --help"},
        BadLine{"EmptyData",
                {"--data", "", "--", "true"},
                "--data wants a directory, not an empty name: is a shell variable not set?"},
        BadLine{"EmptyOut",
                {"--out=", "--", "true"},
                "--out wants a directory, not an empty name: is a shell variable not set?"},
        BadLine{"EmptyBin",
                {"--bin", "", "--", "true"},
                "--bin wants a directory, not an empty name: is a shell variable not set?"},
        BadLine{"EmptyBuild",
                {"--build", "", "--", "true"},
                "--build wants a directory, not an empty name: is a shell variable not set?"},
        BadLine{"VendorThatIsNoNumberAfterAnEqualsSign",
                {"--vendor=x=1", "--", "true"},
                "--vendor wants a whole number, not 'x=1'"},
        BadLine{"UnknownOptionWithAnEqualsSign",
                {"--speed=9", "--", "true"},
                "unknown option '--speed=9'; see device/run --help"},
        BadLine{"BinThatIsNoDirectory",
                {"--bin", "/dev/null", "--", "true"},
                "--bin /dev/null: no such directory"},
        BadLine{"BinThatIsTheDevicesOwn",
                {"--bin", "/dev", "--", "true"},
                "--bin /dev: the device has its own directory of that name"},
        BadLine{"DataThatIsNoDirectory",
                {"--data", QUILLMARK_SOURCE_DIR "/README.md/data", "--", "true"},
                "--data " QUILLMARK_SOURCE_DIR "/README.md/data: cannot be made"},
        BadLine{"OutThatIsAFile",
                {"--out", QUILLMARK_SOURCE_DIR "/README.md", "--", "true"},
                "--out " QUILLMARK_SOURCE_DIR "/README.md: not a directory"},
        BadLine{"DataThatIsAFile",
                {"--data", QUILLMARK_SOURCE_DIR "/README.md", "--", "true"},
                "--data " QUILLMARK_SOURCE_DIR "/README.md: not a directory"},
        BadLine{"BinTwice",
                {"--bin", "one", "--bin=other", "--", "true"},
                "--bin is given twice, as one and as other; it takes one"},
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
    EXPECT_TRUE(std::ranges::all_of(lines_of(outcome.out), [](auto &l) { return l.size() <= 80; }));
    for (const char *option : {"--data DIR", "--out DIR", "--bin DIR", "--vendor N", "--build DIR",
                               "--in-place", "--help", "125", "127"}) {
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
    EXPECT_EQ(on_device({this_program, call_the_libc}).out,
              "popen sh @(#)MIRBSD KSH\nsystem sh @(#)MIRBSD KSH\n");
}

TEST_F(Device, SystemBinHoldsToolboxToolsAndItems)
{
    const Words found = lines_of(on_device({"ls", "/system/bin"}).out);

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
    EXPECT_EQ(read_file(kept / "file"), "first\n");
    EXPECT_EQ(on_device({"cat", "/data/vorlane/file"}, {"--data", kept}).out, "first\n");
    EXPECT_EQ(read_file(kept / "file"), "first\n");
}

TEST_F(Device, TakesDataRelativeToTheCallersDirectory)
{
    const TemporaryDirectory host;

    shell("echo x >/data/vorlane/file", {"--data", "kept"}, {.directory = host.path()});

    EXPECT_EQ(read_file(host.path() / "kept/file"), "x\n");
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

TEST_F(NamespaceDevice, ProcessNineIsNobody)
{
    const Outcome outcome = shell("for i in 1 2 3 4 5 6 7 8 9 10 11 12; do /system/bin/true; done; "
                                  "ls -d /proc/9; kill -0 9");

    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_NE(outcome.err.find("kill: 9: No such process"), std::string::npos) << outcome.err;
    // the first process that COMMAND starts is after it
    EXPECT_GT(std::stoi(shell("sh -c 'echo $$'; :").out), 9);
}

TEST_F(NamespaceDevice, HasTheLoopbackAloneAndItIsUp)
{
    const Words interfaces = lines_of(on_device({"cat", "/proc/net/dev"}).out);

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

} // namespace

int main(int argc, char **argv)
{
    if (argc > 1 && std::string(argv[1]) == call_the_libc) {
        return print_the_shell_of_the_libc();
    }
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
