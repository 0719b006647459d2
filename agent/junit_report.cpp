// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reports.h"

#include "descriptor.h"
#include "text.h"
#include "write.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <optional>
#include <string_view>
#include <sys/stat.h>
#include <utility>

namespace fptest
{

namespace
{

// --- XML ---------------------------------------------------------------------

std::string escaped(std::string_view text)
{
    static constexpr Replacement kEscapes[] = {
        {"&", "&amp;"},
        {"<", "&lt;"},
        {">", "&gt;"},
        {"\"", "&quot;"},
        {"\r", "&#13;"},
        // Unicode has them, XML has not
        {"\xEF\xBF\xBE", "\uFFFD"},
        {"\xEF\xBF\xBF", "\uFFFD"},
    };
    return replaced(clean(text), kEscapes);
}

// A reader makes blanks of the tabs and line feeds in attributes.
std::string attribute(const char *name, std::string_view value)
{
    static constexpr Replacement kEscapes[] = {{"\t", "&#9;"}, {"\n", "&#10;"}};
    return std::string(" ") + name + "=\"" + replaced(escaped(value), kEscapes) + "\"";
}

std::string attribute(const char *name, std::size_t value)
{
    return attribute(name, std::to_string(value));
}

std::string time_attribute(double seconds)
{
    const long long milliseconds = std::llround(seconds * 1000);
    std::array<char, 40> text{};
    std::snprintf(text.data(), text.size(), "%lld.%03lld", milliseconds / 1000,
                  milliseconds % 1000);
    return attribute("time", text.data());
}

// In whole seconds and without a zone, as the format has it.
std::string timestamp_attribute(std::chrono::system_clock::time_point time)
{
    return attribute("timestamp", timestamp(time).substr(0, 19));
}

std::string property(const std::string &indent, const char *name,
                     const std::optional<std::string> &value)
{
    return value ? indent + "<property" + attribute("name", name) + attribute("value", *value) +
                       "/>\n"
                 : "";
}

std::string properties(const std::string &indent, const std::string &inside)
{
    return inside.empty() ? "" : indent + "<properties>\n" + inside + indent + "</properties>\n";
}

// --- the document ------------------------------------------------------------

struct Tests {
    std::size_t all = 0;
    std::size_t failures = 0;
    std::size_t errors = 0;
    std::size_t skipped = 0;
};

void add(Tests &tests, const Suite &suite)
{
    for (const ItemRun &item : suite.items) {
        ++tests.all;
        switch (item.outcome) {
        case Outcome::passed:
            break;
        case Outcome::not_run:
            ++tests.skipped;
            break;
        case Outcome::failed:
            ++tests.failures;
            break;
        case Outcome::silent:
        case Outcome::timed_out:
        case Outcome::stopped:
            ++tests.errors;
            break;
        }
    }
}

std::string attributes(const Tests &tests)
{
    return attribute("tests", tests.all) + attribute("failures", tests.failures) +
           attribute("errors", tests.errors) + attribute("skipped", tests.skipped);
}

// Why there is no outcome of an item.
std::string why_not_run(const Run &run, const ItemRun &item, bool ended)
{
    if (!item.reason.empty()) {
        return item.reason;
    }
    if (!ended) {
        return item.start ? "was running when this was written"
                          : "not run yet when this was written";
    }
    return run.why_unfinished.empty() ? "not run" : run.why_unfinished;
}

// What is known of an item that has not passed, for readers that show no
// properties.
std::string details(const Report &report)
{
    std::string text;
    if (report.result) {
        text += "result: " + *report.result + "\n";
    }
    if (report.progress) {
        text += "progress: " + *report.progress + "\n";
    }
    if (report.description) {
        text += "description: " + *report.description + "\n";
    }
    return text;
}

std::string verdict(const Run &run, const ItemRun &item, bool ended)
{
    if (item.outcome == Outcome::passed) {
        return "";
    }
    if (item.outcome == Outcome::not_run) {
        return "      <skipped" + attribute("message", why_not_run(run, item, ended)) + "/>\n";
    }
    const std::string element = item.outcome == Outcome::failed ? "failure" : "error";
    const char *const type = item.outcome == Outcome::failed ? "result" : word(item.outcome);
    return "      <" + element + attribute("type", type) +
           attribute("message", item.reason.empty() ? word(item.outcome) : item.reason) + ">" +
           escaped(details(item.report)) + "</" + element + ">\n";
}

std::string test_case(const Run &run, const ItemRun &item, bool ended)
{
    const std::string indent(8, ' ');
    const Report &report = item.report;
    const std::optional<std::string> result =
        report.result_without_value ? std::optional<std::string>("") : report.result;
    std::string text = "    <testcase" + attribute("classname", item.group) +
                       attribute("name", item.name) + time_attribute(item.seconds.value_or(0)) +
                       ">\n";
    text += properties("      ", property(indent, "progress", report.progress) +
                                     property(indent, "result", result) +
                                     property(indent, "description", report.description));
    text += verdict(run, item, ended);
    if (!item.output.empty()) {
        text += "      <system-out>" + escaped(item.output) + "</system-out>\n";
    }
    return text + "    </testcase>\n";
}

std::string suite_properties(const Run &run, bool ended)
{
    const std::string indent(6, ' ');
    std::string inside = property(indent, "plan", run.plan) +
                         property(indent, "vendor", std::to_string(run.vendor)) +
                         property(indent, "pass_code", std::to_string(run.pass_code)) +
                         property(indent, "finished", run.finished ? "true" : "false");
    if (!run.finished) {
        inside += property(indent, "reason",
                           ended ? run.why_unfinished : "the run went on when this was written");
    }
    return properties("    ", inside);
}

std::string test_suite(const Run &run, const Suite &suite, bool ended)
{
    Tests tests;
    add(tests, suite);
    double seconds = 0;
    auto start = run.start;
    for (std::size_t at = suite.items.size(); at-- > 0;) {
        seconds += suite.items[at].seconds.value_or(0);
        start = suite.items[at].start.value_or(start);
    }
    std::string text = "  <testsuite" + attribute("name", title(run, suite)) + attributes(tests) +
                       time_attribute(seconds) + timestamp_attribute(start) + ">\n";
    text += suite_properties(run, ended);
    for (const ItemRun &item : suite.items) {
        text += test_case(run, item, ended);
    }
    return text + "  </testsuite>\n";
}

// The whole run; ended is false while it lasts.
std::string document(const Run &run, bool ended)
{
    Tests tests;
    for (const Suite &suite : run.suites) {
        add(tests, suite);
    }
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuites" +
                       attribute("name", "fptest") + attributes(tests) +
                       time_attribute(run.seconds) + timestamp_attribute(run.start) + ">\n";
    for (const Suite &suite : run.suites) {
        text += test_suite(run, suite, ended);
    }
    return text + "</testsuites>\n";
}

// --- the file ----------------------------------------------------------------

// Whether a file can be put in that one's place. A pipe or a device cannot be
// replaced, and what has a name only as a descriptor is somebody else's.
bool is_replaceable(const std::string &path)
{
    for (const char *descriptor : {"/dev/std", "/dev/fd/", "/proc/"}) {
        if (path.starts_with(descriptor)) {
            return false;
        }
    }
    struct stat status {
    };
    return stat(path.c_str(), &status) != 0 || S_ISREG(status.st_mode);
}

// Behind a symbolic link, which is to stay.
std::string real_path(const std::string &path)
{
    const std::unique_ptr<char, decltype(&std::free)> real(realpath(path.c_str(), nullptr),
                                                           &std::free);
    return real ? real.get() : path;
}

class JunitReport : public Listener
{
  public:
    explicit JunitReport(std::string path) : path_(std::move(path))
    {
    }

