// `vrender render TIMELINE` and the demo: a timeline's main sequence through
// the published cutlist factory, rendered by the cutlist source the way a
// host's exporter renders a sequence.

#include "BE/CutlistProvider.h"
#include "BE/SequenceInterfaces.h"
#include "BE/TimelineFile.h"
#include "BE/VideoSources.h"
#include "DemoTimeline.h"
#include "FX/EffectCatalogue.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/RenderableCutlistSource.h"
#include "RenderJob.h"
#include "TX/TransitionCatalogue.h"

#include <cstdio>
#include <set>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;

// Why the frame at inTime has no picture: the decoders' reasons for the
// files in use there, else the names of those files, so that the message
// always points at the material.
std::string ExplainTimelineFailure(const BE::ISequence& inSequence, mt::TickTime inTime)
{
    std::string reasons;
    std::string files;
    std::set<std::string> seen;
    if (inSequence.GetTrackGroupCount() == 0)
        return "the timeline delivered no frame";
    const auto group = inSequence.GetTrackGroup(0);
    for (std::size_t track = 0; track < group->GetTrackCount(); ++track)
    {
        const auto item = group->GetTrack(track)->FindItemAt(inTime);
        const auto media = item ? item->GetMedia() : QRT::InterfaceRef<BE::ISequenceMedia>();
        if (!media)
            continue;
        const BE::MediaSettings& settings = media->GetMediaSettings();
        if (settings.mResolvedPath.empty() || !seen.insert(settings.mResolvedPath).second)
            continue;
        files += (files.empty() ? "" : ", ") + settings.mResolvedPath;
        for (std::size_t stream = 0; stream < media->GetVideoStreamCount(); ++stream)
        {
            const std::string reason =
                BE::GetLastReadFailure(media->GetVideoStream(stream)->GetVideoSource());
            if (!reason.empty())
                reasons += (reasons.empty() ? "" : "; ") + reason;
        }
    }
    if (!reasons.empty())
        return reasons;
    if (!files.empty())
        return "a clip could not be read (files in use at this frame: " + files + ")";
    return "the timeline delivered no frame";
}

} // namespace

QRT::InterfaceRef<MF::IRenderableCutlist> BuildTimelineCutlist(const BE::SequenceRef& inSequence,
                                                               std::string& outError)
{
    const auto factory = MF::GetCutlistFactory();
    QRT::InterfaceRef<MF::IRenderableCutlist> cutlist;
    try
    {
        if (factory &&
            QRT::Succeeded(factory->CreateSequenceCutlist(
                inSequence, QRT::ImmutableString::CreateDynamic(inSequence->GetName()), cutlist)) &&
            cutlist)
            return cutlist;
        outError = "the renderer could not build the sequence's cutlist";
    }
    catch (const std::exception& inException)
    {
        // What the timeline asks for and the renderer cannot build (a
        // transition that does not fit its items, say).
        outError = inException.what();
    }
    return {};
}

RenderOutcome RunTimelineRender(const RenderOptions& inOptions,
                                const RenderEnvironment& inEnvironment)
{
    RenderOutcome outcome;
    outcome.mExitCode = 1;
    const BE::TimelineLoadResult loaded =
        inOptions.mBuiltInTimeline
            ? BE::ParseTimeline(GetDemoTimelineText(), kDemoTimelineName, ".", FX::CheckEffect,
                                TX::CheckTransition)
            : BE::LoadTimelineFile(inOptions.mMedia, FX::CheckEffect, TX::CheckTransition);
    if (!loaded.Succeeded())
    {
        outcome.mError = loaded.mError;
        return outcome;
    }
    for (const std::string& warning : loaded.mWarnings)
        std::fprintf(inEnvironment.mProgress, "vrender: warning: %s\n", warning.c_str());
    // The demo's offline clip is offline on purpose.
    if (!inOptions.mBuiltInTimeline)
        for (const std::string& missing : loaded.mMissingFiles)
            std::fprintf(inEnvironment.mProgress,
                         "vrender: warning: %s: media file not found; it plays as offline\n",
                         missing.c_str());

    const BE::SequenceRef& sequence = loaded.mMain;
    const std::string where = inOptions.mBuiltInTimeline ? kDemoTimelineName : inOptions.mMedia;
    const QRT::ImmutableString name = QRT::ImmutableString::CreateDynamic(sequence->GetName());
    const auto cutlist = BuildTimelineCutlist(sequence, outcome.mError);
    if (!cutlist)
    {
        outcome.mError = where + ": " + outcome.mError;
        return outcome;
    }

    const BE::SequenceSettings& settings =
        QRT::QueryRef<BE::ISequenceSettings>(sequence)->GetSequenceSettings();
    BE::CutlistProviderSettings picture;
    picture.mRight = settings.mWidth;
    picture.mBottom = settings.mHeight;
    picture.mPixelAspectRatio = settings.mPixelAspectRatio;
    picture.mFieldType = settings.mFieldType;
    picture.mFrameRate = settings.mFrameRate;
    const auto provider = BE::CreateCutlistProvider(picture);
    provider->SetCutlists(name, {cutlist, {}, {}});

    SourceFacts facts;
    facts.mWidth = static_cast<std::uint32_t>(settings.mWidth);
    facts.mHeight = static_cast<std::uint32_t>(settings.mHeight);
    facts.mFrameRate = settings.mFrameRate;
    facts.mFieldType = settings.mFieldType;
    facts.mPixelAspectRatio = settings.mPixelAspectRatio;
    facts.mDuration = sequence->GetEnd();
    facts.mComposited = true;
    RenderPlan plan;
    if (!PlanRender(inOptions, facts, DescribeHost(), plan, outcome.mError))
    {
        outcome.mError = where + ": " + outcome.mError;
        return outcome;
    }

    plan.mFullFrameWidth = facts.mWidth;
    plan.mFullFrameHeight = facts.mHeight;

    RenderInput input;
    input.mSource = ML::CreateRenderableCutlistSource(provider, settings.mFrameRate, name);
    const mt::FrameRate rate = plan.mStream.mFrameRate;
    input.mExplainFailure = [sequence, rate](std::int64_t inFrame)
    { return ExplainTimelineFailure(*sequence, mt::TickTime::FromFrame(inFrame, rate)); };
    return RunRenderLoop(std::move(input), plan, inOptions, inEnvironment);
}

} // namespace vrender
