// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The command entry and the read-back. Input: a byte for the reply buffer, then
// "VENDOR\0", then commands, each ended by a zero byte.
#include "doubles.h"
#include "input.h"
#include "internals.h"
#include "quillmark.h"
#include "runs.h"

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

using doubles::require;

namespace
{

constexpr char kFill = '\x5a';
constexpr std::size_t kMostCommands = 12; // enough to meet, and quick

template <std::size_t N> std::string_view bytes(const char (&array)[N])
{
    return {array, N};
}

void check_fields(const std::vector<std::string> &fields, const Block &command)
{
    fpTest_TestMsg_t message;
    internals::TestMsgInit(&message);
    internals::ParseCmdLine(command.data(), &message);

    const auto field = [&](std::size_t at) { return at < fields.size() ? fields[at] : ""; };
    require(bytes(message.testMsgHead) == filled(field(0), 32), "the head is not the first field");
    require(bytes(message.testMsgName) == filled(field(1), 2049), "the name is not the second");
    require(bytes(message.testMsgArgs) == filled(field(2), 1024),
            "the arguments are not the third");
}

void check_read_back(std::size_t room)
{
    const Block buffer(room, kFill);
    FPTEST_ExtractResultMsg(buffer.data(), static_cast<int>(room));

    std::string expected = doubles::plan().value_or("").substr(0, room);
    expected.resize(room, kFill);
    require(buffer.all() == expected, "what is read back is not what is stored");
}

// The reply, as the texts of the commands promise it.
class Entry
{
  public:
    Entry(std::size_t room, bool with_reply, std::string vendor)
        : room_(room), with_reply_(with_reply), vendor_(std::move(vendor))
    {
        doubles::set_vendor(vendor_);
    }

    void run(const std::string &text)
    {
        const Block command(text);
        const Block reply(room_, kFill);
        const auto fields = components(text, ':');
        check_fields(fields, command);

        const auto plan_before = doubles::plan();
        const int result = FPTEST_RunTestCmd(command.data(), with_reply_ ? reply.data() : nullptr,
                                             static_cast<int>(room_));
        require(result == 0, "the command returns something");
        require(command.all() == std::string_view(text.c_str(), text.size() + 1),
                "the command is changed");

        std::string expected_reply(room_, kFill);
        auto expected_plan = plan_before;
        std::optional<std::vector<std::string>> expected = std::vector<std::string>();
        const std::string head = fields.empty() ? "" : fields[0];
        const std::string name = fields.size() > 1 ? fields[1] : "";
        if (!pinged_ && head.starts_with("pingtest")) {
            pinged_ = true;
            expected_reply = filled("Ping Success!", room_);
        } else if (head.starts_with("XMLFile")) {
            expected_plan = name.substr(0, 2048);
            ++stored_;
            require(g_TestCmdTree == nullptr, "the old plan stays in use");
        } else if (head.starts_with("XMLNodePath")) {
            const std::string line = name.substr(0, name.find_first_of("\t\n"));
            expected =
                expected_starts(plan_before.value_or(""), line.substr(0, 2047), vendor_, false);
            expected_reply.assign(room_, '\0');
        }
        require(!with_reply_ || reply.all() == expected_reply, "the reply is another one");
        require(doubles::plan() == expected_plan, "the stored plan is another one");
        require(!expected || doubles::started() == *expected, "something else is started");
        require(internals::ping_mask == (pinged_ ? 1 : 0), "the ping is counted otherwise");
        require(doubles::left_open() == stored_, "descriptors: not one for each stored plan");
    }

  private:
    std::size_t room_;
    bool with_reply_;
    std::string vendor_;
    bool pinged_ = false;
    std::size_t stored_ = 0;
};

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    if (size == 0) {
        return 0;
    }
    const doubles::Run run;
    const std::size_t room = (data[0] & 0x3fU) + 1U;
    auto [vendor, commands] = texts<2>(data + 1, size - 1);
    Entry entry(room, (data[0] & 0x40U) != 0, vendor);
    auto lines = components(commands, '\0');
    lines.resize(std::min(lines.size(), kMostCommands));
    for (const std::string &line : lines) {
        entry.run(line);
        check_read_back(room);
    }
    entry.run("");
    check_read_back(4096);
    return 0;
}