    void begin(const Run &run) override
    {
        if (is_replaceable(path_)) {
            target_ = real_path(path_);
            replace(run, false);
            return;
        }
        direct_ = Descriptor(open(path_.c_str(), O_WRONLY | O_APPEND | O_NOCTTY | O_CLOEXEC));
        if (!direct_.is_open()) {
            fail();
        }
    }

    void started(const Run &run, Place /* place */) override
    {
        change(run);
    }

    void progressed(const Run &run, Place /* place */) override
    {
        change(run);
    }

    void ended(const Run &run, Place /* place */) override
    {
        change(run);
    }

    void tick(const Run &run) override
    {
        if (changed_ && Clock::now() >= next_) {
            replace(run, false);
        }
    }

    void finish(const Run &run) override
    {
        if (!direct_.is_open()) {
            replace(run, true);
        } else if (!write_whole(direct_.get(), document(run, true))) {
            fail();
        }
    }

    std::string failure() const override
    {
        return failure_;
    }

  private:
    using Clock = std::chrono::steady_clock;

    void change(const Run &run)
    {
        changed_ = !direct_.is_open();
        tick(run);
    }

    // The more there is to write, the less often: a long run is not to be held up.
    void replace(const Run &run, bool ended)
    {
        if (!failure_.empty()) {
            return;
        }
        const auto start = Clock::now();
        if (!replace_file(document(run, ended))) {
            fail();
        }
        changed_ = false;
        const auto end = Clock::now();
        next_ = end + std::max<Clock::duration>(std::chrono::seconds(1), 20 * (end - start));
    }

    bool replace_file(const std::string &text)
    {
        const std::string aside = target_ + "." + std::to_string(getpid()) + ".tmp";
        if (write_file(aside, text) && std::rename(aside.c_str(), target_.c_str()) == 0) {
            return true;
        }
        const int error = errno;
        unlink(aside.c_str());
        errno = error;
        return false;
    }

    static bool write_file(const std::string &path, const std::string &text)
    {
        const int flags = O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC;
        const Descriptor file(open(path.c_str(), flags, 0666));
        return file.is_open() && write_whole(file.get(), text);
    }

    static bool write_whole(int descriptor, const std::string &text)
    {
        return write_text(descriptor, text) == text.size();
    }

    void fail()
    {
        failure_ = failure_of(path_, errno);
    }

    std::string path_;
    std::string target_;
    Descriptor direct_{-1};
    bool changed_ = false;
    Clock::time_point next_;
    std::string failure_;
};

} // namespace

std::unique_ptr<Listener> junit_report(const std::string &path)
{
    return std::make_unique<JunitReport>(path);
}

} // namespace fptest
