#include "product/StringListKeeper.hpp"

#include "host/StringLists.hpp"
#include "tests/support/HostLists.hpp"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

namespace {

using rs2test::ListTexts;

// The keeper finds entries through its own index; whatever the calls, its
// list must be the one the host's own calls build.
TEST(StringListKeeper, builds_the_list_the_host_calls_build) {
    // Keys that are prefixes of one another, keys holding ": " and ":",
    // an empty key; values that look like entries.
    const std::vector<std::string> keys = {
        "A", "AB", "A: B", "A:", "", "B", "A: ", "C: D: E", "Key1", "Key10"};
    const std::vector<std::string> values = {"", "1", "B: 2", ": ", "x y"};
    std::mt19937 random(7);
    auto pick = [&](const std::vector<std::string> &from) -> const char * {
        return from[random() % from.size()].c_str();
    };
    for (int run = 0; run < 50; ++run) {
        char **host = AddStringToList(nullptr, "A: B: first");
        StringListKeeper keeper(AddStringToList(nullptr, "A: B: first"));
        for (int step = 0; step < 60; ++step) {
            const char *key = pick(keys);
            switch (random() % 6) {
            case 0:
            case 1:
            case 2: {
                const char *value = pick(values);
                host = SetAuxEntry(host, key, value);
                keeper.Set(key, value);
                break;
            }
            case 3:
                host = DeleteAuxEntries(host, key, nullptr, 1);
                keeper.Delete(key);
                break;
            case 4: { // duplicates of keys already there, and the list itself
                if (CountStringList(host) > 40)
                    break;
                char **copy = DuplicateStringList(host);
                host = AddStringList(host, copy);
                DestroyStringList(copy);
                keeper.Append(keeper.Get());
                break;
            }
            default: { // a value that points into the entry it replaces
                const char *value = FetchAuxEntry(host, key);
                host = SetAuxEntry(host, key, value);
                keeper.Set(key, keeper.Fetch(key));
                break;
            }
            }
            ASSERT_EQ(ListTexts(keeper.Get()), ListTexts(host))
                << "run " << run << " step " << step;
            for (const std::string &probe : keys) {
                const char *kept = keeper.Fetch(probe.c_str());
                ASSERT_EQ(rs2test::ListEntry(host, probe.c_str()),
                          kept ? std::optional<std::string>(kept)
                               : std::nullopt)
                    << probe;
            }
        }
        DestroyStringList(host);
    }
}

TEST(StringListKeeper, hands_over_and_takes_lists) {
    StringListKeeper keeper;
    EXPECT_EQ(keeper.Get(), nullptr);
    EXPECT_EQ(keeper.Fetch("A"), nullptr);
    keeper.Set(nullptr, "ignored");
    EXPECT_EQ(keeper.Get(), nullptr);
    for (int i = 0; i < 1000; ++i)
        keeper.Set(("K" + std::to_string(i % 500)).c_str(),
                   std::to_string(i).c_str());
    EXPECT_EQ(CountStringList(keeper.Get()), 500);
    EXPECT_STREQ(keeper.Fetch("K7"), "507");

    char **taken = keeper.Release();
    EXPECT_EQ(keeper.Get(), nullptr);
    EXPECT_EQ(keeper.Fetch("K7"), nullptr); // the index went with the list
    keeper.Reset(AddStringToList(nullptr, "K7: new"));
    EXPECT_STREQ(keeper.Fetch("K7"), "new");
    keeper.Set("K8", "appended");
    EXPECT_EQ(ListTexts(keeper.Get()),
              (std::vector<std::string>{"K7: new", "K8: appended"}));
    EXPECT_STREQ(FetchAuxEntry(taken, "K499"), "999");
    DestroyStringList(taken);
}

} // namespace
