// Each catalogue effect on one 1920x1080 BGRA 8-bit frame, single-threaded,
// through its render entry. The frame is rendered in place from iteration to
// iteration (effects that draw a new frame replace it), so its memory is
// reused and page faults are not measured.

#include "FX/EffectCatalogue.h"
#include "VF/VideoFrame.h"

#include <cstring>
#include <random>

#include <benchmark/benchmark.h>

namespace
{

namespace mt = mvxmediatypes;

struct Case
{
    const char* mName;
    std::string_view mMatch;
    std::map<std::string, std::string> mParams;
};

const Case kCases[] = {
    {"ProcAmpLevels", FX::kMatch_ProcAmp, {{"brightness", "10"}, {"contrast", "120"}}},
    {"ProcAmpHueSaturation", FX::kMatch_ProcAmp, {{"hue", "30"}, {"saturation", "130"}}},
    {"AlphaAdjust", FX::kMatch_AlphaAdjust, {{"opacity", "50"}, {"invert", "true"}}},
    {"VideoLimiter", FX::kMatch_VideoLimiter, {{"minimum", "6"}, {"maximum", "92"}}},
    {"Transform", FX::kMatch_Transform, {{"scale", "80"}, {"rotation", "10"}}},
    {"Crop", FX::kMatch_Crop, {{"left", "10"}, {"right", "10"}, {"top", "5"}}},
    {"GaussianBlur", FX::kMatch_GaussianBlur, {{"blurriness", "10"}}},
    {"LumaKey", FX::kMatch_LumaKey, {{"threshold", "20"}, {"softness", "10"}}},
    {"ChromaKey", FX::kMatch_ChromaKey, {{"similarity", "20"}, {"blend", "10"}}},
    {"RGBDifferenceKey", FX::kMatch_RGBDifferenceKey, {{"similarity", "20"}}},
    {"BlueScreenKey", FX::kMatch_BlueScreenKey, {}},
    {"GreenScreenKey", FX::kMatch_GreenScreenKey, {}},
    {"NonRedKey", FX::kMatch_NonRedKey, {}},
    {"MultiplyKey", FX::kMatch_MultiplyKey, {}},
    {"ScreenKey", FX::kMatch_ScreenKey, {}},
    {"RemoveMatte", FX::kMatch_RemoveMatte, {{"matte", "white"}}},
    {"CornerPin", FX::kMatch_CornerPin, {}},
    {"GarbageMatte", FX::kMatch_GarbageMatte, {}},
    {"Timecode", FX::kMatch_Timecode, {}},
    {"MulticamHilite", FX::kMatch_MulticamHilite, {}},
};

void BM_Effect1080p8u(benchmark::State& ioState, const Case& inCase)
{
    BE::EffectSettings settings;
    settings.mMatchName = std::string(inCase.mMatch);
    settings.mParams = inCase.mParams;
    // The four-point effects with corners moved in, so that they do real work.
    if (inCase.mMatch == FX::kMatch_CornerPin || inCase.mMatch == FX::kMatch_GarbageMatte)
    {
        settings.mKeyframedParams["upperLeft"] = BE::KeyframeCurve::Point({100, 50});
        settings.mKeyframedParams["lowerRight"] = BE::KeyframeCurve::Point({-200, -30});
    }
    const FX::EffectMade made = FX::CreateEffect(settings);
    if (!made.mEffect)
    {
        ioState.SkipWithError(made.mError.c_str());
        return;
    }
    QRT::InterfaceRef<MF::IVideoFrame> frame = VF::CreateVideoFrame(
        mt::kPixelFormat_BGRA_4444_8u, 1920, 1080, mt::kPixelAspectRatio_Square, false, false);
    std::mt19937 random(42);
    auto* bytes = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (std::size_t i = 0; i < frame->GetDataSize(); ++i)
        bytes[i] = static_cast<std::uint8_t>(random() | ((i % 4 == 3) ? 0x80 : 0));
    FX::RenderContext context;
    context.mFrameRect = QRT::ParamRect(0, 0, 1920, 1080);
    context.mQuality = 4;
    for (auto _ : ioState)
    {
        if (made.mEffect->Render(context, frame, {}) != QRT::kResult_Success)
        {
            ioState.SkipWithError("render failed");
            return;
        }
        benchmark::DoNotOptimize(frame->GetBaseAddress());
    }
    ioState.SetBytesProcessed(static_cast<std::int64_t>(ioState.iterations()) * 1920 * 1080 * 4);
}

const bool kRegistered = []
{
    for (const Case& c : kCases)
        benchmark::RegisterBenchmark((std::string("BM_Effect1080p8u/") + c.mName).c_str(),
                                     BM_Effect1080p8u, c)
            ->Unit(benchmark::kMillisecond);
    return true;
}();

} // namespace
