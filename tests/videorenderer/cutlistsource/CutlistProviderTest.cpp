#include "BE/CutlistProvider.h"

#include "ContractExpect.h"
#include "ML/IMutableCutlist.h"

#include <tuple>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace
{

QRT::InterfaceRef<MF::IRenderableCutlist> NewCutlist(const char* inName)
{
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic(inName));
    cutlist->MakeImmutable();
    return QRT::InterfaceRef<MF::IRenderableCutlist>(cutlist);
}

BE::CutlistProviderSettings Settings(std::int32_t inRight, std::int32_t inBottom)
{
    BE::CutlistProviderSettings settings;
    settings.mRight = inRight;
    settings.mBottom = inBottom;
    settings.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_D1PAL;
    settings.mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    return settings;
}

class CutlistProviderTest : public ::testing::Test
{
protected:
    QRT::InterfaceRef<BE::ICutlistProvider> mProvider =
        BE::CreateCutlistProvider(Settings(720, 576));
    const QRT::ImmutableString mSequence = QRT::ImmutableString::CreateStatic("Sequence 01");
    const QRT::ImmutableString mDefault{};
};

TEST_F(CutlistProviderTest, PropertiesAnswerTheSettingsThroughTheirInterface)
{
    const auto properties = QRT::QueryRef<MF::IRenderableCutlistProviderProperties>(mProvider);
    ASSERT_TRUE(properties);
    std::int32_t bounds[4] = {-1, -1, -1, -1};
    properties->GetBounds(bounds[0], bounds[1], bounds[2], bounds[3]);
    EXPECT_THAT(bounds, ::testing::ElementsAre(0, 0, 720, 576));
    EXPECT_EQ(properties->GetPixelAspectRatio(), mvxmediatypes::kPixelAspectRatio_D1PAL);
    EXPECT_EQ(properties->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(properties->GetFrameRate(), mvxmediatypes::kFrameRate_Video25);
}

TEST_F(CutlistProviderTest, GettersAnswerTheCutlistsOfTheNameOrTheDefaultSet)
{
    const auto main = NewCutlist("main");
    const auto alternate = NewCutlist("alternate");
    const auto third = NewCutlist("third");
    const auto fallback = NewCutlist("fallback");
    mProvider->SetCutlists(mSequence, {main, alternate, third});
    EXPECT_EQ(mProvider->GetAlternateCutlist(mSequence, true), alternate);
    EXPECT_EQ(mProvider->GetThirdCutlist(mSequence, false), third);
    // No default set yet: another name gets nothing.
    const auto other = QRT::ImmutableString::CreateDynamic("Sequence 02");
    EXPECT_FALSE(mProvider->GetMainCutlist(other, true));

    mProvider->SetCutlists(mDefault, {fallback, {}, {}});
    EXPECT_EQ(mProvider->GetMainCutlist(other, true), fallback);
    // A name with its own set never falls back, until it is removed.
    EXPECT_EQ(mProvider->GetMainCutlist(mSequence, true), main);
    mProvider->RemoveCutlists(mSequence);
    EXPECT_EQ(mProvider->GetMainCutlist(mSequence, true), fallback);
    mProvider->RemoveCutlists(QRT::ImmutableString::CreateStatic("never registered"));
}

TEST_F(CutlistProviderTest, BadSettingsBreakTheContractAndChangeNothing)
{
    BE::CutlistProviderSettings inverted = Settings(720, 576);
    inverted.mLeft = 800;
    EXPECT_INPUT_CONTRACT(mProvider->SetSettings(inverted),
                          "inSettings.mRight >= inSettings.mLeft");
    EXPECT_INPUT_CONTRACT(mProvider->SetSettings(Settings(720, -1)),
                          "inSettings.mBottom >= inSettings.mTop");
    BE::CutlistProviderSettings badField = Settings(720, 576);
    badField.mFieldType = mvxmediatypes::kFieldType_Invalid;
    EXPECT_INPUT_CONTRACT(mProvider->SetSettings(badField),
                          "inSettings.mFieldType >= mvxmediatypes::kFieldType_Progressive && "
                          "inSettings.mFieldType <= mvxmediatypes::kFieldType_AsSource");
    BE::CutlistProviderSettings badRatio = Settings(720, 576);
    badRatio.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Any;
    EXPECT_INPUT_CONTRACT(BE::CreateCutlistProvider(badRatio),
                          "inSettings.mPixelAspectRatio.IsValid()");
    const BE::CutlistProviderSettings kept = mProvider->GetSettings();
    EXPECT_EQ(std::tuple(kept.mLeft, kept.mBottom, kept.mFieldType),
              std::tuple(0, 576, mvxmediatypes::kFieldType_LowerFirst));
    mProvider->SetSettings(Settings(1920, 1080));
    EXPECT_EQ(mProvider->GetSettings().mBottom, 1080);
}

} // namespace
