#include "QRT/ImmutableString.h"

#include "QRT/Allocator.h"
#include "mvxcore/config/Error.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using QRT::ImmutableString;

class ImmutableStringTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = Blocks(); }
    void TearDown() override { EXPECT_EQ(Blocks(), mBlocksBefore); }
    static int64_t Blocks() { return QRT::Allocator::GetLiveBlockCount(); }
    int64_t mBlocksBefore = 0;
};

TEST_F(ImmutableStringTest, StaticPointsAtTheLiteralAndDynamicCopiesOnceWithATerminator)
{
    static const char kLiteral[] = "ML.Opacity";
    const ImmutableString fixed = ImmutableString::CreateStatic(kLiteral);
    EXPECT_EQ(Blocks(), mBlocksBefore);
    EXPECT_EQ(fixed.c_str(), kLiteral);
    EXPECT_FALSE(fixed.IsDynamic());
    EXPECT_THROW(ImmutableString::CreateStatic(nullptr), mvxcore::config::Error);

    std::string source("cut\0list", 8);
    const ImmutableString made = ImmutableString::CreateDynamic(source);
    EXPECT_EQ(Blocks(), mBlocksBefore + 1);
    source[0] = 'X';
    EXPECT_EQ(made.ToStdString(), std::string("cut\0list", 8));
    EXPECT_EQ(made.c_str()[made.size()], '\0');
    EXPECT_NE(made, ImmutableString::CreateStatic("cut"));

    // Empty texts of every origin are equal and allocate nothing.
    const ImmutableString defaulted;
    EXPECT_EQ(ImmutableString::CreateDynamic(""), defaulted);
    EXPECT_EQ(ImmutableString::CreateStatic(""), defaulted);
    EXPECT_EQ(Blocks(), mBlocksBefore + 1);
    EXPECT_STREQ(defaulted.c_str(), "");
}

TEST_F(ImmutableStringTest, CopiesShareTheBufferAndTheLastOneFreesIt)
{
    ImmutableString original = ImmutableString::CreateDynamic("shared text");
    {
        const std::vector<ImmutableString> copies(8, original);
        EXPECT_EQ(copies.back().data(), original.data());
        EXPECT_EQ(original.GetShareCountForTesting(), 9u);
        EXPECT_EQ(Blocks(), mBlocksBefore + 1);
    }
    EXPECT_EQ(original.GetShareCountForTesting(), 1u);
    ImmutableString& alias = original;
    original = alias;
    EXPECT_EQ(original, "shared text");
    EXPECT_EQ(original.GetShareCountForTesting(), 1u);

    ImmutableString moved = std::move(original);
    EXPECT_TRUE(original.empty());
    EXPECT_EQ(moved, "shared text");
    EXPECT_EQ(Blocks(), mBlocksBefore + 1);
    moved = ImmutableString();
    EXPECT_EQ(Blocks(), mBlocksBefore);
}

TEST_F(ImmutableStringTest, ComparesByTextInUnsignedByteOrderShorterFirst)
{
    const auto s = [](const char* inText) { return ImmutableString::CreateStatic(inText); };
    const ImmutableString made = ImmutableString::CreateDynamic(std::string("Mot") + "ion");
    EXPECT_EQ(s("Motion"), made);
    EXPECT_EQ(std::hash<ImmutableString>{}(s("Motion")), std::hash<ImmutableString>{}(made));
    // Each pair is in ascending order.
    const std::pair<const char*, const char*> ascending[] = {
        {"ab", "abc"}, {"B", "a"}, {"z", "\xC3\xA9"}, {"", "a"}};
    for (const auto& [lower, higher] : ascending)
    {
        EXPECT_LT(s(lower).Compare(s(higher)), 0) << lower;
        EXPECT_GT(s(higher).Compare(s(lower)), 0) << lower;
        EXPECT_TRUE(s(lower) < s(higher) && s(higher) > s(lower)) << lower;
    }
}

} // namespace
