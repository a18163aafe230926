#include "QRT/ImmutableString.h"

#include "QRT/Allocator.h"
#include "mvxcore/config/Error.h"

#include <map>
#include <string>
#include <thread>
#include <unordered_set>
#include <vector>

#include <gtest/gtest.h>

namespace
{

class ImmutableStringTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = QRT::Allocator::GetLiveBlockCount(); }
    void TearDown() override { EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore); }
    int64_t mBlocksBefore = 0;
};

TEST_F(ImmutableStringTest, StaticPointsAtTheLiteralWithoutAllocating)
{
    static const char kLiteral[] = "ML.Opacity";
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    const QRT::ImmutableString text = QRT::ImmutableString::CreateStatic(kLiteral);
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
    EXPECT_EQ(text.c_str(), kLiteral);
    EXPECT_EQ(text.size(), 10u);
    EXPECT_FALSE(text.IsDynamic());
    EXPECT_EQ(text.ToStdString(), "ML.Opacity");
}

TEST_F(ImmutableStringTest, DynamicCopiesOnceIntoOneTerminatedBuffer)
{
    std::string source = "cutlist";
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    const QRT::ImmutableString text = QRT::ImmutableString::CreateDynamic(source);
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before + 1);
    source[0] = 'X';
    EXPECT_EQ(text.ToStringView(), "cutlist");
    EXPECT_NE(text.c_str(), source.c_str());
    EXPECT_EQ(text.c_str()[text.size()], '\0');
    EXPECT_TRUE(text.IsDynamic());
}

TEST_F(ImmutableStringTest, DynamicKeepsEmbeddedZeros)
{
    const std::string withZero("a\0b", 3);
    const QRT::ImmutableString text = QRT::ImmutableString::CreateDynamic(withZero);
    EXPECT_EQ(text.size(), 3u);
    EXPECT_EQ(text.ToStdString(), withZero);
    EXPECT_NE(text, QRT::ImmutableString::CreateStatic("a"));
}

TEST_F(ImmutableStringTest, CopiesShareTheBufferWithoutAllocating)
{
    const QRT::ImmutableString original = QRT::ImmutableString::CreateDynamic("shared text");
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    {
        std::vector<QRT::ImmutableString> copies(8, original);
        for (const QRT::ImmutableString& copy : copies)
            EXPECT_EQ(copy.data(), original.data());
        EXPECT_EQ(original.GetShareCountForTesting(), 9u);
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
    }
    EXPECT_EQ(original.GetShareCountForTesting(), 1u);
}

TEST_F(ImmutableStringTest, LastCopyFreesTheBuffer)
{
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    QRT::ImmutableString moved;
    {
        QRT::ImmutableString text = QRT::ImmutableString::CreateDynamic("short-lived");
        QRT::ImmutableString copy = text;
        moved = std::move(text);
        EXPECT_TRUE(text.empty());
        EXPECT_EQ(copy.GetShareCountForTesting(), 2u);
    }
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before + 1);
    EXPECT_EQ(moved, "short-lived");
    moved = QRT::ImmutableString();
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
}

TEST_F(ImmutableStringTest, SelfAssignmentKeepsTheText)
{
    QRT::ImmutableString text = QRT::ImmutableString::CreateDynamic("self");
    QRT::ImmutableString& alias = text;
    text = alias;
    EXPECT_EQ(text, "self");
    EXPECT_EQ(text.GetShareCountForTesting(), 1u);
}

TEST_F(ImmutableStringTest, EmptyAndDefaultAreEqualAndDoNotAllocate)
{
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    const QRT::ImmutableString defaulted;
    const QRT::ImmutableString fromEmpty = QRT::ImmutableString::CreateDynamic("");
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
    EXPECT_TRUE(defaulted.empty());
    EXPECT_STREQ(defaulted.c_str(), "");
    EXPECT_EQ(defaulted, fromEmpty);
    EXPECT_EQ(defaulted, QRT::ImmutableString::CreateStatic(""));
}

TEST_F(ImmutableStringTest, StaticAndDynamicCompareByText)
{
    const QRT::ImmutableString fixed = QRT::ImmutableString::CreateStatic("Motion");
    const QRT::ImmutableString made =
        QRT::ImmutableString::CreateDynamic(std::string("Mot") + "ion");
    EXPECT_EQ(fixed, made);
    EXPECT_EQ(fixed.Compare(made), 0);
    EXPECT_EQ(std::hash<QRT::ImmutableString>{}(fixed), std::hash<QRT::ImmutableString>{}(made));
}

TEST_F(ImmutableStringTest, OrderIsByteWiseUnsignedAndShorterFirst)
{
    const auto s = [](const char* inText) { return QRT::ImmutableString::CreateStatic(inText); };
    EXPECT_LT(s("ab").Compare(s("abc")), 0);
    EXPECT_GT(s("abc").Compare(s("ab")), 0);
    EXPECT_LT(s("B").Compare(s("a")), 0);        // upper case sorts first
    EXPECT_LT(s("z").Compare(s("\xC3\xA9")), 0); // UTF-8 lead byte above ASCII
    EXPECT_LT(s(""), s("a"));
    EXPECT_TRUE(s("abd") > s("abc"));
    EXPECT_EQ(s("abc").Compare(std::string_view("abc")), 0);

    std::map<QRT::ImmutableString, int> ordered{{s("b"), 2}, {s("a"), 1}, {s("ab"), 3}};
    std::vector<std::string> keys;
    for (const auto& [key, value] : ordered)
        keys.push_back(key.ToStdString());
    EXPECT_EQ(keys, (std::vector<std::string>{"a", "ab", "b"}));
}

TEST_F(ImmutableStringTest, WorksAsAHashKey)
{
    std::unordered_set<QRT::ImmutableString> set;
    set.insert(QRT::ImmutableString::CreateStatic("one"));
    set.insert(QRT::ImmutableString::CreateDynamic("one"));
    set.insert(QRT::ImmutableString::CreateDynamic("two"));
    EXPECT_EQ(set.size(), 2u);
    EXPECT_EQ(set.count(QRT::ImmutableString::CreateDynamic("two")), 1u);
}

TEST_F(ImmutableStringTest, NullLiteralIsAContractViolation)
{
    EXPECT_THROW(QRT::ImmutableString::CreateStatic(nullptr), mvxcore::config::Error);
}

TEST_F(ImmutableStringTest, CopiesOnManyThreadsKeepTheCountExact)
{
    const QRT::ImmutableString shared = QRT::ImmutableString::CreateDynamic("threaded");
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
    {
        threads.emplace_back(
            [&shared]
            {
                for (int i = 0; i < 10000; ++i)
                {
                    QRT::ImmutableString copy = shared;
                    ASSERT_EQ(copy, "threaded");
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(shared.GetShareCountForTesting(), 1u);
}

} // namespace
