// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "reporters/reporters.h"

#include "common/descriptor.h"
#include "reporters/junit_document.h"
#include "reporters/wording.h"
#include "reporters/writer.h"
#include "util/file_lock.h"
#include "util/files.h"
#include "util/write.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <fmt/core.h>
#include <functional>
#include <optional>
#include <string_view>
#include <sys/stat.h>
#include <utility>
#include <vector>

namespace fptest
{

namespace
{

// Whether another file can replace it. A pipe or a device cannot be replaced, and a
// file named by a descriptor belongs to somebody else.
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

// The file that is written first, and then replaces the target.
std::string aside_of(const std::string &target)
{
    return fmt::format("{}.{}.tmp", target, getpid());
}

// A file without a name, which ends with this process.
Descriptor unnamed_file(const std::string &directory)
{
    Descriptor file(open(directory.c_str(), O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
    if (!file.is_open()) { // not every file system supports O_TMPFILE
        std::string name = directory + "/fptest-XXXXXX";
        file = Descriptor(mkostemp(name.data(), O_CLOEXEC));
        if (file.is_open()) {
            unlink(name.c_str());
        }
    }
    return file;
}

// The finished rounds, as the document has them.
class Spool
{
  public:
    // In the first directory that has room; false if none has.
    bool open(const std::vector<std::string> &directories)
    {
        return std::ranges::any_of(directories, [this](const std::string &directory) {
            file_ = unnamed_file(directory);
            return file_.is_open();
        });
    }

    bool add(std::string_view text)
    {
        size_ += static_cast<off_t>(text.size());
        return write_text(file_.get(), text) == text.size();
    }

    off_t size() const
    {
        return size_;
    }

    // The piece from there on; empty at the end.
    std::string piece(off_t at, off_t end) const
    {
        std::string text(static_cast<std::size_t>(std::min<off_t>(kPiece, end - at)), '\0');
        const ssize_t got = pread(file_.get(), text.data(), text.size(), at);
        text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
        return text;
    }

  private:
    static constexpr off_t kPiece = 64 << 10;

    Descriptor file_{-1};
    off_t size_ = 0;
};

std::string filled_in(const std::string &text, const std::string &how_it_stands)
{
    std::string whole;
    std::size_t at = 0;
    for (std::size_t mark = text.find(kStateGoesHere); mark != std::string::npos;
         mark = text.find(kStateGoesHere, at)) {
        whole.append(text, at, mark - at).append(how_it_stands);
        at = mark + 1;
    }
    return whole.append(text, at);
}

std::string directory_of(const std::string &path)
{
    const std::size_t slash = path.rfind('/');
    return slash == std::string::npos ? "." : path.substr(0, slash + 1);
}

class JunitReporter : public Reporter
{
  public:
    explicit JunitReporter(std::string path) : path_(std::move(path))
    {
    }

    void begin(const Run &run) override
    {
        bool is_new = false;
        if (path_ == "-") {
            direct_.emplace("standard output", STDOUT_FILENO);
        } else if (is_replaceable(path_)) {
            target_ = end_of_links(path_);
            is_new = access(target_.c_str(), F_OK) != 0;
            if (!take_target()) {
                return;
            }
        } else {
            direct_.emplace(path_, O_WRONLY | O_APPEND, 0);
        }
        if (has_rounds(run) && !spool_.open(spool_directories())) {
            fail();
        }
        if (!direct_) {
            replace(run);
        }
        if (is_new && !failure_.empty()) {
            unlink(target_.c_str());
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

    void retried(const Run &run, Place /* place */) override
    {
        change(run);
    }

    void late(const Run &run, Place place, const TimedReport &report) override
    {
        late_.push_back({place.suite, late_report(run, place, report)});
        changed_ = !direct_;
    }

    void tick(const Run &run) override
    {
        if (changed_ && Clock::now() >= next_) {
            replace(run);
        }
    }

    void round_over(const Run &run) override
    {
        if (failure_.empty() && !spool_.add(junit_round(run, late_))) {
            fail();
        }
        before_ += tests_of_round(run);
        late_.clear();
    }

    void finish(const Run &run) override
    {
        if (!direct_) {
            replace(run);
        } else if (spool_.size() == 0) {
            write(run, [this](std::string_view text) {
                direct_->write(std::string(text));
                return true;
            });
        } else {
            // the whole document may be more than the writer lets wait
            rest_ = spool_.size();
            if (!write(run, [this](std::string_view text) { return spool_.add(text); })) {
                fail();
            }
            flush();
        }
    }

    bool flush() override
    {
        if (!direct_ || !failure().empty()) {
            return true;
        }
        while (rest_ && !direct_->is_pending()) {
            std::string piece = spool_.piece(*rest_, spool_.size());
            *rest_ += static_cast<off_t>(piece.size());
            if (piece.empty()) {
                rest_.reset();
            } else {
                direct_->write(piece);
            }
        }
        return !rest_ && !direct_->is_pending();
    }

    std::string failure() const override
    {
        return failure_.empty() && direct_ ? direct_->failure() : failure_;
    }

  private:
    using Clock = std::chrono::steady_clock;
    using Sink = std::function<bool(std::string_view)>;

    std::vector<std::string> spool_directories() const
    {
        if (!direct_) {
            return {directory_of(target_)};
        }
        const char *const chosen = std::getenv("TMPDIR");
        return {chosen != nullptr ? chosen : "/tmp", "/tmp", "/data/local/tmp"};
    }

    void change(const Run &run)
    {
        changed_ = !direct_;
        tick(run);
    }

    // Locked before anything of it is replaced, and whenever it is.
    bool take_target()
    {
        struct stat taken {
        };
        struct stat named {
        };
        do { // another fptest may just have replaced it
            lock_ = Descriptor(open(target_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666));
            if (!lock_.is_open()) {
                fail();
                return false;
            }
            if (!lock_file(lock_.get())) {
                failure_ = locked_text(path_);
                return false;
            }
        } while (fstat(lock_.get(), &taken) == 0 && stat(target_.c_str(), &named) == 0 &&
                 taken.st_ino != named.st_ino);
        return true;
    }

    // The more there is to write, the less often, so as not to hold up a long run.
    void replace(const Run &run)
    {
        if (!failure_.empty()) {
            return;
        }
        const auto start = Clock::now();
        if (!replace_file(run)) {
            fail();
        }
        changed_ = false;
        const auto end = Clock::now();
        next_ = end + std::max<Clock::duration>(std::chrono::seconds(1), 20 * (end - start));
    }

    bool replace_file(const Run &run)
    {
        const std::string aside = aside_of(target_);
        const int flags = O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC;
        Descriptor file(open(aside.c_str(), flags, 0666));
        if (!file.is_open()) {
            return false;
        }
        lock_file(file.get());
        struct stat old {
        };
        if (stat(target_.c_str(), &old) == 0) {
            static_cast<void>(fchmod(file.get(), old.st_mode & 07777));
        }
        const bool is_written = write(run, [&file](std::string_view text) {
            return write_text(file.get(), text) == text.size();
        });
        if (is_written && std::rename(aside.c_str(), target_.c_str()) == 0) {
            lock_ = std::move(file);
            return true;
        }
        const int error = errno;
        unlink(aside.c_str());
        errno = error;
        return false;
    }

    // The whole document, in pieces. False if the sink fails.
    bool write(const Run &run, const Sink &sink) const
    {
        const off_t end = spool_.size(); // the sink may be the spool itself
        const std::string how = junit_state(run);
        if (!sink(junit_head(run, before_))) {
            return false;
        }
        for (off_t at = 0; at < end;) {
            const std::string piece = spool_.piece(at, end);
            if (piece.empty() || !sink(filled_in(piece, how))) {
                return false;
            }
            at += static_cast<off_t>(piece.size());
        }
        return sink(filled_in(junit_round(run, late_), how)) && sink(junit_tail(run));
    }

    void fail()
    {
        failure_ = failure_of(path_, errno);
    }

    std::string path_;
    std::string target_;
    Descriptor lock_{-1};          // of the target, as long as it is open
    std::optional<Writer> direct_; // in place of a target
    Spool spool_;
    std::optional<off_t> rest_;    // where the rest of the document begins in the spool
    std::vector<LateReport> late_; // of the round
    TestCounts before_;            // of the rounds before it
    bool changed_ = false;
    Clock::time_point next_;
    std::string failure_;
};

} // namespace

std::string junit_obstacle(const std::string &path)
{
    if (path == "-") {
        return "";
    }
    if (const int error = Writer::obstacle(path); error != 0) { // such as a read-only file
        return failure_of(path, error);
    }
    const int error = is_replaceable(path) ? Writer::obstacle(aside_of(end_of_links(path))) : 0;
    return error == 0 ? "" : failure_of(path + ": beside it", error);
}

std::unique_ptr<Reporter> make_junit_reporter(const std::string &path)
{
    return std::make_unique<JunitReporter>(path);
}

} // namespace fptest
