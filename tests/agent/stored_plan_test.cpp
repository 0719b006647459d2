// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What is saved in the very moment in which fptest puts another text in the stored plan's place.
#include "module/stored_plan.h"

#include "plan/library_rules.h"
#include "support/files.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <unistd.h>

namespace fptest
{
namespace
{

using testing::ElementsAre;

std::string with_item(const std::string &attributes)
{
    return "<?xml version=\"1.0\"?>\n<R><CmdGroup name=\"G\"><Cmd name=\"I\"" + attributes +
           "/></CmdGroup></R>\n";
}

// As the library does: in place, and without a lock.
void save(const std::string &attributes)
{
    support::write_file(kStoredPlan, with_item(attributes));
}

std::optional<std::string> marked(const std::string &plan)
{
    const auto end = plan.find("/>");
    return end == plan.npos ? std::nullopt
                            : std::optional(plan.substr(0, end) + " m='1'" + plan.substr(end));
}

TEST(StoredPlan, IsRemade)
{
    save(" a='1'");
    std::string text;
    EXPECT_EQ(remake_stored_plan(text, marked), with_item(" a='1' m='1'"));
    EXPECT_EQ(text, with_item(" a='1'"));
    EXPECT_EQ(read_stored_plan(), with_item(" a='1' m='1'"));
}

TEST(StoredPlan, IsRemadeWithWhatIsSavedMeanwhile)
{
    save(" a='1'");
    std::vector<std::string> made_of;
    std::string text;
    const auto made = remake_stored_plan(text, [&](const std::string &plan) {
        made_of.push_back(plan);
        if (made_of.size() <= 2) {
            save(made_of.size() == 1 ? " a='2'" : " a='3'");
        }
        return marked(plan);
    });
    EXPECT_THAT(made_of, ElementsAre(with_item(" a='1'"), with_item(" a='2'")));
    // the second is newer than what is made of the first
    EXPECT_EQ(read_stored_plan(), with_item(" a='3'"));
    EXPECT_EQ(made, with_item(" a='1' m='1'"));
}

TEST(StoredPlan, IsRemadeOnceItIsWholeAgain)
{
    save(" a='1'");
    const int saved = open(kStoredPlan, O_WRONLY);
    int tries = 0;
    std::string text;
    const auto made = remake_stored_plan(text, [&](const std::string &plan) {
        ++tries;
        const std::string later = with_item(" a='2'");
        if (tries == 1) { // cut, and the rest of it comes after the file was replaced
            EXPECT_EQ(ftruncate(saved, 0), 0);
        } else {
            EXPECT_EQ(pwrite(saved, later.data(), later.size(), 0),
                      static_cast<ssize_t>(later.size()));
        }
        return marked(plan);
    });
    close(saved);
    EXPECT_EQ(made, with_item(" a='2' m='1'"));
    EXPECT_EQ(read_stored_plan(), made);
    EXPECT_EQ(text, with_item(" a='2'"));
}

} // namespace
} // namespace fptest
