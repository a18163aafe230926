// The effect catalogue: match names, parameters from settings (text, curves,
// clamping with warnings, refusals), the parameter texts and time variance,
// and the loader's check.

#include "FX/EffectCatalogue.h"

#include <gtest/gtest.h>

namespace FX
{
namespace
{

using mvxmediatypes::TickTime;

BE::EffectSettings Settings(std::string_view inMatch,
                            std::map<std::string, std::string> inParams = {})
{
    BE::EffectSettings settings;
    settings.mMatchName = std::string(inMatch);
    settings.mParams = std::move(inParams);
    return settings;
}

BE::CurveKey Key(double inSeconds, MF::KeyframePoint inValue,
                 BE::KeyframeInterpolation inKind = BE::KeyframeInterpolation::kLinear)
{
    return {TickTime::FromSeconds(inSeconds), inValue, inKind, {}, {}};
}

const EffectParam& Param(const IEffect& inEffect, std::string_view inName)
{
    for (std::uint32_t i = 0; i < inEffect.GetParamCount(); ++i)
        if (inEffect.GetParam(i).mName == inName)
            return inEffect.GetParam(i);
    throw std::out_of_range(std::string(inName));
}

TEST(EffectCatalogue, RefusesAnUnknownMatchNameNamingIt)
{
    const EffectMade made = CreateEffect(Settings("VR.Sparkle"));
    EXPECT_FALSE(made.mEffect);
    EXPECT_EQ(made.mError, "unknown effect \"VR.Sparkle\"");
    EXPECT_EQ(CheckEffect(Settings("VR.Sparkle")).mError, made.mError);
    // The item's own opacity is not an effect of the catalogue either.
    EXPECT_NE(CheckEffect(Settings(kMatch_Opacity)).mError.find("\"opacity\""), std::string::npos);
}

TEST(EffectCatalogue, EveryNameMakesAnEffectWithDistinctInstanceNumbers)
{
    std::set<std::uint32_t> instances;
    for (const std::string& name : GetEffectMatchNames())
    {
        SCOPED_TRACE(name);
        const EffectMade made = CreateEffect(Settings(name), TickTime::FromSeconds(2));
        ASSERT_TRUE(made.mEffect) << made.mError;
        EXPECT_TRUE(made.mWarnings.empty());
        EXPECT_EQ(made.mEffect->GetMatchName(), name);
        EXPECT_TRUE(made.mEffect->HasDuration());
        EXPECT_EQ(made.mEffect->GetDuration(), TickTime::FromSeconds(2));
        EXPECT_TRUE(instances.insert(made.mEffect->GetInstanceID()).second);
    }
    EXPECT_EQ(instances.size(), 22u);
}

struct ClampCase
{
    std::string mParam;
    std::string mText;
    double mValue;
    std::string mWarning;
};

class EffectClampTest : public ::testing::TestWithParam<ClampCase>
{
};

TEST_P(EffectClampTest, ClampsOutOfRangeValuesWithAWarning)
{
    const ClampCase& c = GetParam();
    const EffectMade made = CreateEffect(Settings(kMatch_ProcAmp, {{c.mParam, c.mText}}));
    ASSERT_TRUE(made.mEffect) << made.mError;
    EXPECT_EQ(Param(*made.mEffect, c.mParam).ValueAt(TickTime()), c.mValue);
    EXPECT_EQ(made.mWarnings, c.mWarning.empty() ? std::vector<std::string>{}
                                                 : std::vector<std::string>{c.mWarning});
}

INSTANTIATE_TEST_SUITE_P(
    ProcAmp, EffectClampTest,
    ::testing::Values(ClampCase{"brightness", "300", 100.0,
                                "\"KX.VNTR ProcAmp\" parameter \"brightness\": 300 is outside "
                                "-100..100; clamped to 100"},
                      ClampCase{"contrast", "-5", 0.0,
                                "\"KX.VNTR ProcAmp\" parameter \"contrast\": -5 is outside "
                                "0..200; clamped to 0"},
                      ClampCase{"hue", "-180", -180.0, ""},
                      ClampCase{"saturation", "200", 200.0, ""}));

TEST(EffectCatalogue, RefusesTextOfTheWrongTypeAndWarnsOfUnknownParameters)
{
    const struct
    {
        BE::EffectSettings mSettings;
        std::string mError;
    } cases[] = {
        {Settings(kMatch_ProcAmp, {{"brightness", "bright"}}),
         "\"KX.VNTR ProcAmp\" parameter \"brightness\": expected a number, got \"bright\""},
        {Settings(kMatch_AlphaAdjust, {{"invert", "yes"}}),
         "\"KX.VNTR Alpha Adjust\" parameter \"invert\": expected true or false, got \"yes\""},
        {Settings(kMatch_GaussianBlur, {{"dimensions", "diagonal"}}),
         "\"VR.GaussianBlur\" parameter \"dimensions\": expected one of both, horizontal, "
         "vertical, got \"diagonal\""},
        {Settings(kMatch_ChromaKey, {{"color", "#12345"}}),
         "\"KX.VNTR Legacy Key Chroma\" parameter \"color\": expected a colour \"#RRGGBB\", got "
         "\"#12345\""},
    };
    for (const auto& c : cases)
    {
        const EffectMade made = CreateEffect(c.mSettings);
        EXPECT_FALSE(made.mEffect);
        EXPECT_EQ(made.mError, c.mError);
    }
    const EffectMade made = CreateEffect(Settings(kMatch_Crop, {{"lefft", "3"}}));
    ASSERT_TRUE(made.mEffect);
    EXPECT_EQ(made.mWarnings,
              std::vector<std::string>{"\"VR.Crop\" has no parameter \"lefft\"; it is ignored"});
}

TEST(EffectCatalogue, KeyedParametersInterpolateAndChangeTheirText)
{
    using K = BE::KeyframeInterpolation;
    BE::EffectSettings settings = Settings(kMatch_Transform, {{"scale", "50"}});
    settings.mKeyframedParams["position"] =
        BE::KeyframeCurve::Point({}, {{TickTime::FromSeconds(0), {0, 10}, K::kLinear, {}, {}},
                                      {TickTime::FromSeconds(1), {40, 30}, K::kHold, {}, {}}});
    settings.mKeyframedParams["rotation"] =
        BE::KeyframeCurve::Scalar(0, {{TickTime::FromSeconds(0), {0, 0}, K::kHold, {}, {}},
                                      {TickTime::FromSeconds(2), {90, 0}, K::kLinear, {}, {}}});
    const EffectMade made = CreateEffect(settings);
    ASSERT_TRUE(made.mEffect) << made.mError;
    const EffectParam& position = Param(*made.mEffect, "position");
    const EffectParam& rotation = Param(*made.mEffect, "rotation");
    const EffectParam& scale = Param(*made.mEffect, "scale");
    EXPECT_FALSE(position.IsConstant());
    EXPECT_TRUE(scale.IsConstant());
    EXPECT_TRUE(scale.IsTimeVariant());
    EXPECT_EQ(position.ValueAt(TickTime::FromSeconds(0.5)), 20.0);
    EXPECT_EQ(position.YAt(TickTime::FromSeconds(0.5)), 20.0);
    // A hold key keeps its value up to the next key.
    EXPECT_EQ(rotation.ValueAt(TickTime::FromSeconds(1.9)), 0.0);
    EXPECT_EQ(rotation.ValueAt(TickTime::FromSeconds(3)), 90.0);
    EXPECT_EQ(scale.GetText(), "scale=50");
    EXPECT_EQ(rotation.GetText(), "rotation=0:0:1:0:0;" +
                                      std::to_string(TickTime::FromSeconds(2).GetTicks()) +
                                      ":90:0:0:0");
    EXPECT_FALSE(
        Param(*CreateEffect(Settings(kMatch_AlphaAdjust)).mEffect, "mask").IsTimeVariant());
}

TEST(EffectCatalogue, KeyedValuesOutOfRangeAreClampedKeyByKey)
{
    BE::EffectSettings settings = Settings(kMatch_Crop);
    settings.mKeyframedParams["left"] =
        BE::KeyframeCurve::Scalar(0, {Key(0, {-10, 0}), Key(1, {150, 0})});
    settings.mKeyframedParams["top"] = BE::KeyframeCurve::Point({1, 2});
    EXPECT_EQ(CreateEffect(settings).mError, "\"VR.Crop\" parameter \"top\": expected a number");
    settings.mKeyframedParams.erase("top");
    const EffectMade made = CreateEffect(settings);
    ASSERT_TRUE(made.mEffect) << made.mError;
    const EffectParam& left = Param(*made.mEffect, "left");
    EXPECT_EQ(left.ValueAt(TickTime::FromSeconds(0)), 0.0);
    EXPECT_EQ(left.ValueAt(TickTime::FromSeconds(1)), 100.0);
    EXPECT_EQ(made.mWarnings.size(), 2u);
}

TEST(EffectCatalogue, OpaqueDataIsHandedOverOnlyWhenPresent)
{
    MF::BinaryData data;
    EXPECT_FALSE(CreateEffect(Settings(kMatch_Crop)).mEffect->GetOpaqueData(data));
    BE::EffectSettings settings = Settings(kMatch_Crop);
    settings.mOpaqueData = MF::BinaryData::FromText("state");
    EXPECT_TRUE(CreateEffect(settings).mEffect->GetOpaqueData(data));
    EXPECT_EQ(data, settings.mOpaqueData);
}

} // namespace
} // namespace FX
