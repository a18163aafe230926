// A command-line job for bench/compare/effects.sh: reads raw 8-bit BGRA frames
// and renders one catalogue effect onto each, single-threaded, one frame at a
// time, the frame memory reused from frame to frame; the results are
// discarded (as ffmpeg's null output discards its own).
//
// Usage: effect_job WIDTH HEIGHT FRAMES INPUT.raw MATCH_NAME [KEY=VALUE ...]

#include "FX/EffectCatalogue.h"
#include "VF/VideoFrame.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

namespace
{

struct FileCloser
{
    void operator()(std::FILE* inFile) const { std::fclose(inFile); }
};

} // namespace

int main(int argc, char** argv)
{
    if (argc < 6)
    {
        std::fprintf(stderr, "usage: %s WIDTH HEIGHT FRAMES INPUT MATCH_NAME [KEY=VALUE ...]\n",
                     argv[0]);
        return 2;
    }
    const auto width = static_cast<std::uint32_t>(std::atoi(argv[1]));
    const auto height = static_cast<std::uint32_t>(std::atoi(argv[2]));
    const int frames = std::atoi(argv[3]);
    std::unique_ptr<std::FILE, FileCloser> input(std::fopen(argv[4], "rb"));
    if (!input)
    {
        std::fprintf(stderr, "effect_job: cannot open %s\n", argv[4]);
        return 1;
    }
    BE::EffectSettings settings;
    settings.mMatchName = argv[5];
    for (int i = 6; i < argc; ++i)
    {
        const std::string pair = argv[i];
        const std::size_t equals = pair.find('=');
        settings.mParams[pair.substr(0, equals)] =
            equals == std::string::npos ? "" : pair.substr(equals + 1);
    }
    const FX::EffectMade made = FX::CreateEffect(settings);
    for (const std::string& warning : made.mWarnings)
        std::fprintf(stderr, "effect_job: warning: %s\n", warning.c_str());
    if (!made.mEffect)
    {
        std::fprintf(stderr, "effect_job: %s\n", made.mError.c_str());
        return 1;
    }
    QRT::InterfaceRef<MF::IVideoFrame> frame =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, width, height,
                             mvxmediatypes::kPixelAspectRatio_Square, false, false);
    FX::RenderContext context;
    context.mFrameRect =
        QRT::ParamRect(0, 0, static_cast<std::int32_t>(width), static_cast<std::int32_t>(height));
    context.mQuality = 4;
    const std::size_t rowBytes = static_cast<std::size_t>(width) * 4;
    for (int f = 0; f < frames; ++f)
    {
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        // Rows without padding are read in one go, as ffmpeg reads its frames.
        const bool packed = static_cast<std::size_t>(frame->GetRowBytes()) == rowBytes;
        for (std::uint32_t y = 0; y < (packed ? 1 : height); ++y)
        {
            const std::size_t bytes = packed ? rowBytes * height : rowBytes;
            if (std::fread(base + y * static_cast<std::size_t>(frame->GetRowBytes()), 1, bytes,
                           input.get()) != bytes)
            {
                std::fprintf(stderr, "effect_job: %s ends before frame %d\n", argv[4], f);
                return 1;
            }
        }
        // The frame the effect answers is the one the next input is read into.
        if (made.mEffect->Render(context, frame, {}) != QRT::kResult_Success)
        {
            std::fprintf(stderr, "effect_job: the effect failed on frame %d\n", f);
            return 1;
        }
    }
    return 0;
}
