#include <gtest/gtest.h>

#include "varnel/unique_checker.h"

using varnel::UniqueChecker;

TEST(UniqueChecker, FoldsAsciiCaseKeepsOrderAndClears) {
    UniqueChecker checker;
    EXPECT_TRUE(checker.AddValue("abc"));
    EXPECT_FALSE(checker.AddValue("ABC"));
    EXPECT_FALSE(checker.AddValue("aBc"));
    EXPECT_TRUE(checker.AddValue("abc "));  // blanks count
    EXPECT_TRUE(checker.AddValue("\xC3\xA9"));
    EXPECT_TRUE(checker.AddValue("\xC3\x89"));  // bytes beyond ASCII compare exactly
    EXPECT_TRUE(checker.AddValue(""));
    EXPECT_FALSE(checker.AddValue(""));
    EXPECT_EQ(checker.Values(), (std::vector<std::string>{"abc", "abc ", "\xC3\xA9", "\xC3\x89", ""}));

    checker.Clear();
    EXPECT_EQ(checker.Count(), 0u);
    EXPECT_TRUE(checker.AddValue("ABC"));
    EXPECT_FALSE(checker.AddValue("abc"));
    EXPECT_EQ(checker.Values(), std::vector<std::string>{"ABC"});
}
