// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Checks what the shell makes of an item's name and args.
#pragma once

#include "check/device_shell.h"
#include "check/elements.h"
#include "check/shell_reader.h"

#include <cstddef>
#include <string>
#include <unordered_map>

namespace fptest
{

class ShellChecker
{
  public:
    explicit ShellChecker(const CheckContext &context);

    void check(const Item &item);

  private:
    struct Verdict {
        ShellReading reading;
        bool is_line_refused = false;
        std::string why; // in the shell's words
    };

    Verdict judge(const Item &item, const std::string &line);
    bool is_substitution_refused(const ShellReading::Effect &substitution, std::string &why);
    // The place of a byte of its args.
    [[nodiscard]] std::size_t args_place(const Item &item, std::size_t at) const;
    void report_name(const Item &item, const std::string &characters, bool is_line_refused);
    void report_refusal(const Item &item, const Verdict &verdict, std::size_t args_begin);
    void report_effect(const Item &item, const ShellReading::Effect &effect, std::size_t place);
    void report_command(const Item &item, const ShellReading::Effect &effect, std::size_t place);

    const CheckContext context_;
    DeviceShell shell_;
    bool is_limit_told_ = false;
    std::unordered_map<std::string, Verdict> verdicts_; // by the line
};

} // namespace fptest
