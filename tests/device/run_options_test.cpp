// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What goes onto the device and what comes from it: --bin, --data, --out.
#include "launcher_runner.h"

#include <fstream>

using namespace launcher;

namespace
{

// ---- directories that the device may write to ---------------------------------

TEST(WritableDirectory, IsNoneOfTheSystems)
{
    for (const std::string option : {"--data", "--out"}) {
        for (const std::string directory :
             {"/", "//", "/usr", "/usr/../usr/local/x", "/etc/vorlane", "/bin", "/lib", "/dev",
              "/home", "/tmp", "/var", "/var/lib", "/proc/self", "/opt"}) {
            const Outcome outcome = refused({option, directory, "--", "true"});

            EXPECT_EQ(outcome.status, 125);
            EXPECT_EQ(outcome.err, "device/run: " + option + " " + directory +
                                       ": a directory of the system; name one of your own\n");
        }
    }
}

TEST(WritableDirectory, IsNotMadeInADirectoryOfTheSystem)
{
    const fs::path directory = "/usr/quillmark-must-not-make-this";

    EXPECT_EQ(refused({"--data", directory, "--", "true"}).status, 125);
    EXPECT_FALSE(fs::exists(directory));
}

TEST(WritableDirectory, IsNotMadeWhereTheDeviceHasItsOwn)
{
    const fs::path directory = "/system/quillmark-must-not-make-this";

    for (const std::string option : {"--data", "--out"}) {
        EXPECT_EQ(refused({option, directory, "--", "true"}).err,
                  "device/run: " + option + " " + directory.string() +
                      ": the device has its own directory of that name\n");
        EXPECT_FALSE(fs::exists(directory));
    }
}

TEST(WritableDirectory, IsJudgedByWhereALinkLeads)
{
    const TemporaryDirectory host;
    fs::create_directory_symlink("/", host.path() / "link");

    EXPECT_EQ(refused({"--out", host.path() / "link", "--", "true"}).err,
              "device/run: --out " + (host.path() / "link").string() +
                  ": a directory of the system; name one of your own\n");
}

// ---- --out --------------------------------------------------------------------

class Out : public Device
{
  protected:
    void SetUp() override
    {
        Device::SetUp();
        fs::create_directory(caller.path() / "plans");
        fs::copy_file(tree / "plans/demo.xml", caller.path() / "plans/demo.xml");
    }
    Outcome from_caller(const Words &command, const Words &options) const
    {
        return on_device(command, options, {.directory = caller.path()});
    }

