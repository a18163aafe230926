#include "IR/ImageRenderer.h"
#include "IR/PlaneAccumulate.h"
#include "MF/SampleWeighting.h"
#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "sources/FieldFilterSteps.h"
#include "sources/RenderableSourceTimeMix.h"

#include <cstddef>
#include <functional>
#include <map>
#include <set>
#include <vector>

namespace ML
{

namespace
{

using namespace FieldFilterSteps;
using mvxmediatypes::TickTime;

// Which rows to blend: a field slot (1 or 2) or the whole frame (0).
constexpr std::int32_t kWholeFrame = 0;

// What one output frame is made of: either nothing to blend (the time mix
// answers), or two samples around each field time, or every weighted sample
// inside each field's media span.
struct BlendPlan
{
    bool mDelegate = false;
    bool mAccumulate = false;
    TickTime mT1a, mT1b, mT2a, mT2b;
    MF::WeightedSampleList mFirstList;
    MF::WeightedSampleList mSecondList;
    std::set<MF::Sample> mSamples;
};

// One upstream field (or frame) a sample reads: the frame and the rows of it
// that hold the sample's time.
struct SampleSource
{
    FrameRef mFrame;
    std::int32_t mSlot = kWholeFrame;
};

// The rows of a frame an IR call reads or writes: a field is every other row,
// so its pitch is doubled and its height halved.
struct RowsView
{
    const std::uint8_t* mBase = nullptr;
    std::int32_t mRowBytes = 0;
    std::int32_t mHeight = 0;
};

RowsView ViewRows(const VF::IRFrameBuffer& inBuffer, std::int32_t inSlot)
{
    if (inSlot == kWholeFrame || inBuffer.mHeight < 2)
        return {static_cast<const std::uint8_t*>(inBuffer.mBase), inBuffer.mRowBytes,
                inBuffer.mHeight};
    // Picture row r of a bottom-left buffer is memory row height - 1 - r.
    const std::int32_t start =
        IR_IsOriginBottomLeft(inBuffer.mFormat) ? (inBuffer.mHeight - inSlot) % 2 : inSlot - 1;
    const std::int32_t rows =
        inSlot == kFirstSlot ? (inBuffer.mHeight + 1) / 2 : inBuffer.mHeight / 2;
    return {static_cast<const std::uint8_t*>(inBuffer.mBase) +
                static_cast<std::ptrdiff_t>(start) * inBuffer.mRowBytes,
            inBuffer.mRowBytes * 2, rows};
}

// The format the blend is computed in: the requested one when the mixing
// operations take it, else 32-bit float BGRA.
mvxmediatypes::PixelFormat BlendFormatFor(mvxmediatypes::PixelFormat inFormat)
{
    const IR_PixelFormat format = VF::BEPixelFormatToIRPixelFormat(inFormat);
    if (format != VF::kIR_PixelFormat_Invalid &&
        (format & kIR_FormatMask_Layout) == kIR_FormatLayout_BGRA)
        return inFormat;
    return mvxmediatypes::kPixelFormat_BGRA_4444_32f;
}

// RenderableSourceTimeBlend: frame blending for clips played at another
// speed or frame rate. Each output field is a weighted sum of upstream
// fields: the two samples around its time, or every sample inside the media
// span it covers when that span is longer than one upstream field. At a low
// quality, or at speed one on the upstream grid, it answers through an
// internal time mix over the same upstream. Every upstream frame is rendered
// once per output frame however many samples fall on it. Immutable; all
// per-frame state lives on the calling thread's stack.
class RenderableSourceTimeBlend : public QRT::Implements<IRenderableSource>
{
public:
    RenderableSourceTimeBlend(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                              const QRT::InterfaceRef<MF::ITimeTransform>& inTimeTransform,
                              double inRate)
        : mUpstream(inUpstream)
        , mTimeTransform(inTimeTransform)
        , mRate(inRate)
        , mTimeMix(QRT::Allocated<RenderableSourceTimeMix>::Create<IRenderableSource>(inUpstream))
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        if (inParams.mQuality < mvxmediatypes::kRenderQuality_Medium)
        {
            mTimeMix->ConformFrameTime(inRequested, inParams, outConformed);
            return;
        }
        outConformed = inRequested;
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        const BlendPlan plan = MakePlan(inTime, inParams);
        if (plan.mDelegate)
        {
            mTimeMix->CollectPrefetches(inTime, inParams, ioPrefetches);
            return;
        }
        WalkUpstreamFrames(plan, inParams,
                           [&](const MF::FrameTime& inUpstreamTime, const MF::Sample&)
                           {
                               mUpstream->CollectPrefetches(inUpstreamTime, inParams, ioPrefetches);
                               return FrameRef();
                           });
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const BlendPlan plan = MakePlan(inTime, inParams);
        if (plan.mDelegate)
        {
            mTimeMix->RenderFrame(inTime, inParams, outFrame);
            return;
        }
        const std::map<TickTime, SampleSource> sources =
            WalkUpstreamFrames(plan, inParams,
                               [&](const MF::FrameTime& inUpstreamTime, const MF::Sample&)
                               { return RenderUpstream(mUpstream, inUpstreamTime, inParams); });
        outFrame = Blend(plan, inTime, inParams, sources);
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video1000;
    }

    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video1000;
    }

private:
    using UpstreamVisitor = std::function<FrameRef(const MF::FrameTime&, const MF::Sample&)>;

