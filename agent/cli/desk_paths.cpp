// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/desk_paths.h"

#include "plan/library_rules.h"
#include "util/failure.h"
#include "util/text.h"
#include "util/write.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace fptest
{
namespace
{

namespace fs = std::filesystem;

dev_t disk_of(const fs::path &directory)
{
    struct stat status {
    };
    return stat(directory.c_str(), &status) == 0 ? static_cast<dev_t>(status.st_dev) : dev_t{0};
}

// device/run says which of its own two directories it keeps.
bool is_lost_with_device(const fs::path &directory, const std::string &device)
{
    std::error_code none;
    const std::string place = fs::weakly_canonical(directory, none).string() + "/";
    if (place.starts_with("/data/vorlane/")) {
        return std::getenv("QUILLMARK_DATA") == nullptr;
    }
    return device == "namespace" && disk_of(directory) == disk_of("/tmp");
}

} // namespace

void warn_of_lost_outputs(const std::vector<std::pair<std::string, std::string>> &files)
{
    const char *device = std::getenv("QUILLMARK_DEVICE");
    if (device == nullptr) {
        return;
    }
    std::vector<std::string> lost;
    for (const auto &[option, file] : files) {
        std::error_code none;
        const fs::file_status status = fs::status(file, none);
        const bool is_directory = fs::is_directory(status);
        if (file.empty() || file == "-" ||
            (fs::exists(status) && !is_directory && !fs::is_regular_file(status))) {
            continue;
        }
        const std::string name = option + " " + one_line(file);
        const fs::path parent = fs::path(file).parent_path();
        const fs::path directory = is_directory ? fs::path(file) : parent.empty() ? "." : parent;
        if (access(directory.c_str(), W_OK) != 0 && errno == EROFS) {
            throw Failure(Cause::device,
                          "{}: the host's directories are read-only on the virtual device: "
                          "device/run --out DIR gives a working directory that can be written",
                          name);
        }
        if (is_lost_with_device(directory, device)) {
            lost.push_back(name);
        }
    }
    if (!lost.empty()) {
        say("{} {} lost when the virtual device ends; device/run --out DIR gives a working "
            "directory that stays",
            join_and(lost), lost.size() == 1 ? "is" : "are");
    }
}

std::string found_on_desk(const std::string &file)
{
    const char *caller = std::getenv("QUILLMARK_CALLER");
    std::error_code none;
    if (caller == nullptr || file.empty() || file == "-" || fs::exists(file, none)) {
        return file;
    }
    const fs::path there = fs::path(caller) / file;
    return fs::exists(there, none) ? there.string() : file;
}

std::string name_of_plan(const std::string &file)
{
    return file.empty() ? kStoredPlan : file == "-" ? "<stdin>" : file;
}

} // namespace fptest