    const TemporaryDirectory caller;
};

TEST_F(Out, IsMadeAndIsTheWorkingDirectoryThatStays)
{
    const fs::path results = caller.path() / "made/results";

    const Outcome outcome =
        from_caller({"sh", "-c", "pwd; echo text >file"}, {"--out", "made/results"});

    EXPECT_EQ(outcome.out, results.string() + "\n");
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(read_file(results / "file"), "text\n");
}

TEST_F(Out, MayBeTheCallersDirectory)
{
    EXPECT_EQ(from_caller({"sh", "-c", "cat plans/demo.xml >copy"}, {"--out", "."}).status, 0);
    EXPECT_EQ(read_file(caller.path() / "copy"), read_file(tree / "plans/demo.xml"));
}

TEST_F(Out, IsWrittenThroughALink)
{
    fs::create_directory(caller.path() / "real");
    fs::create_directory_symlink("real", caller.path() / "link");

    EXPECT_EQ(from_caller({"touch", "file"}, {"--out", "link"}).status, 0);
    EXPECT_TRUE(fs::exists(caller.path() / "real/file"));
}

TEST_F(Out, KeepsTheReportsOfAPlanInTheCallersDirectory)
{
    for (const std::string results : {"results", "."}) {
        const Outcome outcome =
            from_caller({"fptest", "run", "--plan", "plans/demo.xml", "--timeout", "30", "--junit",
                         "results.xml", "--json", "results.jsonl", "demo/Bringup/SpiCheck"},
                        {"--out", results});

        EXPECT_EQ(outcome.status, 0) << outcome.err;
        EXPECT_EQ(outcome.err.find("fptest: "), std::string::npos) << outcome.err;
        EXPECT_NE(read_file(caller.path() / results / "results.xml").find("SpiCheck"),
                  std::string::npos);
        EXPECT_NE(read_file(caller.path() / results / "results.jsonl").find("SpiCheck"),
                  std::string::npos);
    }
}

TEST_F(Out, LetsFptestCheckAndShowPlansOfTheCallersDirectory)
{
    for (const std::string command : {"check", "show"}) {
        const Outcome outcome =
            from_caller({"fptest", command, "plans/demo.xml"}, {"--out", "results"});
        EXPECT_EQ(outcome.status, 0) << outcome.err;
    }
}

TEST(WritableDirectory, IsNoneOfADirectoryThatIsGone)
{
    const Outcome outcome =
        run({"sh", "-c", "mkdir gone && cd gone && rmdir ../gone && exec \"$0\" --out x -- true",
             device_run},
            {.directory = TemporaryDirectory().path()});

    EXPECT_EQ(outcome.status, 125);
    Words said = lines_of(outcome.err);
    std::erase_if(said, [](auto &line) { return line.starts_with("shell-init: "); }); // bash's
    EXPECT_EQ(said, Words{"device/run: the current directory is gone"});
}

TEST_F(Out, TakesAFileOfItsOwnBeforeOneOfTheCallers)
{
    fs::create_directories(caller.path() / "results/plans");
    std::ofstream(caller.path() / "results/plans/demo.xml") << "no plan";

    EXPECT_EQ(from_caller({"fptest", "check", "plans/demo.xml"}, {"--out", "results"}).status, 1);
}

TEST_F(Out, LeavesACommandOfTheCallersDirectoryToBeFound)
{
    caller.program("mine", "#!/system/bin/sh\npwd\n");

    EXPECT_EQ(from_caller({"./mine"}, {"--out", "results"}).out,
              (caller.path() / "results").string() + "\n");
}

// ---- where reports go without it ------------------------------------------------

class Reports : public Out
{
  protected:
    Outcome run_with(const Words &reports, const Words &options = {}) const
    {
        return from_caller(Words{"fptest", "run", "--plan", "plans/demo.xml"} + reports +
                               Words{"demo/Bringup/SpiCheck"},
                           options);
    }
};

TEST_F(Reports, CannotBeWrittenIntoAHostsDirectoryAndTheLineSaysWhatToDo)
{
    if (way() == Way::in_place) {
        GTEST_SKIP() << "in place, the container's directories are as they were";
    }
    for (const std::string option : {"--junit", "--json", "--log"}) {
        const Outcome outcome = run_with({option, "results"});

        EXPECT_EQ(outcome.status, 3);
        EXPECT_EQ(outcome.out, "");
        EXPECT_EQ(outcome.err,
                  "fptest: " + option +
                      " results: the host's directories are read-only on the virtual device: "
                      "device/run --out DIR gives a working directory that can be written\n");
    }
}

TEST_F(Reports, OnTheDevicesOwnDisksAreSaidToGoWithIt)
{
    const std::string line = " with the virtual device when it ends; device/run --out DIR "
                             "gives a working directory that stays";

    const Outcome outcome = run_with({"--junit", "/data/vorlane/r.xml"});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(last_line(outcome.err), "fptest: --junit /data/vorlane/r.xml goes" + line);

    if (way() == Way::namespaces) {
        EXPECT_EQ(run_with({"--junit", "/tmp/r.xml", "--json", "/tmp/j"}).err,
                  "fptest: --json /tmp/j and --junit /tmp/r.xml go" + line + "\n");
    }
}

TEST_F(Reports, ThatStayAreSaidNothingOf)
{
    const Outcome kept = run_with({"--junit", "/data/vorlane/r.xml", "--log", "/dev/null"},
                                  {"--data", caller.path() / "data"});
    EXPECT_EQ(kept.status, 0);
    EXPECT_EQ(kept.err.find("fptest: "), std::string::npos) << kept.err;
    EXPECT_TRUE(fs::exists(caller.path() / "data/r.xml"));
}

// ---- --bin ----------------------------------------------------------------------

TEST(UsersPrograms, ThatCannotBeOnTheDeviceAreRefusedByOneLineEach)
{
    const TemporaryDirectory own;
    fs::create_symlink("gone/MyItem", own.path() / "MyItem");
    fs::create_symlink("gone/Other", own.path() / "Other");
    own.program("ps", "");

    const Outcome outcome = refused({"--bin", own.path(), "--", "true"});

    EXPECT_EQ(outcome.status, 125);
    const std::string start = "device/run: --bin " + own.path().string() + ": ";
    EXPECT_EQ(outcome.err, start + "MyItem is a link that leads nowhere: to gone/MyItem\n" + start +
                               "Other is a link that leads nowhere: to gone/Other\n" + start +
                               "ps is the device's own and cannot be replaced\n");
}

class UsersProgram : public Device
{
};

TEST_F(UsersProgram, ThatIsNotExecutableIsNamedAndLeftOut)
{
    const TemporaryDirectory own;
    own.program("MyItem", "#!/system/bin/sh\necho mine\n");
    std::ofstream(own.path() / "Other") << "#!/system/bin/sh\n";
    std::ofstream(own.path() / "README") << "not a program";
    fs::create_directory(own.path() / "sources");

    const Outcome outcome = on_device({"MyItem"}, {"--bin", own.path()});

    EXPECT_EQ(outcome.out, "mine\n");
    const std::string line = "device/run: --bin " + own.path().string() +
                             ": not executable, and left out: Other, README\n";
    EXPECT_TRUE(outcome.err.starts_with(line)) << outcome.err;
}

TEST_F(UsersProgram, MayBeALinkToOneOutsideOfTheDirectory)
{
    const TemporaryDirectory elsewhere;
    const TemporaryDirectory own;
    elsewhere.program("built", "#!/system/bin/sh\necho ${0##*/}\n");
    fs::create_symlink(elsewhere.path() / "built", own.path() / "MyItem");
    fs::create_symlink("MyItem", own.path() / "MyItem_ca");

    for (const std::string name : {"MyItem", "MyItem_ca"}) {
        EXPECT_EQ(on_device({name}, {"--bin", own.path()}).out, name + "\n");
    }
}

TEST_F(UsersProgram, WhoseInterpreterIsMissingIsNamed)
{
    const TemporaryDirectory own;
    own.program("A", "#!/nowhere/python3\n");
    own.program("B", "#! /usr/bin/env nowhere -x\n");
    own.program("C", "#!/system/bin/sh\r\n");
    own.program("D", "#!/system/bin/sh -e\necho mine\n");
    own.program("E", "#!/usr/bin/env -S sh\n");
    own.program("F", "no script\n");

    const Outcome outcome = on_device({"D"}, {"--bin", own.path()});

    EXPECT_EQ(outcome.out, "mine\n");
    EXPECT_EQ(outcome.status, 0);
    Words said = lines_of(outcome.err);
    std::erase_if(said, [](auto &line) { return line.starts_with("device/run: in place: "); });
    const auto missing = [](const std::string &name, const std::string &interpreter) {
        return "device/run: --bin: " + name + " cannot be started: there is no " + interpreter +
               " on the device";
    };
    EXPECT_EQ(said, (Words{missing("A", "/nowhere/python3"), missing("B", "nowhere"),
                           missing("C", "/system/bin/sh\\r")}));
}

TEST_F(UsersProgram, WhoseInterpreterIsMissingIsNoCommand)
{
    const TemporaryDirectory own;
    own.program("unix", "#!/nowhere/bash\n");
    own.program("dos", "#!/system/bin/sh\r\n");
    const std::map<std::string, std::string> missing = {{"unix", "/nowhere/bash"},
                                                        {"dos", "/system/bin/sh\\r"}};
    for (const auto &[name, interpreter] : missing) {
        for (const bool is_given_as_a_path : {true, false}) {
            const Outcome outcome = is_given_as_a_path
                                        ? on_device({"./" + name}, {}, {.directory = own.path()})
                                        : on_device({name}, {"--bin", own.path()});

            EXPECT_EQ(outcome.status, 127);
            EXPECT_EQ(lines_of(outcome.err).back(),
                      "device/run: " + (is_given_as_a_path ? "./" + name : name) +
                          " cannot be started: there is no " + interpreter + " on the device");
        }
    }
}

TEST_F(UsersProgram, NeedNotBeThere)
{
    const TemporaryDirectory own;
    const Outcome outcome = on_device({"true"}, {"--bin", own.path()});

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err.find("--bin"), std::string::npos) << outcome.err;
}