    BlendPlan MakePlan(const MF::FrameTime& inTime, const CutlistRenderParams& inParams)
    {
        BlendPlan plan;
        mvxmediatypes::FrameRate fieldRate;
        mUpstream->GetFieldRate(fieldRate);
        mvxmediatypes::FrameRate frameRate;
        mUpstream->GetFrameRate(frameRate);
        // Without an upstream rate or a sequence rate there is no grid to
        // blend between: the time mix delivers the nearest field.
        if (inParams.mQuality < mvxmediatypes::kRenderQuality_Medium || fieldRate.IsZero() ||
            inParams.mFrameRate.IsZero())
        {
            plan.mDelegate = true;
            return plan;
        }
        TickTime reference, firstSpan, secondSpan;
        MF::CalculateDurationsInMediaTime(fieldRate, inParams.mFrameRate, inTime, mRate, reference,
                                          firstSpan, secondSpan);
        const TickTime t = inTime.GetTime();
        const TickTime g = frameRate < mvxmediatypes::kFrameRate_Video1000 && !frameRate.IsZero()
                               ? t.AlignToFrame(frameRate)
                               : t;
        if (reference == firstSpan && reference == secondSpan && g == t)
        {
            plan.mDelegate = true;
            return plan;
        }
        if (firstSpan > reference || secondSpan > reference)
        {
            plan.mAccumulate = true;
            const TickTime first = inTime.GetFirstFieldTime();
            const TickTime second = inTime.GetSecondFieldTime();
            MF::GetWeightedSamplesForRange(first, first + firstSpan, fieldRate, kFirstSlot,
                                           plan.mFirstList);
            MF::GetWeightedSamplesForRange(second, second + secondSpan, fieldRate, kSecondSlot,
                                           plan.mSecondList);
            MF::NormalizeSampleWeights(plan.mFirstList);
            MF::NormalizeSampleWeights(plan.mSecondList);
            for (const MF::WeightedSample& sample : plan.mFirstList)
                plan.mSamples.insert(sample.first);
            for (const MF::WeightedSample& sample : plan.mSecondList)
                plan.mSamples.insert(sample.first);
            return plan;
        }
        MF::GetSamplesAroundTime(inTime, fieldRate, plan.mT1a, plan.mT1b, plan.mT2a, plan.mT2b);
        plan.mSamples = {{plan.mT1a, kFirstSlot},
                         {plan.mT1b, kFirstSlot},
                         {plan.mT2a, kSecondSlot},
                         {plan.mT2b, kSecondSlot}};
        return plan;
    }

