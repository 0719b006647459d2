// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace fptest
{

// The device's own shell, which is asked without running anything.
class DeviceShell
{
  public:
    enum class Answer { accepted, refused, unknown };

    // It is asked for so long in all, its start and end included.
    explicit DeviceShell(double seconds = 5) : left_(seconds)
    {
    }

    // unknown where there is no such shell, or it has taken too long in all; why
    // then is as it was, else what the shell says against the line.
    Answer ask(const std::string &line, std::string &why);

    // The same of an expansion, which has to be tried: with no variables set, and
    // unknown where that could make a difference, or something would be run.
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
