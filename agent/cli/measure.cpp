// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "cli/options.h"
#include "run/measurements.h"
#include "util/files.h"
#include "util/text.h"
#include "util/write.h"

#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace fptest
{
namespace
{

constexpr char kMeasureExamples[] =
    "Lets a shell script measure: prints \"#measure NAME VALUE UNIT LOW HIGH\", which\n"
    "fptest run reads in an item's output. '-' stands for no unit, or no limit.\n"
    "\n"
    "Examples:\n"
    "  fptest measure vcore 1.213 V 1.15 1.25\n"
    "  fptest measure dead_pixels 1 - - 2";

struct MeasureOptions {
    std::string name;
    std::string value;
    std::optional<std::string> unit;
    std::optional<std::string> low;
    std::optional<std::string> high;
};

Exit measure(const MeasureOptions &options)
{
    std::vector<std::string> words = {options.name, options.value};
    for (const auto &word : {options.unit, options.low, options.high}) {
        if (word) {
            words.push_back(*word);
        }
    }
    std::string why;
    if (!measurement_of(words, why)) {
        print_refused_measurement(why);
        throw Failure(Cause::input, "{}; see fptest measure --help", why);
    }
    require_standard_output("fptest measure");
    std::string line = "#measure";
    for (const std::string &word : words) {
        line += " " + word;
    }
    print_to(stdout, "{}\n", line);
    return Exit::success;
}

} // namespace

void print_refused_measurement(const std::string &why)
{
    print_to(stdout, "#measure {} {}\n", kRefused, one_line(why));
}

void add_measure(CLI::App &app, Action &chosen)
{
    const auto options = std::make_shared<MeasureOptions>();
    CLI::App &command =
        add_subcommand(app, "measure", "Print a measurement of the item that runs",
                       kMeasureExamples, chosen, [options] { return measure(*options); });
    command.add_option("NAME", options->name, "letters, digits, '_', '.', '-'")
        ->type_name("")
        ->required();
    command.add_option("VALUE", options->value, "a number")->type_name("")->required();
    command.add_option("UNIT", options->unit, "such as mV or %")->type_name("");
    command.add_option("LOW", options->low, "the least that is right")->type_name("");
    command.add_option("HIGH", options->high, "the most that is right")->type_name("");
}

} // namespace fptest