    // Visits each upstream frame the plan needs once, in sample order, and
    // records for every sample time the frame and the rows holding it. A
    // sample whose time an earlier upstream frame already holds is not
    // visited again.
    std::map<TickTime, SampleSource> WalkUpstreamFrames(const BlendPlan& inPlan,
                                                        const CutlistRenderParams& inParams,
                                                        const UpstreamVisitor& inVisit)
    {
        std::map<TickTime, SampleSource> sources;
        for (const MF::Sample& sample : inPlan.mSamples)
        {
            if (sources.count(sample.first) != 0)
                continue;
            const MF::FrameTime upstreamTime =
                ConformUpstream(mUpstream, MF::FrameTime(sample.first), inParams);
            const FrameRef frame = inVisit(upstreamTime, sample);
            if (upstreamTime.IsProgressive())
            {
                sources[sample.first] = {frame, kWholeFrame};
                sources.emplace(upstreamTime.GetTime(), SampleSource{frame, kWholeFrame});
                continue;
            }
            sources.emplace(upstreamTime.GetFirstFieldTime(), SampleSource{frame, kFirstSlot});
            sources.emplace(upstreamTime.GetSecondFieldTime(), SampleSource{frame, kSecondSlot});
            // Upstream answered a frame that does not hold the sample's
            // instant exactly: read its field nearest before the sample.
            if (sources.count(sample.first) == 0)
            {
                const bool secondIsNearer =
                    upstreamTime.GetSecondFieldTime() <= sample.first &&
                    (upstreamTime.GetFirstFieldTime() > sample.first ||
                     upstreamTime.GetSecondFieldTime() > upstreamTime.GetFirstFieldTime());
                sources[sample.first] = {frame, secondIsNearer ? kSecondSlot : kFirstSlot};
            }
        }
        return sources;
    }

    FrameRef Blend(const BlendPlan& inPlan, const MF::FrameTime& inTime,
                   const CutlistRenderParams& inParams,
                   const std::map<TickTime, SampleSource>& inSources)
    {
        const FrameRef model = inSources.begin()->second.mFrame;
        if (!model)
            return FrameRef();
        CutlistRenderParams params = inParams;
        if (params.mPixelFormat == mvxmediatypes::kPixelFormat_YUV_420_8u_Planar)
        {
            if (inTime.IsProgressive() && AllPlanarAtOutputSize(inSources, inParams))
                if (FrameRef blended = BlendPlanes(inPlan, inTime, inParams, inSources))
                    return blended;
            // 4:2:0 is made only from 4:2:0: any other upstream frames blend
            // into 8-bit BGRA, which a consumer of 4:2:0 converts.
            params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        }
        return BlendPixels(inPlan, inTime, params, inSources);
    }

    // Whether every upstream frame is planar 4:2:0 of the output's size and
    // pixel aspect ratio.
    static bool AllPlanarAtOutputSize(const std::map<TickTime, SampleSource>& inSources,
                                      const CutlistRenderParams& inParams)
    {
        const QRT::ParamRect bounds(0, 0, static_cast<std::int32_t>(inParams.mWidth),
                                    static_cast<std::int32_t>(inParams.mHeight));
        for (const auto& [time, source] : inSources)
            if (!source.mFrame ||
                source.mFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_YUV_420_8u_Planar ||
                source.mFrame->GetBounds() != bounds ||
                source.mFrame->GetPixelAspectRatio() != inParams.mPixelAspectRatio)
                return false;
        return true;
    }

