// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Whoever builds the libraries from the same sources gets the same bytes.
#include "outside.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <set>
#include <string>

namespace
{

namespace fs = std::filesystem;

// All that may be of use to build the libraries, in another place.
void copy_sources(const fs::path &place)
{
    const std::set<std::string> others = {".git", "build", "fuzz", "tests"};
    fs::create_directories(place);
    for (const auto &entry : fs::directory_iterator(kSource)) {
        if (!others.contains(entry.path().filename())) {
            fs::copy(entry, place / entry.path().filename(), fs::copy_options::recursive);
        }
    }
}

void build(const fs::path &place, const std::string &surroundings, const std::string &options)
{
    copy_sources(place);
    const std::string build = place / "build";
    const Ended built =
        run_shell(surroundings + " && cmake -S " + quoted(place) + " -B " + quoted(build) +
                  " -DQUILLMARK_BUILD_TOOLS=OFF " + options + " && cmake --build " + quoted(build) +
                  " --target quillmark vorlane");
    ASSERT_EQ(built.status, 0) << built.out;
}

class Reproducible : public ::testing::TestWithParam<const char *>
{
};

TEST_P(Reproducible, LibrariesOfTwoFoldersHaveTheSameBytes)
{
    const TemporaryDirectory directory;
    const fs::path one = fs::path(directory.path()) / "a";
    const fs::path other = fs::path(directory.path()) / "another place" / "some levels" / "deeper";
    const std::string type = std::string("-DCMAKE_BUILD_TYPE=") + GetParam();

    build(one, "umask 022 && export TZ=UTC LC_ALL=C", type);
    build(other, "umask 077 && export TZ=Asia/Tokyo LC_ALL=C.UTF-8 && sleep 1", type);

    for (const char *library : {"libquillmark.so", "libvorlane.so"}) {
        const std::string bytes = support::read_file(one / "build" / library);
        EXPECT_GT(bytes.size(), 10'000U) << library;
        EXPECT_TRUE(bytes == support::read_file(other / "build" / library)) << library;
        EXPECT_EQ(bytes.find(directory.path().string()), std::string::npos) << library;
    }
}

INSTANTIATE_TEST_SUITE_P(BuildTypes, Reproducible, ::testing::Values("Release", "MinSizeRel"),
                         [](const auto &type) { return std::string(type.param); });

} // namespace
