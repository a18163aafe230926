// Renders one frame of a generated solid pattern through ML::InitiateRender
// with the installed headers and libraries, and checks its pixels. Exits 0
// only when the frame arrived, uncancelled, with the pattern's colour in
// every pixel.

#include "BE/VideoSources.h"
#include "MF/FrameTime.h"
#include "ML/CutlistRenderParams.h"
#include "ML/RenderableVideoSources.h"
#include "ML/Version.h"
#include "ML/VideoRenderer.h"
#include "mvxmediatypes/TickTime.h"

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <mutex>

namespace
{

constexpr std::uint32_t kWidth = 16;
constexpr std::uint32_t kHeight = 8;
constexpr unsigned int kRequestID = 7;
// pattern:solid with color=3366CC, in memory order blue, green, red, alpha.
constexpr std::uint8_t kExpected[4] = {0xCC, 0x66, 0x33, 0xFF};

// The one callback's outcome, written on a render thread.
struct Outcome
{
    // Guards every field below.
    std::mutex mMutex;
    std::condition_variable mArrived;
    bool mCalled = false;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    unsigned int mRequestID = 0;
    bool mCancelled = false;
    int mStatus = 0;
};

ML::CutlistRenderParams MakeParams(const MF::FrameTime& inTime)
{
    ML::CutlistRenderParams params;
    params.SetFrameTime(inTime);
    params.mWidth = kWidth;
    params.mHeight = kHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mFullFrameWidth = kWidth;
    params.mFullFrameHeight = kHeight;
    params.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    return params;
}

// An empty text when inFrame is a kWidth x kHeight BGRA frame filled with
// kExpected, otherwise what is wrong.
const char* CheckFrame(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame)
{
    if (!inFrame)
        return "no frame";
    if (inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_BGRA_4444_8u)
        return "wrong pixel format";
    const QRT::ParamRect bounds = inFrame->GetBounds();
    if (bounds.Width() != static_cast<std::int32_t>(kWidth) ||
        bounds.Height() != static_cast<std::int32_t>(kHeight))
        return "wrong size";
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
    {
        const std::uint8_t* row = base + static_cast<std::ptrdiff_t>(y) * inFrame->GetRowBytes();
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
            if (std::memcmp(row + 4 * x, kExpected, 4) != 0)
                return "wrong pixel";
    }
    return "";
}

int Run()
{
    BE::VideoSourceRef media;
    const BE::OpenStatus opened =
        BE::OpenVideoSource("pattern:solid?size=64x36&color=3366CC", media);
    if (!opened.Succeeded())
    {
        std::fprintf(stderr, "vr_consumer: cannot open the pattern: %s\n", opened.mMessage.c_str());
        return 1;
    }
    const auto source = ML::CreateRenderableSource(
        media, MF::BinaryData(), media->GetAlphaChannel(), media->GetMatteColor(), false, false,
        media->GetFrameRate(), media->GetFieldType(), media->GetPixelAspectRatio(),
        media->GetColorProfile());
    if (!source)
    {
        std::fprintf(stderr, "vr_consumer: no renderable source\n");
        return 1;
    }

    Outcome outcome;
    const MF::FrameTime frameTime(mvxmediatypes::TickTime::TicksToTime(0));
    ML::InitiateRender(
        source, frameTime, MakeParams(frameTime), kRequestID,
        [&outcome](QRT::InterfaceRef<MF::IVideoFrame> inFrame, unsigned int inRequestID,
                   QRT::InterfaceRef<ML::IRenderableSource>, bool inCancelled, int inStatus)
        {
            std::lock_guard lock(outcome.mMutex);
            outcome.mCalled = true;
            outcome.mFrame = inFrame;
            outcome.mRequestID = inRequestID;
            outcome.mCancelled = inCancelled;
            outcome.mStatus = inStatus;
            outcome.mArrived.notify_all();
        });

    std::unique_lock lock(outcome.mMutex);
    // Bounded so that a lost request ends the program instead of hanging it.
    if (!outcome.mArrived.wait_for(lock, std::chrono::seconds(30),
                                   [&outcome] { return outcome.mCalled; }))
    {
        std::fprintf(stderr, "vr_consumer: the render never called back\n");
        return 1;
    }
    if (outcome.mRequestID != kRequestID || outcome.mCancelled || outcome.mStatus != 0)
    {
        std::fprintf(stderr, "vr_consumer: request %u ended with cancelled=%d status=%d\n",
                     outcome.mRequestID, outcome.mCancelled ? 1 : 0, outcome.mStatus);
        return 1;
    }
    const char* problem = CheckFrame(outcome.mFrame);
    if (*problem != '\0')
    {
        std::fprintf(stderr, "vr_consumer: %s\n", problem);
        return 1;
    }
    return 0;
}

} // namespace

int main()
{
    ML::VideoRenderer::Initialize();
    const int result = Run();
    ML::VideoRenderer::Shutdown();
    if (result == 0)
        std::printf("vr_consumer: VideoRenderer %s rendered a %ux%u frame with the expected "
                    "pixels\n",
                    ML::GetVideoRendererVersion(), kWidth, kHeight);
    return result;
}
