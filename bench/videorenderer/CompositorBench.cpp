// The whole compositing step of a segment: CompositorProducer::ProduceFrame
// over two 1080p BGRA layers, a full-frame bottom layer and a half-size layer
// moved off centre on top. Each iteration produces both layer frames (solid
// colour fills), passes the bottom one through and draws the top one into it.
// Argument: the render quality (4 in the output format, 5 in linear float).

#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCompositorImpl.h"
#include "ML/RenderableNodes.h"
#include "QRT/Allocated.h"

#include <benchmark/benchmark.h>

namespace
{

// A solid-colour layer with built-in motion: half size, moved right and up.
class MovedLayer
    : public ML::RenderableNodeWithInterfaces<ML::RenderableNodeCommonImpl,
                                              ML::IRenderableNodeProducerProvider,
                                              ML::IRenderableNodeIntrinsicParameterProvider>
{
public:
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("MovedLayer");
    }
    void GetProducer(QRT::InterfaceRef<ML::IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const ML::CutlistRenderParams& inParams) const override
    {
        mColor->GetProducer(outProducer, inTime, inParams);
    }
    void GetStillRanges(mvxmediatypes::TickTime, mvxmediatypes::TickTime,
                        MF::TickTimeRangeList&) const override
    {
    }
    void GetSmartRenderTimes(mvxmediatypes::TickTime, mvxmediatypes::TickTime,
                             const mvxmediatypes::FrameRate&, bool,
                             std::set<mvxmediatypes::TickTime>&) const override
    {
    }
    QRT::Result GetIntrinsicParameters(mvxmediatypes::TickTime, const ML::CutlistRenderParams&,
                                       ML::MotionRecord& ioRecord) const override
    {
        ioRecord.mPositionX = 0.7f;
        ioRecord.mPositionY = 0.35f;
        ioRecord.mScaleX = ioRecord.mScaleY = 0.5f;
        ioRecord.mOpacity = 0.8f;
        return QRT::kResult_Success;
    }

    const QRT::InterfaceRef<ML::IRenderableNodeProducerProvider> mColor{
        ML::CreateSolidColorNode(0xC0FF8040u)};

protected:
    ~MovedLayer() = default;
};

void BM_CompositorProduceFrameTwo1080Layers(benchmark::State& ioState)
{
    ML::CutlistRenderParams params;
    params.mWidth = params.mFullFrameWidth = 1920;
    params.mHeight = params.mFullFrameHeight = 1080;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(1, 1);
    params.mQuality = static_cast<std::uint32_t>(ioState.range(0));

    auto top = QRT::Allocated<MovedLayer>::CreateInstance();
    top->MakeImmutable();
    auto compositor = ML::RenderableNodeCompositorImpl::Create();
    compositor->AddTrackInput(ML::CreateSolidColorNode(0xFF336699u), mvxmediatypes::kTime_Zero, 0);
    compositor->AddTrackInput(
        QRT::InterfaceRef<MF::IRenderableNode>(static_cast<MF::IRenderableNode*>(top.Get())),
        mvxmediatypes::kTime_Zero, 1);
    compositor->MakeImmutable();
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    compositor->GetProducer(producer, params.GetFrameTime(), params);

    for (auto _ : ioState)
    {
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        if (QRT::Failed(producer->ProduceFrame(params.GetFrameTime(), params, frame)) || !frame)
        {
            ioState.SkipWithError("the composite failed");
            break;
        }
        benchmark::DoNotOptimize(frame.Get());
    }
    ioState.SetItemsProcessed(ioState.iterations());
}
BENCHMARK(BM_CompositorProduceFrameTwo1080Layers)->Arg(4)->Arg(5)->Unit(benchmark::kMillisecond);

} // namespace