    // A progressive 4:2:0 output frame as the weighted sum of progressive
    // planar upstream frames, plane by plane. The planes' codes are mixed at
    // every quality, quality 5 included: gamma-encoded Y'CbCr has no
    // linear-light form one plane at a time (IR_AccumulatePlane8). On the
    // upstream grid the upstream frame itself is the answer. Empty when no
    // sample has any weight.
    FrameRef BlendPlanes(const BlendPlan& inPlan, const MF::FrameTime& inTime,
                         const CutlistRenderParams& inParams,
                         const std::map<TickTime, SampleSource>& inSources)
    {
        MF::WeightedSampleList list = inPlan.mSecondList;
        if (!inPlan.mAccumulate)
        {
            const float w =
                MF::CalculateSampleWeight(inTime.GetSecondFieldTime(), inPlan.mT2a, inPlan.mT2b);
            list = {{{inPlan.mT2a, kSecondSlot}, 1.0 - static_cast<double>(w)},
                    {{inPlan.mT2b, kSecondSlot}, static_cast<double>(w)}};
        }
        std::vector<const MF::IVideoFrame*> frames;
        std::vector<double> weights;
        for (const MF::WeightedSample& sample : list)
        {
            const FrameRef& frame = inSources.at(sample.first.first).mFrame;
            if (sample.second == 1.0 && frame->GetFieldType() == inTime.GetFieldOrder())
                return frame;
            if (sample.second != 0.0)
            {
                frames.push_back(frame.Get());
                weights.push_back(sample.second);
            }
        }
        if (frames.empty())
            return FrameRef();
        FrameRef output = CreateFrameForParams(inParams, inSources.begin()->second.mFrame);
        output->SetFieldType(inTime.GetFieldOrder());
        std::vector<const std::uint8_t*> bases(frames.size());
        std::vector<std::int32_t> rowBytes(frames.size());
        const auto count = static_cast<std::int32_t>(frames.size());
        for (std::uint32_t plane = 0; plane < 3; ++plane)
        {
            for (std::size_t k = 0; k < frames.size(); ++k)
            {
                bases[k] = static_cast<const std::uint8_t*>(frames[k]->GetPlaneBaseAddress(plane));
                rowBytes[k] = frames[k]->GetPlaneRowBytes(plane);
            }
            const auto width =
                static_cast<std::int32_t>(plane == 0 ? inParams.mWidth : (inParams.mWidth + 1) / 2);
            const auto height = static_cast<std::int32_t>(plane == 0 ? inParams.mHeight
                                                                     : (inParams.mHeight + 1) / 2);
            auto* out = static_cast<std::uint8_t*>(output->GetWritablePlaneBaseAddress(plane));
            ThrowIfFailed(IR_AccumulatePlane8(bases.data(), rowBytes.data(), weights.data(), count,
                                              out, output->GetPlaneRowBytes(plane), width, height));
        }
        return output;
    }

