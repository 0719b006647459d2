// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The node-path walk. Input: "PATH\0VENDOR\0QUERY\0DOCUMENT"; without a document
// a small plan stands for it.
#include "doubles.h"
#include "input.h"
#include "internals.h"
#include "quillmark.h"
#include "runs.h"

#include <string>

using doubles::require;

namespace
{

constexpr char kPlan[] = "<?xml version=\"1.0\"?><P>"
                         "<CmdGroup name=\"a\"><Cmd name=\"x\" args=\"1\"/><Cmd name=\"y\"/>"
                         "<Cmd name=\"SensorProbe\" args=\"\"/></CmdGroup>"
                         "<CmdGroup name=\"b\"><!-- c --><Cmd name=\"z\" args=\"2\"/></CmdGroup>"
                         "<CmdGroup name=\"c\"/><CmdGroup name=\"\"><Cmd name=\"\"/></CmdGroup>"
                         "</P>";

void check_level(const std::string &path)
{
    const auto names = components(path, '/');
    const bool separated = path.find('/') != std::string::npos;
    const Block copy(path);
    const Block last(64, '\x5a');
    require(internals::get_node_level(copy.data(), last.data(), 64) ==
                (separated ? static_cast<int>(names.size()) : 1),
            "the level is another");
    require(copy.all() == std::string_view(path.c_str(), path.size() + 1), "the path is changed");

    const std::string name = separated && !names.empty() ? names.back().substr(0, 32) : "";
    require(last.all() == filled(name.substr(0, name.find_first_of("\t\n")).substr(0, 31), 64),
            "the last component is another");
}

void check_names(const std::string &path)
{
    const auto names = components(path, '/');
    const Block copy(path);
    const Block group(64, '\0');
    const Block item(64, '\0');
    internals::get_node_name(copy.data(), group.data(), 64, item.data(), 64);
    require(group.all() == filled(names.size() > 1 ? names[1] : "", 64), "the group is another");
    require(item.all() == filled(names.size() > 2 ? names[2] : "", 64), "the item is another");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    const doubles::Run run;
    const auto [path, vendor, query, document] = texts<4>(data, size);
    doubles::write_plan(document.empty() ? kPlan : document);
    doubles::set_vendor(vendor);
    doubles::set_listing(query);
    check_level(path);
    check_names(path);

    const std::string plain = path.substr(0, path.find_first_of(":\t\n"));
    const Block walked(plain);
    const Block result(1025, '\0');
    internals::ItemsTest(walked.data(), result.data());
    require(result.all() == std::string(1025, '\0'), "the result is written");
    const auto expected =
        expected_starts(document.empty() ? kPlan : document, plain, vendor, !query.empty());
    require(!expected || doubles::started() == *expected, "something else is started");
    require(doubles::left_open() == 0, "the run leaves something open");
    return 0;
}
