// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "run/item_files.h"

#include "util/write.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fmt/core.h>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace fptest
{
namespace
{

namespace fs = std::filesystem;

constexpr std::size_t kMostNamed = 100;
constexpr std::size_t kMostVisited = 10'000;
constexpr std::size_t kLongestFileName = 100;
constexpr int kMostOfAName = 100'000;

// A name of letters that every file system and shell takes. Several may become the same.
std::string file_name_of(std::string_view name)
{
    constexpr std::string_view kSafe = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz"
                                       "0123456789_.+-";
    std::string safe(name.empty() ? "_" : name.substr(0, kLongestFileName));
    std::ranges::replace_if(
        safe, [&](char c) { return kSafe.find(c) == kSafe.npos; }, '_');
    if (safe.front() == '.' || safe.front() == '-') {
        safe.front() = '_';
    }
    return safe;
}

// Whether what is in it can be seen, as in another user's it may not.
bool may_list(const std::string &directory)
{
    return access(directory.c_str(), R_OK | X_OK) == 0;
}

// Makes a directory of that name, or of that name and a number. Returns the error.
int make_new(const std::string &above, const std::string &name, std::string &made)
{
    std::error_code error;
    fs::create_directories(above, error);
    if (error) {
        return error.value();
    }
    made = above + "/" + name;
    for (int number = 2; mkdir(made.c_str(), 0777) != 0; ++number) {
        if (errno != EEXIST || number > kMostOfAName) {
            made.clear();
            return errno;
        }
        made = fmt::format("{}/{}.{}", above, name, number);
    }
    return 0;
}

} // namespace

std::string files_obstacle(const std::string &directory)
{
    std::error_code error;
    fs::create_directories(directory, error);
    if (error) {
        return failure_of(directory, error.value());
    }
    std::string probe = directory + "/fptest-XXXXXX";
    if (mkdtemp(probe.data()) == nullptr) {
        return failure_of(directory, errno);
    }
    rmdir(probe.c_str());
    return "";
}

ItemFiles::ItemFiles(std::string directory) : top_(std::move(directory))
{
    while (top_.size() > 1 && top_.ends_with('/')) {
        top_.pop_back();
    }
}

ItemFiles::~ItemFiles()
{
    if (!gatherers_.empty()) {
        remove_empty(gatherers_);
    }
}

std::string ItemFiles::make(ItemRun &item, int round, bool gathers)
{
    item.directory = gathers ? gatherers_ : "";
    if (item.directory.empty()) {
        const std::string of_round = round > 0 && !gathers ? fmt::format("round-{}/", round) : "";
        const std::string above = fmt::format("{}/{}{}", top_, of_round, file_name_of(item.group));
        const int error = make_new(above, file_name_of(item.name), item.directory);
        if (error != 0) {
            add_warning(item, "it had no directory for files: " + failure_of(above, error));
            return "";
        }
    }
    if (gathers) {
        gatherers_ = item.directory;
    }
    std::error_code none;
    return fs::absolute(item.directory, none);
}

// Without following links. What is still written to is named as far as it is there.
void ItemFiles::settle(ItemRun &item, bool gathers) const
{
    if (item.directory.empty()) {
        return;
    }
    item.files.clear();
    std::error_code error;
    std::size_t visited = 0;
    bool is_whole = may_list(item.directory);
    fs::recursive_directory_iterator entry(item.directory,
                                           fs::directory_options::skip_permission_denied, error);
    if (error == std::errc::no_such_file_or_directory) {
        add_warning(item, "its directory for files was removed");
        item.directory.clear();
        return;
    }
    for (; !error && entry != fs::end(entry); entry.increment(error)) {
        if (++visited > kMostVisited || item.files.size() == kMostNamed) {
            is_whole = false;
            break;
        }
        std::error_code unknown;
        if (!entry->is_directory(unknown) || entry->is_symlink(unknown)) {
            item.files.push_back(entry->path().string().substr(item.directory.size() + 1));
        } else {
            is_whole = may_list(entry->path()) && is_whole;
        }
    }
    if (error || !is_whole) {
        add_warning(item, "not all of its files are named");
    }
    std::ranges::sort(item.files);
    if (!gathers) {
        remove_empty(item.directory);
    }
    std::error_code unknown;
    if ((visited == 0 && !error && is_whole) || !fs::exists(item.directory, unknown)) {
        item.directory.clear();
    }
}

// And those above it that are empty then.
void ItemFiles::remove_empty(const std::string &directory) const
{
    for (fs::path path = directory; path.string().size() > top_.size() && rmdir(path.c_str()) == 0;
         path = path.parent_path()) {
    }
}

void add_warning(ItemRun &item, const std::string &text)
{
    if (!text.empty()) {
        item.warning += (item.warning.empty() ? "" : "; ") + text;
    }
}

} // namespace fptest