// ---- what the device does not show ------------------------------------------------

class HostsTmp : public NamespaceDevice
{
};

TEST_F(HostsTmp, IsNotTheDevicesAsIsSaidToWhoWorksThere)
{
    EXPECT_EQ(on_device({"true"}, {}, {.directory = "/tmp"}).err,
              "device/run: the device's /tmp is its own: the files here are not on it; run this "
              "from a directory below /tmp, or from elsewhere\n");
}

TEST_F(HostsTmp, HidesFilesAsIsSaidToWhoNamesThem)
{
    const TemporaryDirectory own("/tmp");
    const TemporaryDirectory other("/tmp");
    for (const auto &directory : {own.path(), other.path()}) {
        const std::ofstream file(directory / "plan.xml");
    }
    const auto err = [&](const std::string &word, const fs::path &directory) {
        return on_device({"true", word}, {}, {.directory = directory}).err;
    };
    const auto hidden = [](const std::string &word) {
        return "device/run: the device's /tmp is its own: " + word +
               " is not on it; run this from its directory, or keep it elsewhere\n";
    };
    const std::string plan = own.path() / "plan.xml";

    EXPECT_EQ(err(plan.substr(1), "/"), hidden(plan.substr(1)));
    EXPECT_EQ(err("--plan=" + plan, tree), hidden(plan));
    EXPECT_EQ(err("../" + other.path().filename().string() + "/plan.xml", own.path()),
              hidden("../" + other.path().filename().string() + "/plan.xml"));
    EXPECT_EQ(err(plan, own.path()), "");
    EXPECT_EQ(err("./plan.xml", own.path()), "");
    EXPECT_EQ(err("/tmp/no-such-file", tree), "");
}

// ---- values ---------------------------------------------------------------------

class Values : public Device
{
};

TEST_F(Values, MayFollowAnEqualsSign)
{
    const TemporaryDirectory host;
    fs::create_directory(host.path() / "own");
    std::ofstream(host.path() / "own/MyItem") << "#!/system/bin/sh\necho x >file\n"
                                                 "cp /etc/vorlane/sysparms/* /data/vorlane\n";
    fs::permissions(host.path() / "own/MyItem", fs::perms::owner_all);
    const std::string root = host.path();

    const Outcome outcome =
        run({device_run, "--bin=" + root + "/own", "--data=" + root + "/data",
             "--out=" + root + "/out", "--vendor=2", "--build=" + build.string(), "MyItem"});

    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(read_file(host.path() / "out/file"), "x\n");
    EXPECT_NE(read_file(host.path() / "data/vr_common_cfg.xml").find("<vendor>2<"),
              std::string::npos);
}

} // namespace
