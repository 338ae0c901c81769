#include <gtest/gtest.h>

#include "varnel/unique_checker.h"

using varnel::UniqueChecker;

TEST(UniqueChecker, FoldsAsciiCaseKeepsOrderAndClears) {
    UniqueChecker checker;
    for (auto [text, added] : {std::pair{"abc", true}, {"ABC", false}, {"aBc", false}, {"abc ", true},
                               {"\xC3\xA9", true}, {"\xC3\x89", true}, {"", true}, {"", false}})
        EXPECT_EQ(checker.AddValue(text), added) << text;  // bytes beyond ASCII compare exactly
    EXPECT_EQ(checker.Values(), (std::vector<std::string>{"abc", "abc ", "\xC3\xA9", "\xC3\x89", ""}));

    checker.Clear();
    EXPECT_EQ(checker.Count(), 0u);
    EXPECT_TRUE(checker.AddValue("ABC"));
    EXPECT_FALSE(checker.AddValue("abc"));
    EXPECT_EQ(checker.Values(), std::vector<std::string>{"ABC"});
}
