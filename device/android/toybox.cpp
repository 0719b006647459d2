// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "android/ps.h"
#include "common/descriptor.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <sstream>
#include <string_view>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace
{

struct Column {
    const char *title;
    int width;
    bool is_number; // at the right, and never cut
};
using Columns = std::array<Column, 9>;
using Values = std::array<std::string, 9>;

Columns toybox_columns(int release)
{
    const std::string highest = read_text("/proc/sys/kernel/pid_max"); // and a line feed
    const int of_pid = release == 9 || highest.empty() ? 5 : static_cast<int>(highest.size()) - 1;
    return {{{"USER", 12, false},
             {"PID", of_pid, true},
             {"PPID", of_pid, true},
             {"VSZ", release == 9 ? 7 : 10, true},
             {"RSS", 6, true},
             {"WCHAN", 10, false},
             {"ADDR", 10, true},
             {"S", 1, false},
             {"NAME", 27, false}}};
}

std::string printable(std::string text)
{
    std::ranges::replace_if(
        text, [](unsigned char c) { return c < ' '; }, '?');
    return text;
}

// The last part of the first argument; the kernel's name in brackets where that is empty.
std::string toybox_name(const Process &process)
{
    std::string line = process.arguments;
    while (!line.empty() && (line.back() == '\0' || std::isspace(line.back()) != 0)) {
        line.pop_back();
    }
    std::string first = line.substr(0, line.find('\0', 1)); // an empty one goes with the next
    std::ranges::replace(first, '\0', ' ');
    const std::string name = printable(first.substr(first.rfind('/') + 1));
    return name.empty() ? '[' + printable(process.kernel_name) + ']' : name;
}

Values toybox_values(const Process &process)
{
    std::ostringstream address;
    address << std::hex << process.number(30);
    return {user_name(process.owner),
            std::to_string(process.pid),
            std::to_string(process.number(4)),
            std::to_string(process.number(23) / 1024),
            std::to_string(process.number(24) * 4),
            printable(process.content_of("wchan")),
            address.str(),
            process.fields.front(),
            toybox_name(process)};
}

// A line of at most room characters. What is too long for its column takes the room of
// the columns after it, as far as they have some; or it is cut, and ends with a '+'.
std::string toybox_line(const Columns &columns, const Values &values, int room, bool is_wide)
{
    std::string line;
    int taken = 0;

    for (std::size_t i = 0; i < columns.size() && room > 1; i++) {
        const auto &[title, wanted, is_number] = columns.at(i);
        const bool is_last = i + 1 == columns.size();
        const int length = static_cast<int>(values.at(i).size());
        int width = wanted;

        if (i > 0) {
            line += ' ';
            room--;
        }
        if (length > width && (is_number || is_wide)) {
            taken += length - width;
            width = length;
        } else if (length < width) {
            const int given_back = std::min(width - length, taken);
            width -= given_back;
            taken -= given_back;
        }
        width = std::min(width, room);
        const int end = is_last ? room : width;
        const bool is_cut = length > end && end > 1 && !is_number;
        const int shown = std::min(length, is_cut ? end - 1 : end);
        const std::string text = values.at(i).substr(is_number ? length - shown : 0, shown);
        const std::string blanks(is_last || is_cut ? 0 : width - shown, ' ');

        line += is_number ? blanks + text : text + blanks;
        line += is_cut ? "+" : "";
        room -= static_cast<int>(blanks.size()) + shown + (is_cut ? 1 : 0);
    }
    return line;
}

// The device number of the caller's terminal; 0 if there is none. Where neither input
// nor outputs are on it, that of /dev/tty, which is no process's: none is listed.
dev_t terminal()
{
    struct stat status = {};
    for (const int fd : {1, 2, 0}) {
        if (isatty(fd) != 0) {
            return fstat(fd, &status) == 0 ? status.st_rdev : 0;
        }
    }
    const Descriptor tty(open("/dev/tty", O_RDWR | O_CLOEXEC));
    return tty.is_open() && fstat(tty.get(), &status) == 0 ? status.st_rdev : 0;
}

// 0 where lines are not cut.
int terminal_width()
{
    winsize size = {};
    if (isatty(1) == 0) {
        return 0;
    }
    for (const int fd : {0, 1, 2}) {
        if (ioctl(fd, TIOCGWINSZ, &size) == 0) {
            break;
        }
    }
    const char *columns = std::getenv("COLUMNS");
    const int width = columns != nullptr ? std::atoi(columns) : size.ws_col;
    return width == 0 && size.ws_row != 0 ? 80 : width;
}

struct ToyboxOptions {
    bool shows_all = false;
    bool is_wide = false;
    std::vector<std::string> lists; // of -p
    std::vector<int> pids;
};

// Whether the text is a process id, which is then wanted.
bool add_pid(std::string_view text, ToyboxOptions &options)
{
    const char *end = text.data() + text.size();
    int pid = 0;
    const auto result = std::from_chars(text.data(), end, pid);
    options.pids.push_back(pid);
    return result.ec == std::errc() && result.ptr == end && pid > 0;
}

// Adds what a list names. Where its first bad part is; its end if there is none.
std::size_t add_list(std::string_view list, ToyboxOptions &options)
{
    std::size_t at = 0;
    while (at < list.size()) {
        const std::size_t end = std::min(list.find(',', at), list.size());
        if (!add_pid(list.substr(at, end - at), options)) {
            return at;
        }
        at = end + 1;
    }
    return list.size();
}

// What stands in the words from the letter on that getopt has refused.
std::string from_refused_letter(std::span<char *const> words)
{
    const char letter = static_cast<char>(optopt);
    const char *word = static_cast<std::size_t>(optind) < words.size() ? words[optind] : "";
    const char *rest = *word == '-' ? std::strchr(word + 1, letter) : nullptr;
    return rest != nullptr ? rest : std::string(1, letter); // of a word that goes on, or ends
}

// These three return false where something has been said against the words.

bool refuse_letter(int release, std::span<char *const> words)
{
    const std::string rest = from_refused_letter(words);
    if (std::strchr("-adfgGklMnoOPstTuUZ", rest[0]) != nullptr) {
        not_imitated(rest[0] == '-' ? words[optind] : "-" + rest.substr(0, 1), release,
                     "-A, -e, -p, -w");
    } else {
        const std::string quote = release == 9 ? "" : "'";
        fail("Unknown option " + quote + rest + quote + " (see \"ps --help\")");
    }
    return false;
}

bool read_letters(int release, std::span<char *const> words, ToyboxOptions &options)
{
    opterr = 0;
    const int count = static_cast<int>(words.size());
    for (int letter = 0; (letter = getopt(count, words.data(), ":Aewp:")) != -1;) {
        switch (letter) {
        case 'w':
            options.is_wide = true;
            break;
        case 'p':
            options.lists.emplace_back(optarg);
            break;
        case '?':
            return refuse_letter(release, words);
        case ':':
            fail("Missing argument to -p (see \"ps --help\")");
            return false;
        default:
            options.shows_all = true;
        }
    }
    return true;
}

bool read_pids(int release, std::span<char *const> words, ToyboxOptions &options)
{
    for (const std::string &list : options.lists) {
        const std::size_t at = add_list(list, options);
        if (at < list.size()) {
            const std::string start = "bad -p '";
            fail(start + list + "'\n" + std::string(std::strlen("ps: ") + start.size() + at, ' ') +
                 '^');
            return false;
        }
    }
    for (const char *word : words) {
        if (!add_pid(word, options)) {
            fail((release == 9 ? "" : "bad ") + std::string(word));
            return false;
        }
    }
    return true;
}

std::string toybox_header(const Columns &columns)
{
    std::string header;
    for (const auto &[title, wanted, is_number] : columns) {
        const std::string blanks(wanted - std::string_view(title).size(), ' ');
        header += header.empty() ? "" : " ";
        header += is_number ? blanks + title : title + blanks;
    }
    return header;
}

} // namespace

int run_toybox(int release, std::span<char *const> arguments)
{
    ToyboxOptions options;
    if (!read_letters(release, arguments, options) ||
        !read_pids(release, arguments.subspan(optind), options)) {
        return 1;
    }
    const int width = terminal_width();
    const bool is_wide = options.is_wide || width == 0;
    const int room = is_wide ? 99999 : width;
    const Columns columns = toybox_columns(release);
    std::puts(toybox_header(columns).substr(0, room).c_str());

    const auto own_terminal = static_cast<long long>(terminal());
    bool is_found = false;
    for (const Process &process : look_at_all()) {
        if (options.pids.empty() ? options.shows_all || process.number(7) == own_terminal
                                 : std::ranges::count(options.pids, process.pid) > 0) {
            std::puts(toybox_line(columns, toybox_values(process), room, is_wide).c_str());
            is_found = true;
        }
    }
    return is_found || release == 9 ? 0 : 1;
}
