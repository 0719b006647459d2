// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace fptest
{

// Asks the device's own shell about command lines, without running anything.
class DeviceShell
{
  public:
    enum class Answer { accepted, refused, unknown };

    // For all questions together, the shell's start and end included.
    explicit DeviceShell(double seconds = 5) : left_(seconds)
    {
    }

    // unknown if there is no such shell, or the time is up; why is set if the shell refuses
    // the line, to its complaint.
    Answer ask(const std::string &line, std::string &why);

    // The same for an expansion, which has to be tried, with no variables set: unknown if
    // variables matter, or if it would run something.
    Answer ask_to_expand(const std::string &expansion, std::string &why);

    [[nodiscard]] bool is_out_of_time() const
    {
        return left_ <= 0;
    }

  private:
    Answer ask_timed(const std::string &option, const std::string &line, std::string &why);
    Answer ask_once(const std::string &option, const std::string &line, std::string &why) const;

    double left_; // seconds
};

} // namespace fptest