    // The blend in the requested pixel format, or in float BGRA converted
    // into it.
    FrameRef BlendPixels(const BlendPlan& inPlan, const MF::FrameTime& inTime,
                         const CutlistRenderParams& inParams,
                         const std::map<TickTime, SampleSource>& inSources)
    {
        const FrameRef model = inSources.begin()->second.mFrame;
        FrameRef output = CreateFrameForParams(inParams, model);
        output->SetFieldType(inTime.GetFieldOrder());
        const mvxmediatypes::PixelFormat blendFormat = BlendFormatFor(output->GetPixelFormat());
        FrameRef work = output;
        if (blendFormat != output->GetPixelFormat())
            ThrowIfFailed(VF::CreateVideoFrame(blendFormat, inParams.mWidth, inParams.mHeight,
                                               inParams.mPixelAspectRatio, false, false, work));

        // Each upstream frame in the blend format and the output's size, made once.
        std::map<const MF::IVideoFrame*, FrameRef> prepared;
        const auto prepare = [&](const FrameRef& inFrame) -> FrameRef
        {
            auto found = prepared.find(inFrame.Get());
            if (found != prepared.end())
                return found->second;
            FrameRef ready = inFrame;
            if (inFrame->GetPixelFormat() != blendFormat ||
                inFrame->GetBounds() != work->GetBounds())
            {
                ready = work->CreateEmptyFrame(false);
                ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(
                    inFrame, ready, static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality)));
            }
            prepared.emplace(inFrame.Get(), ready);
            return ready;
        };
        const auto sourceOf = [&](TickTime inSampleTime, std::int32_t inOutputSlot)
        {
            const SampleSource& found = inSources.at(inSampleTime);
            if (!found.mFrame)
                throw QRT::NullInterfaceException();
            SampleSource ready{prepare(found.mFrame), found.mSlot};
            // A progressive upstream frame gives the output's own rows.
            if (ready.mSlot == kWholeFrame)
                ready.mSlot = inOutputSlot;
            return ready;
        };

        if (!inPlan.mAccumulate)
        {
            if (inTime.IsInterlaced())
            {
                const float w1 =
                    MF::CalculateSampleWeight(inTime.GetFirstFieldTime(), inPlan.mT1a, inPlan.mT1b);
                const float w2 = MF::CalculateSampleWeight(inTime.GetSecondFieldTime(), inPlan.mT2a,
                                                           inPlan.mT2b);
                BlendTwo(sourceOf(inPlan.mT1a, kFirstSlot), sourceOf(inPlan.mT1b, kFirstSlot), work,
                         kFirstSlot, w1, inParams.mQuality);
                BlendTwo(sourceOf(inPlan.mT2a, kSecondSlot), sourceOf(inPlan.mT2b, kSecondSlot),
                         work, kSecondSlot, w2, inParams.mQuality);
            }
            else
            {
                const float w = MF::CalculateSampleWeight(inTime.GetSecondFieldTime(), inPlan.mT2a,
                                                          inPlan.mT2b);
                // On the upstream grid the blend is one upstream frame exactly: that frame
                // is shared when it already is what the output frame would be.
                if (w == 0.0f || w == 1.0f)
                {
                    const FrameRef& only =
                        inSources.at(w == 0.0f ? inPlan.mT2a : inPlan.mT2b).mFrame;
                    if (only && StandsForOutput(*only, *output, inTime))
                        return only;
                }
                SampleSource a = sourceOf(inPlan.mT2a, kWholeFrame);
                SampleSource b = sourceOf(inPlan.mT2b, kWholeFrame);
                a.mSlot = kWholeFrame;
                b.mSlot = kWholeFrame;
                BlendTwo(a, b, work, kWholeFrame, w, inParams.mQuality);
            }
        }
        else if (inTime.IsInterlaced())
        {
            Accumulate(inPlan.mFirstList, sourceOf, work, kFirstSlot, inParams.mQuality);
            Accumulate(inPlan.mSecondList, sourceOf, work, kSecondSlot, inParams.mQuality);
        }
        else
        {
            Accumulate(inPlan.mSecondList, sourceOf, work, kWholeFrame, inParams.mQuality);
        }

        if (work != output)
            ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(
                work, output, static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality)));
        return output;
    }

    // Whether inFrame holds what an output frame like inOutput for inTime would: the
    // same format, bounds, pixel aspect ratio and field order.
    static bool StandsForOutput(const MF::IVideoFrame& inFrame, const MF::IVideoFrame& inOutput,
                                const MF::FrameTime& inTime)
    {
        return inFrame.GetPixelFormat() == inOutput.GetPixelFormat() &&
               inFrame.GetBounds() == inOutput.GetBounds() &&
               inFrame.GetPixelAspectRatio() == inOutput.GetPixelAspectRatio() &&
               inFrame.GetFieldType() == inTime.GetFieldOrder();
    }

    // Blends two sources with weight inWeight for the second onto the rows
    // inSlot of the destination.
    static void BlendTwo(const SampleSource& inA, const SampleSource& inB,
                         const FrameRef& ioDestination, std::int32_t inSlot, float inWeight,
                         std::uint32_t inQuality)
    {
        const VF::IRWritableFrameBuffer destination = VF::GetWritableIRFrameBuffer(*ioDestination);
        const RowsView a = ViewRows(VF::GetIRFrameBuffer(*inA.mFrame), inA.mSlot);
        const RowsView b = ViewRows(VF::GetIRFrameBuffer(*inB.mFrame), inB.mSlot);
        const RowsView out = ViewRows(VF::IRFrameBuffer{destination.mBase, destination.mRowBytes,
                                                        destination.mFormat, destination.mWidth,
                                                        destination.mHeight},
                                      inSlot);
        const std::int32_t height = std::min({a.mHeight, b.mHeight, out.mHeight});
        auto* outBase = const_cast<std::uint8_t*>(out.mBase);
        const auto quality = static_cast<std::int32_t>(inQuality);
        if (inQuality < mvxmediatypes::kRenderQuality_Max)
        {
            ThrowIfFailed(IR_CrossDissolve(a.mBase, a.mRowBytes, b.mBase, b.mRowBytes, outBase,
                                           out.mRowBytes, destination.mFormat, destination.mWidth,
                                           height, inWeight, quality));
            return;
        }
        const void* sources[2] = {a.mBase, b.mBase};
        const std::int32_t rowBytes[2] = {a.mRowBytes, b.mRowBytes};
        const double weights[2] = {1.0 - static_cast<double>(inWeight),
                                   static_cast<double>(inWeight)};
        ThrowIfFailed(IR_Accumulate(sources, rowBytes, weights, 2, outBase, out.mRowBytes,
                                    destination.mFormat, destination.mWidth, height, quality));
    }

    template <class SourceOf>
    static void Accumulate(const MF::WeightedSampleList& inList, const SourceOf& inSourceOf,
                           const FrameRef& ioDestination, std::int32_t inSlot,
                           std::uint32_t inQuality)
    {
        const VF::IRWritableFrameBuffer destination = VF::GetWritableIRFrameBuffer(*ioDestination);
        const RowsView out = ViewRows(VF::IRFrameBuffer{destination.mBase, destination.mRowBytes,
                                                        destination.mFormat, destination.mWidth,
                                                        destination.mHeight},
                                      inSlot);
        std::vector<const void*> bases;
        std::vector<std::int32_t> rowBytes;
        std::vector<double> weights;
        std::vector<FrameRef> keep;
        std::int32_t height = out.mHeight;
        for (const MF::WeightedSample& sample : inList)
        {
            SampleSource source = inSourceOf(sample.first.first, inSlot);
            if (inSlot == kWholeFrame)
                source.mSlot = kWholeFrame;
            const RowsView rows = ViewRows(VF::GetIRFrameBuffer(*source.mFrame), source.mSlot);
            bases.push_back(rows.mBase);
            rowBytes.push_back(rows.mRowBytes);
            weights.push_back(sample.second);
            height = std::min(height, rows.mHeight);
            keep.push_back(source.mFrame);
        }
        if (bases.empty())
            return;
        ThrowIfFailed(IR_Accumulate(
            bases.data(), rowBytes.data(), weights.data(), static_cast<std::int32_t>(bases.size()),
            const_cast<std::uint8_t*>(out.mBase), out.mRowBytes, destination.mFormat,
            destination.mWidth, height, static_cast<std::int32_t>(inQuality)));
    }

    const QRT::InterfaceRef<IRenderableSource> mUpstream;
    // Held for the filter's life; the blend reads media times already mapped.
    const QRT::InterfaceRef<MF::ITimeTransform> mTimeTransform;
    const double mRate;
    const QRT::InterfaceRef<IRenderableSource> mTimeMix;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
TimeBlendSource(const QRT::InterfaceRef<IRenderableSource>& inSource,
                const QRT::InterfaceRef<MF::ITimeTransform>& inTimeTransform, const double& inRate)
{
    return QRT::Allocated<RenderableSourceTimeBlend>::Create<IRenderableSource>(
        inSource, inTimeTransform, inRate);
}

} // namespace ML
